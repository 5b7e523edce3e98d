#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <set>
#include <stdexcept>
#include <string>
#include <tuple>
#include <vector>

#include "CascadeWriter.h"
#include "core/Errors.h"
#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"
#include "support/ScopedModel.h"
#include "support/SquareCascade.h"
#include "support/TrackSupport.h"

namespace {

using Box = std::tuple<int, int, int, int>; // left, top, right, bottom

Box boxOf(DetectionWindow const& w)
{
    return Box(w.left, w.top, w.right, w.bottom);
}

Box squareBox(int x, int y, int size)
{
    return Box(x, y, x + size, y + size);
}

std::set<Box> boxesOf(std::vector<ScoredWindow> const& hits)
{
    std::set<Box> out;
    for (auto const& h : hits)
        out.insert(boxOf(h.window));
    return out;
}

struct Integral {
    IN_IMAGE image;
    explicit Integral(TestFrame& frame) { image.Init(frame.width, frame.height, frame.width, frame.pixels.data()); }
};

std::vector<ScoredWindow> searchWhole(CascadeDetector& det, TestFrame& frame)
{
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    det.exhaustiveDetect(in.image, {makeWindow(0, 0, frame.width, frame.height)}, &hits);
    return hits;
}

// A detector over the square cascade, served under its own model name.
struct SquareDetector {
    ScopedModel model;
    CascadeDetector det;
    explicit SquareDetector(CascadeModel const& cascade = squareCascade(), int imageMaxSize = 1024,
                            int faceMinSize = 24, int faceMaxSize = 0)
        : model("squarecascade", CascadeWriter::toBytes(cascade)),
          det(detectorConfig("squarecascade", imageMaxSize, faceMinSize, faceMaxSize))
    {
    }
};

template <typename F>
void expectInvalidArgument(F&& f, const char* text)
{
    try {
        f();
        ADD_FAILURE() << "no qv_invalid_argument";
    } catch (qv_invalid_argument const& e) {
        EXPECT_STREQ(e.what(), text);
    }
}

} // namespace

TEST(CascadeConfiguration, ScaleTablesHoldTheRoundedWindowSizesAndSteps)
{
    SquareDetector s;
    const int sizes[17] = {24, 30, 38, 47, 59, 73, 92, 114, 143, 179, 224, 279, 349, 437, 546, 682, 853};
    const int steps[17] = {2, 3, 4, 5, 6, 7, 9, 11, 14, 18, 22, 28, 35, 44, 55, 68, 85};
    for (int i = 0; i < 17; ++i) {
        EXPECT_EQ(s.det.windowWidth[i], sizes[i]) << i;
        EXPECT_EQ(s.det.windowHeight[i], sizes[i]) << i;
        EXPECT_EQ(s.det.stepX[i], steps[i]) << i;
        EXPECT_EQ(s.det.stepY[i], steps[i]) << i;
    }
    s.det.setSearchStep(0.5f, 2.0f); // clamped to 1
    EXPECT_EQ(s.det.stepX[0], 12);
    EXPECT_EQ(s.det.stepY[0], 24);
    EXPECT_EQ(s.det.stepY[16], 853);
    // A ratio that would round to no step still moves the search on.
    s.det.setSearchStep(0.0f, -1.0f);
    EXPECT_EQ(s.det.stepX[0], 1);
    EXPECT_EQ(s.det.stepY[5], 1);
}

TEST(CascadeConfiguration, SizesFixTheScaleRange)
{
    ScopedModel model("squarecascade", CascadeWriter::toBytes(squareCascade()));
    CascadeDetector a(detectorConfig("squarecascade", 640, 40, 200));
    EXPECT_EQ(a.minScale, 3);  // ceil(log(40/24) / log 1.25) = ceil(2.29)
    EXPECT_EQ(a.maxScale, 9);  // floor(log(200/24) / log 1.25) = floor(9.5)
    EXPECT_EQ(a.initialMinScale, 3);
    EXPECT_EQ(a.initialMaxScale, 9);
    EXPECT_EQ(a.imageMaxSize, 640);
    EXPECT_EQ(a.skipRow.size(), 640u);
    EXPECT_EQ(a.commonFeatures.size(), 10u);
    EXPECT_TRUE(a.commonFeatures[1].empty()); // below the range: never searched
    EXPECT_FALSE(a.commonFeatures[3].empty());

    CascadeDetector b(detectorConfig("squarecascade", 320, 0, 0));
    EXPECT_EQ(b.minScale, 0);
    EXPECT_EQ(b.maxScale, 11); // from the image size: floor(log(320/24) / log 1.25)

    CascadeDetector c("{\"model\":\"squarecascade\"}");
    EXPECT_EQ(c.imageMaxSize, 1024);
    EXPECT_EQ(c.minScale, 0);
    EXPECT_EQ(c.maxScale, 16);
}

TEST(CascadeConfiguration, RangesBeyondTheScaleTablesAreRefused)
{
    ScopedModel model("squarecascade", CascadeWriter::toBytes(squareCascade()));
    EXPECT_THROW(CascadeDetector(detectorConfig("squarecascade", 2000, 24, 0)), qv_invalid_argument);
    EXPECT_THROW(CascadeDetector(detectorConfig("squarecascade", 1024, 24, 1066)), qv_invalid_argument);
    EXPECT_NO_THROW(CascadeDetector(detectorConfig("squarecascade", 1024, 24, 1065)));
    EXPECT_THROW(CascadeDetector(detectorConfig("squarecascade", 1 << 30, 24, 100)), qv_invalid_argument);
}

TEST(CascadeConfiguration, SpreadPatternRingsOutFromTheCenter)
{
    SquareDetector s;
    const int xs[16] = {0, -1, 1, -1, 0, 1, -1, 0, 1, -2, -2, -2, 2, 2, 2, -2};
    const int ys[16] = {0, 0, 0, -1, -1, -1, 1, 1, 1, -1, 0, 1, -1, 0, 1, -2};
    ASSERT_EQ(s.det.spiralX.size(), 625u);
    for (int i = 0; i < 16; ++i) {
        EXPECT_EQ(s.det.spiralX[i], xs[i]) << i;
        EXPECT_EQ(s.det.spiralY[i], ys[i]) << i;
    }
    std::set<std::pair<int, int>> seen;
    for (size_t i = 0; i < 625; ++i)
        seen.insert({s.det.spiralX[i], s.det.spiralY[i]});
    EXPECT_EQ(seen.size(), 625u);
    EXPECT_EQ(*seen.begin(), std::make_pair(-12, -12));
    EXPECT_EQ(*seen.rbegin(), std::make_pair(12, 12));
    ASSERT_EQ(s.det.scaleOffsets.size(), 33u);
    EXPECT_EQ(s.det.scaleOffsets[0], 0);
    EXPECT_EQ(s.det.scaleOffsets[1], 1);
    EXPECT_EQ(s.det.scaleOffsets[2], -1);
    EXPECT_EQ(s.det.scaleOffsets[32], -16);
}

namespace {

// A frame with squares for the windows given, and its integral image.
struct Scene {
    TestFrame frame;
    Integral in;
    Scene(int w, int h, std::vector<Box> const& squares) : frame(w, h), in(placed(frame, squares)) {}
    static TestFrame& placed(TestFrame& f, std::vector<Box> const& squares)
    {
        for (auto const& [x, y, right, bottom] : squares)
            f.squareForWindow(x, y, right - x);
        return f;
    }
    std::set<Box> detect(CascadeDetector& det, std::vector<DetectionWindow> const& regions)
    {
        std::vector<ScoredWindow> hits;
        det.exhaustiveDetect(in.image, regions, &hits);
        return boxesOf(hits);
    }
    // The first hit of a spread search around `window`, or no box.
    Box spread(CascadeDetector& det, DetectionWindow const& window)
    {
        std::vector<ScoredWindow> hits;
        const bool found = det.spreadSearch(in.image, window, &hits);
        EXPECT_EQ(found, !hits.empty());
        return hits.empty() ? Box() : boxOf(hits[0].window);
    }
};

} // namespace

TEST(CascadeSearch, FindsSquaresAtTheirPlacesAndScales)
{
    SquareDetector s;
    // Scales 0, 3 and 5 with steps 2, 5 and 7.
    Scene scene(320, 240, {squareBox(40, 40, 24), squareBox(100, 60, 47), squareBox(203, 105, 73)});
    const auto hits = searchWhole(s.det, scene.frame);
    EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24), squareBox(100, 60, 47), squareBox(203, 105, 73)}));
    for (auto const& h : hits) {
        EXPECT_EQ(h.score, 0.0f);
        EXPECT_EQ(h.category, 0);
    }
}

TEST(CascadeSearch, EmptyTinyAndEdgeFramesGiveNoHits)
{
    SquareDetector s;
    TestFrame dark(100, 80), none(0, 0), tiny(24, 24, kBright);
    tiny.fill(0, 0, 4, 24, kDark);
    EXPECT_TRUE(searchWhole(s.det, dark).empty());
    EXPECT_TRUE(searchWhole(s.det, tiny).empty());
    EXPECT_TRUE(searchWhole(s.det, none).empty());
    // A window never touches the last column or row.
    Scene exact(64, 64, {squareBox(40, 20, 24)});
    EXPECT_TRUE(searchWhole(s.det, exact.frame).empty());
    Scene wider(65, 65, {squareBox(40, 40, 24)});
    EXPECT_EQ(boxesOf(searchWhole(s.det, wider.frame)), (std::set<Box>{squareBox(40, 40, 24)}));
}

TEST(CascadeSearch, RegionBoundsTheOriginOnlyAndIsClampedToTheFrame)
{
    SquareDetector s;
    Scene scene(120, 100, {squareBox(40, 40, 24)});
    const std::set<Box> square{squareBox(40, 40, 24)};
    EXPECT_EQ(scene.detect(s.det, {makeWindow(40, 40, 41, 41)}), square);
    EXPECT_TRUE(scene.detect(s.det, {makeWindow(41, 0, 120, 100), makeWindow(0, 41, 120, 100)}).empty());
    EXPECT_EQ(scene.detect(s.det, {makeWindow(-500, -500, 5000, 5000)}), square);
    std::vector<ScoredWindow> hits;
    s.det.exhaustiveSearch(scene.in.image, makeWindow(-1000000, 2000000000, 2000000000, 2100000000), &hits);
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSearch, SkipsTheNextWindowAfterAnEarlyReject)
{
    // The edge tests follow `fillers` pass-all stages. The window left of the
    // square dies at stage `fillers` and spares its right neighbour below
    // stage 10; the window above dies at the top test, two stages later.
    Scene scene(120, 100, {squareBox(40, 40, 24)});
    const struct {
        int fillers;
        DetectionWindow region;
        bool found;
    } cases[] = {
        {9, makeWindow(38, 40, 120, 41), false},
        {9, makeWindow(36, 40, 120, 41), true},  // the skipped window is the one at 38
        {10, makeWindow(38, 40, 120, 41), true},
        {7, makeWindow(40, 38, 41, 100), false},
        {8, makeWindow(40, 38, 41, 100), true},
    };
    for (auto const& c : cases) {
        SquareDetector s(squareCascade(c.fillers));
        EXPECT_EQ(scene.detect(s.det, {c.region}).count(squareBox(40, 40, 24)), c.found ? 1u : 0u)
            << c.fillers << " fillers from " << c.region.left << "," << c.region.top;
    }
}

TEST(CascadeSearch, ImageSideAboveTheMaximumIsRefusedAndEqualIsAccepted)
{
    SquareDetector s(squareCascade(), 100);
    TestFrame ok(100, 60);
    EXPECT_NO_THROW(searchWhole(s.det, ok));
    TestFrame big(60, 101);
    try {
        searchWhole(s.det, big);
        ADD_FAILURE() << "no qv_data_error";
    } catch (qv_data_error const& e) {
        EXPECT_STREQ(e.what(), "Image is larger than the maximum supported size");
    }
    Integral in(big);
    std::vector<ScoredWindow> hits;
    EXPECT_THROW(s.det.spreadDetect(in.image, {makeWindow(0, 0, 30, 30)}, {makeWindow(0, 0, 30, 30)}, &hits),
                 qv_data_error);
    EXPECT_THROW(s.det.exhaustiveSearch(in.image, makeWindow(0, 0, 60, 101), &hits), qv_data_error);
}

TEST(CascadeSizeRange, NarrowingSkipsScalesAndWideningBackIsAllowed)
{
    SquareDetector s(squareCascade(), 1024, 24, 400);
    Scene scene(200, 150, {squareBox(40, 40, 24), squareBox(100, 60, 47)});
    s.det.setFaceSizeRange(30, 0);
    EXPECT_EQ(boxesOf(searchWhole(s.det, scene.frame)), (std::set<Box>{squareBox(100, 60, 47)}));
    s.det.setFaceSizeRange(24, 40);
    EXPECT_EQ(boxesOf(searchWhole(s.det, scene.frame)), (std::set<Box>{squareBox(40, 40, 24)}));
    s.det.setFaceSizeRange(0, 0);
    EXPECT_EQ(s.det.minScale, 0);
    EXPECT_EQ(s.det.maxScale, 2);
    s.det.setFaceSizeRange(24, 400);
    EXPECT_EQ(searchWhole(s.det, scene.frame).size(), 2u);
}

TEST(CascadeSizeRange, BeyondTheInitialBoundsRaisesWithTheBoundStored)
{
    SquareDetector s(squareCascade(), 1024, 40, 200);
    expectInvalidArgument([&] { s.det.setFaceSizeRange(24, 0); }, "Face size range exceeds the initial bounds");
    EXPECT_EQ(s.det.minScale, 0);
    expectInvalidArgument([&] { s.det.setFaceSizeRange(0, 500); }, "Face size range exceeds the initial bounds");
    EXPECT_EQ(s.det.maxScale, 13);
    // The stored bounds reach scales that have no features; searches keep to
    // the ones that have.
    Scene scene(200, 150, {squareBox(40, 40, 24), squareBox(100, 60, 47)});
    EXPECT_EQ(boxesOf(searchWhole(s.det, scene.frame)), (std::set<Box>{squareBox(100, 60, 47)}));
}

TEST(CascadeSizeRange, ScaleRejoiningAfterAWidthChangeSearchesOnFreshOffsets)
{
    SquareDetector s(squareCascade(), 1024, 24, 400);
    Scene narrow(100, 100, {squareBox(40, 40, 24)}), wide(200, 150, {squareBox(100, 60, 24)});
    s.det.setFaceSizeRange(30, 0);
    searchWhole(s.det, narrow.frame);
    s.det.setFaceSizeRange(24, 0);
    EXPECT_EQ(boxesOf(searchWhole(s.det, wide.frame)), (std::set<Box>{squareBox(100, 60, 24)}));
    s.det.setFaceSizeRange(30, 0);
    searchWhole(s.det, narrow.frame);
    s.det.setFaceSizeRange(24, 0);
    EXPECT_EQ(boxesOf(searchWhole(s.det, narrow.frame)), (std::set<Box>{squareBox(40, 40, 24)}));
}

TEST(CascadeSpread, FindsTheSquareNearTheGivenWindowAndStopsAtTheFirstHit)
{
    SquareDetector s(squareCascade(0, 3.0f));
    Scene scene(200, 150, {squareBox(60, 50, 24)});
    std::vector<ScoredWindow> hits;
    // Center of the given window (72, 62) lies on the square's center.
    EXPECT_TRUE(s.det.spreadSearch(scene.in.image, makeWindow(55, 45, 89, 79), &hits));
    ASSERT_EQ(hits.size(), 1u);
    EXPECT_EQ(boxOf(hits[0].window), squareBox(60, 50, 24));
    EXPECT_EQ(hits[0].score, 3.0f);
    // 12 px to the left: the spiral reaches the square 3 columns out.
    EXPECT_EQ(scene.spread(s.det, makeWindow(48, 50, 72, 74)), squareBox(60, 50, 24));
    EXPECT_EQ(scene.spread(s.det, makeWindow(150, 100, 174, 124)), Box());
}

TEST(CascadeSpread, SearchOrderIsLeftColumnFirstNearestScaleFirstAndSmallWindowsFromTheLowest)
{
    SquareDetector s;
    // Both squares 24 px (6 spiral columns) from the center at x 100.
    Scene columns(200, 100, {squareBox(64, 30, 24), squareBox(112, 30, 24)});
    EXPECT_EQ(columns.spread(s.det, makeWindow(88, 30, 112, 54)), squareBox(64, 30, 24));
    // Scales 1 and 3 both in reach of windows centred at (99, 39).
    Scene scales(300, 200, {squareBox(60, 20, 30), squareBox(100, 20, 47)});
    EXPECT_EQ(scales.spread(s.det, makeWindow(76, 16, 123, 63)), squareBox(100, 20, 47));
    EXPECT_EQ(scales.spread(s.det, makeWindow(84, 24, 114, 54)), squareBox(60, 20, 30));
    Scene small(100, 100, {squareBox(40, 40, 24)});
    EXPECT_EQ(small.spread(s.det, makeWindow(46, 46, 58, 58)), squareBox(40, 40, 24));
    EXPECT_EQ(small.spread(s.det, makeWindow(52, 52, 52, 52)), squareBox(40, 40, 24));
}

TEST(CascadeSpread, FallsBackToThePredictedWindowOnlyWhenThePreviousFails)
{
    SquareDetector s;
    Scene scene(300, 200, {squareBox(40, 40, 24), squareBox(200, 120, 24)});
    std::vector<ScoredWindow> hits;
    // First face found at its previous place; second only through its prediction.
    s.det.spreadDetect(scene.in.image, {makeWindow(40, 40, 64, 64), makeWindow(100, 100, 124, 124)},
                       {makeWindow(240, 150, 264, 174), makeWindow(188, 112, 1000, 1000)}, &hits);
    EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24), squareBox(200, 120, 24)}));
    // A shorter prediction list is not read past.
    hits.clear();
    s.det.spreadDetect(scene.in.image, {makeWindow(100, 100, 124, 124)}, {}, &hits);
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSingleWindow, ScoreNeedsAWindowStrictlyInsideTheImage)
{
    SquareDetector s(squareCascade(0, 3.0f));
    Scene scene(100, 100, {squareBox(40, 40, 24), squareBox(0, 0, 24)});
    const std::pair<DetectionWindow, float> cases[] = {
        {makeWindow(40, 40, 64, 64), 3.0f},
        {makeWindow(0, 0, 24, 24), -20.0f},
        {makeWindow(76, 40, 100, 64), -20.0f},
        {makeWindow(10, 60, 34, 84), -1.0f},  // rejected at the first edge test: the score then
        {makeWindow(10, 10, 20, 20), -20.0f}, // sizes that no scale serves
        {makeWindow(30, 30, 20, 20), -20.0f},
    };
    for (auto const& [window, score] : cases)
        EXPECT_EQ(s.det.getScore(scene.in.image, window), score) << window.left << "," << window.top;
}

TEST(CascadeSingleWindow, FeatureValuesAreTheCommonStagesInputs)
{
    SquareDetector s;
    Scene scene(100, 100, {squareBox(40, 40, 24)});
    const IN_IMAGE& in = scene.in.image;
    std::vector<float> values(9, -99.0f);
    s.det.getFeature(in, makeWindow(40, 40, 64, 64), 9, values);
    // Edge contrast 200 over a deviation of 200 * sqrt(256 * 320) / 576.
    for (int i = 0; i < 4; ++i)
        EXPECT_NEAR(values[i], 2.0125f, 0.01f) << i;
    for (int i = 4; i < 8; ++i)
        EXPECT_NEAR(values[i], 0.0f, 1e-5f) << i;
    EXPECT_NEAR(values[8], 1.0f / 99.38f, 1e-4f); // the deviation feature
    std::vector<float> untouched(2, -1.0f);
    s.det.getFeature(in, makeWindow(40, 40, 64, 64), 0, untouched);
    EXPECT_EQ(untouched[0], -1.0f);
    std::vector<float> shortList(2), many(20);
    EXPECT_THROW(s.det.getFeature(in, makeWindow(40, 40, 64, 64), 3, shortList), std::out_of_range);
    EXPECT_THROW(s.det.getFeature(in, makeWindow(40, 40, 64, 64), 20, many), std::out_of_range);
    // The integral's zero row and column make the first row and column
    // readable; a window that leaves the image or is empty is refused.
    EXPECT_NO_THROW(s.det.getFeature(in, makeWindow(0, 0, 24, 24), 2, values));
    EXPECT_TRUE(s.det.featureWindowFits(in, makeWindow(0, 0, 24, 24)));
    for (const DetectionWindow& w : {makeWindow(-1, 40, 23, 64), makeWindow(40, -1, 64, 23), makeWindow(40, 40, 40, 64)}) {
        EXPECT_FALSE(s.det.featureWindowFits(in, w));
        EXPECT_THROW(s.det.getFeature(in, w, 2, values), qv_invalid_argument);
    }
}

namespace {

// Two branches: branch 1 scores higher and demands the square; branch 0
// takes anything.
CascadeModel branchedCascade(int commonFillers)
{
    CascadeModel model;
    for (int i = 0; i < commonFillers; ++i)
        model.common.push_back(passStage());
    CascadeModelStage split = CascadeWriter::stump(CascadeWriter::deviation(), 0.0f, 0.0f, 0.0f, -1e30f);
    split.scoreCount = 2;
    split.remapFlag = 1;
    split.remap = {0, 0};
    split.binScores = {{{1, 1, 1, 1, 1, 1, 1, 1}}, {{2, 2, 2, 2, 2, 2, 2, 2}}};
    split.rejectThresholds = {-1e30f, -1e30f};
    model.common.push_back(split);
    model.branches.push_back({passStage()});
    std::vector<CascadeModelStage> squareBranch;
    // Its score enters at 2: any failed edge test drops it below 1.5.
    for (int side = 0; side < 4; ++side)
        squareBranch.push_back(CascadeWriter::stump(squareEdge(side), 1.5f, 0.0f, -1.0f, 1.5f));
    model.branches.push_back(squareBranch);
    return model;
}

} // namespace

TEST(CascadeBranches, BestBranchDecidesAndItsCategoryIsReported)
{
    SquareDetector s(branchedCascade(0));
    EXPECT_EQ(s.det.branchStages.size(), 2u);
    TestFrame frame(100, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    s.det.prepareForFastComputing(in.image.stride);
    s.det.preparedWidth = 100;
    float score = 0, categories[15] = {};
    int stage = -5;
    EXPECT_TRUE(s.det.classify(in.image, makeWindow(40, 40, 64, 64), 0, 0.0f, CascadeDetector::CLASSIFY_PLAIN, &score,
                               categories, &stage));
    EXPECT_EQ(stage, 1);
    EXPECT_EQ(score, 2.0f);
    EXPECT_EQ(categories[0], 1.0f);
    EXPECT_EQ(categories[1], 2.0f);
    // Rejected inside the branch: the stage reported is the number of common stages.
    EXPECT_FALSE(s.det.classify(in.image, makeWindow(10, 60, 34, 84), 0, 0.0f, CascadeDetector::CLASSIFY_PLAIN,
                                &score, categories, &stage));
    EXPECT_EQ(stage, 1);
    // The brightness gate, when asked for, rejects dark windows before any stage.
    EXPECT_FALSE(s.det.classify(in.image, makeWindow(40, 40, 64, 64), 0, 250.0f,
                                CascadeDetector::CLASSIFY_BRIGHTNESS_GATE, &score, categories, &stage));
    EXPECT_EQ(stage, -1);
    EXPECT_EQ(score, -20.0f);
}

TEST(CascadeBranches, BranchRejectionSkipsOnlyWithFewerThanTenCommonStages)
{
    // Branch 0 accepts everything else in the row; with one common stage the
    // branch death before the square skips the square's window.
    Scene scene(120, 100, {squareBox(40, 40, 24)});
    for (int fillers : {0, 9}) {
        SquareDetector s(branchedCascade(fillers));
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(scene.in.image, {makeWindow(38, 40, 120, 41)}, &hits);
        auto square = std::find_if(hits.begin(), hits.end(),
                                   [](ScoredWindow const& h) { return boxOf(h.window) == squareBox(40, 40, 24); });
        ASSERT_EQ(square != hits.end(), fillers == 9) << fillers;
        if (square != hits.end()) {
            EXPECT_EQ(square->category, 1);
            EXPECT_EQ(square->categoryScores[1], 2.0f);
        }
    }
}

TEST(CascadeModelLoading, EveryTruncationIsADataErrorAndNeverAnOverrun)
{
    const std::vector<uint8_t> full = CascadeWriter::toBytes(branchedCascade(2));
    {
        ScopedModel whole("truncatedcascade", full);
        EXPECT_NO_THROW(CascadeDetector(detectorConfig("truncatedcascade")));
    }
    for (size_t n = 0; n < full.size(); ++n) {
        ScopedModel cut("truncatedcascade", std::vector<uint8_t>(full.begin(), full.begin() + n));
        EXPECT_THROW(CascadeDetector(detectorConfig("truncatedcascade")), qv_data_error) << n << " bytes";
    }
}

TEST(CascadeModelLoading, CorruptCountsAreDataErrors)
{
    auto withCount = [](size_t at, int32_t value) {
        std::vector<uint8_t> bytes = CascadeWriter::toBytes(branchedCascade(1));
        std::vector<uint8_t> v;
        CascadeWriter::putInt(v, value);
        std::copy(v.begin(), v.end(), bytes.begin() + at);
        return bytes;
    };
    for (int32_t bad : {-1, 1 << 20, 0x7FFFFFFF}) {
        ScopedModel m("corruptcascade", withCount(12, bad)); // common stage count
        EXPECT_THROW(CascadeDetector(detectorConfig("corruptcascade")), qv_data_error) << bad;
    }
    {
        ScopedModel m("corruptcascade", withCount(0, 99)); // header: not acted on
        EXPECT_NO_THROW(CascadeDetector(detectorConfig("corruptcascade")));
    }
    CascadeModel wide = squareCascade();
    wide.common.back().scoreCount = 16;
    ScopedModel m("corruptcascade", CascadeWriter::toBytes(wide));
    EXPECT_THROW(CascadeDetector(detectorConfig("corruptcascade")), qv_data_error);
}

TEST(CascadeModelLoading, BranchCountComesFromTheLastCommonStage)
{
    CascadeModel none;
    ScopedModel empty("emptycascade", CascadeWriter::toBytes(none));
    CascadeDetector det(detectorConfig("emptycascade"));
    EXPECT_TRUE(det.commonStages.empty());
    EXPECT_TRUE(det.branchStages.empty());
    // No stages: every window passes with score 0.
    TestFrame frame(30, 30);
    EXPECT_EQ(searchWhole(det, frame).size(), 9u);
    EXPECT_THROW(CascadeDetector(detectorConfig("nosuchcascade")), qv_data_error);
}
