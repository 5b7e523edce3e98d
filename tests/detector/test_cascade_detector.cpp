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

TEST(CascadeSearch, FindsSquaresAtTheirPlacesAndScales)
{
    SquareDetector s;
    TestFrame frame(320, 240);
    frame.squareForWindow(40, 40, 24);   // scale 0, step 2
    frame.squareForWindow(100, 60, 47);  // scale 3, step 5
    frame.squareForWindow(203, 105, 73); // scale 5, step 7
    const auto hits = searchWhole(s.det, frame);
    EXPECT_EQ(boxesOf(hits),
              (std::set<Box>{squareBox(40, 40, 24), squareBox(100, 60, 47), squareBox(203, 105, 73)}));
    for (auto const& h : hits) {
        EXPECT_EQ(h.score, 0.0f);
        EXPECT_EQ(h.category, 0);
    }
}

TEST(CascadeSearch, EmptyFrameAndTinyFramesGiveNoHits)
{
    SquareDetector s;
    TestFrame dark(100, 80);
    EXPECT_TRUE(searchWhole(s.det, dark).empty());
    TestFrame tiny(24, 24, kBright);
    tiny.fill(0, 0, 4, 24, kDark);
    EXPECT_TRUE(searchWhole(s.det, tiny).empty());
    TestFrame none(0, 0);
    EXPECT_TRUE(searchWhole(s.det, none).empty());
}

TEST(CascadeSearch, WindowNeverTouchesTheLastColumnOrRow)
{
    SquareDetector s;
    TestFrame exact(64, 64); // window 40..64 would end on the frame's edge
    exact.squareForWindow(40, 20, 24);
    EXPECT_TRUE(searchWhole(s.det, exact).empty());
    TestFrame wider(65, 65);
    wider.squareForWindow(40, 40, 24);
    EXPECT_EQ(boxesOf(searchWhole(s.det, wider)), (std::set<Box>{squareBox(40, 40, 24)}));
}

TEST(CascadeSearch, RegionBoundsTheOriginOnly)
{
    SquareDetector s;
    TestFrame frame(120, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    // A region holding just the origin finds the window reaching beyond it.
    s.det.exhaustiveDetect(in.image, {makeWindow(40, 40, 41, 41)}, &hits);
    EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24)}));
    hits.clear();
    s.det.exhaustiveDetect(in.image, {makeWindow(41, 0, 120, 100), makeWindow(0, 41, 120, 100)}, &hits);
    EXPECT_TRUE(hits.empty());
    // Regions reaching outside the frame are clamped, not searched outside it.
    s.det.exhaustiveDetect(in.image, {makeWindow(-500, -500, 5000, 5000)}, &hits);
    EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24)}));
    hits.clear();
    s.det.exhaustiveSearch(in.image, makeWindow(-1000000, 2000000000, 2000000000, 2100000000), &hits);
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSearch, SkipsRightNeighbourAfterEarlyReject)
{
    // The edge tests follow `fillers` pass-all stages: the window left of the
    // square dies at stage `fillers`.
    TestFrame frame(120, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    {
        SquareDetector s(squareCascade(9));
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(in.image, {makeWindow(38, 40, 120, 41)}, &hits);
        EXPECT_TRUE(hits.empty()) << "a death at stage 9 spares the next window";
        // Starting one window earlier, the skipped window is the one at 38.
        s.det.exhaustiveDetect(in.image, {makeWindow(36, 40, 120, 41)}, &hits);
        EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24)}));
    }
    {
        SquareDetector s(squareCascade(10));
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(in.image, {makeWindow(38, 40, 120, 41)}, &hits);
        EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24)})) << "stage 10 spares nothing";
    }
}

TEST(CascadeSearch, SkipsTheWindowBelowAfterEarlyReject)
{
    // The window above the square passes the left and right edge tests and
    // dies at the top one, two stages after the fillers.
    TestFrame frame(120, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    {
        SquareDetector s(squareCascade(7));
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(in.image, {makeWindow(40, 38, 41, 100)}, &hits);
        EXPECT_TRUE(hits.empty());
    }
    {
        SquareDetector s(squareCascade(8));
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(in.image, {makeWindow(40, 38, 41, 100)}, &hits);
        EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24)}));
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
    TestFrame frame(200, 150);
    frame.squareForWindow(40, 40, 24);
    frame.squareForWindow(100, 60, 47);
    s.det.setFaceSizeRange(30, 0);
    EXPECT_EQ(boxesOf(searchWhole(s.det, frame)), (std::set<Box>{squareBox(100, 60, 47)}));
    s.det.setFaceSizeRange(24, 40);
    EXPECT_EQ(boxesOf(searchWhole(s.det, frame)), (std::set<Box>{squareBox(40, 40, 24)}));
    s.det.setFaceSizeRange(0, 0);
    EXPECT_EQ(s.det.minScale, 0);
    EXPECT_EQ(s.det.maxScale, 2);
    s.det.setFaceSizeRange(24, 400);
    EXPECT_EQ(searchWhole(s.det, frame).size(), 2u);
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
    TestFrame frame(200, 150);
    frame.squareForWindow(40, 40, 24);
    frame.squareForWindow(100, 60, 47);
    EXPECT_EQ(boxesOf(searchWhole(s.det, frame)), (std::set<Box>{squareBox(100, 60, 47)}));
}

TEST(CascadeSizeRange, ScaleRejoiningAfterAWidthChangeSearchesOnFreshOffsets)
{
    SquareDetector s(squareCascade(), 1024, 24, 400);
    TestFrame narrow(100, 100), wide(200, 150);
    narrow.squareForWindow(40, 40, 24);
    wide.squareForWindow(100, 60, 24);
    s.det.setFaceSizeRange(30, 0);
    searchWhole(s.det, narrow);
    s.det.setFaceSizeRange(24, 0);
    EXPECT_EQ(boxesOf(searchWhole(s.det, wide)), (std::set<Box>{squareBox(100, 60, 24)}));
    s.det.setFaceSizeRange(30, 0);
    searchWhole(s.det, narrow);
    s.det.setFaceSizeRange(24, 0);
    EXPECT_EQ(boxesOf(searchWhole(s.det, narrow)), (std::set<Box>{squareBox(40, 40, 24)}));
}

TEST(CascadeSpread, FindsTheSquareNearTheGivenWindowAndStopsAtTheFirstHit)
{
    SquareDetector s(squareCascade(0, 3.0f));
    TestFrame frame(200, 150);
    frame.squareForWindow(60, 50, 24);
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    // Center of the given window (72, 62) lies on the square's center.
    EXPECT_TRUE(s.det.spreadSearch(in.image, makeWindow(55, 45, 89, 79), &hits));
    ASSERT_EQ(hits.size(), 1u);
    EXPECT_EQ(boxOf(hits[0].window), squareBox(60, 50, 24));
    EXPECT_EQ(hits[0].score, 3.0f);
    // 12 px to the left: the spiral reaches the square 3 columns out.
    hits.clear();
    EXPECT_TRUE(s.det.spreadSearch(in.image, makeWindow(48, 50, 72, 74), &hits));
    ASSERT_EQ(hits.size(), 1u);
    EXPECT_EQ(boxOf(hits[0].window), squareBox(60, 50, 24));
    hits.clear();
    EXPECT_FALSE(s.det.spreadSearch(in.image, makeWindow(150, 100, 174, 124), &hits));
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSpread, TriesTheLeftColumnOfARingBeforeTheRight)
{
    SquareDetector s;
    TestFrame frame(200, 100);
    // Both squares 24 px (6 spiral columns) from the center at x 100.
    frame.squareForWindow(64, 30, 24);
    frame.squareForWindow(112, 30, 24);
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    ASSERT_TRUE(s.det.spreadSearch(in.image, makeWindow(88, 30, 112, 54), &hits));
    EXPECT_EQ(boxOf(hits[0].window), squareBox(64, 30, 24));
}

TEST(CascadeSpread, TriesTheNearestScaleFirst)
{
    SquareDetector s;
    TestFrame frame(300, 200);
    frame.squareForWindow(60, 20, 30);  // scale 1, center (75, 35)
    frame.squareForWindow(100, 20, 47); // scale 3, center (123, 43)
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    // Windows centred at (99, 39), both squares in reach: the scale nearest
    // to the window's size is searched first.
    ASSERT_TRUE(s.det.spreadSearch(in.image, makeWindow(76, 16, 123, 63), &hits));
    EXPECT_EQ(boxOf(hits[0].window), squareBox(100, 20, 47));
    hits.clear();
    ASSERT_TRUE(s.det.spreadSearch(in.image, makeWindow(84, 24, 114, 54), &hits));
    EXPECT_EQ(boxOf(hits[0].window), squareBox(60, 20, 30));
}

TEST(CascadeSpread, SmallWindowStartsAtTheLowestScale)
{
    SquareDetector s;
    TestFrame frame(100, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    EXPECT_TRUE(s.det.spreadSearch(in.image, makeWindow(46, 46, 58, 58), &hits));
    EXPECT_TRUE(s.det.spreadSearch(in.image, makeWindow(52, 52, 52, 52), &hits));
    EXPECT_EQ(hits.size(), 2u);
}

TEST(CascadeSpread, FallsBackToThePredictedWindowOnlyWhenThePreviousFails)
{
    SquareDetector s;
    TestFrame frame(300, 200);
    frame.squareForWindow(40, 40, 24);
    frame.squareForWindow(200, 120, 24);
    Integral in(frame);
    std::vector<ScoredWindow> hits;
    // First face found at its previous place; second only through its prediction.
    s.det.spreadDetect(in.image, {makeWindow(40, 40, 64, 64), makeWindow(100, 100, 124, 124)},
                       {makeWindow(240, 150, 264, 174), makeWindow(188, 112, 1000, 1000)}, &hits);
    EXPECT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24), squareBox(200, 120, 24)}));
    // A shorter prediction list is not read past.
    hits.clear();
    s.det.spreadDetect(in.image, {makeWindow(100, 100, 124, 124)}, {}, &hits);
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSingleWindow, ScoreNeedsAWindowStrictlyInsideTheImage)
{
    SquareDetector s(squareCascade(0, 3.0f));
    TestFrame frame(100, 100);
    frame.squareForWindow(40, 40, 24);
    frame.squareForWindow(0, 0, 24);
    Integral in(frame);
    EXPECT_EQ(s.det.getScore(in.image, makeWindow(40, 40, 64, 64)), 3.0f);
    EXPECT_EQ(s.det.getScore(in.image, makeWindow(0, 0, 24, 24)), -20.0f);
    EXPECT_EQ(s.det.getScore(in.image, makeWindow(76, 40, 100, 64)), -20.0f);
    // Rejected at the first edge test: the score at that moment.
    EXPECT_EQ(s.det.getScore(in.image, makeWindow(10, 60, 34, 84)), -1.0f);
    // Sizes that no scale serves.
    EXPECT_EQ(s.det.getScore(in.image, makeWindow(10, 10, 20, 20)), -20.0f);
    EXPECT_EQ(s.det.getScore(in.image, makeWindow(30, 30, 20, 20)), -20.0f);
}

TEST(CascadeSingleWindow, FeatureValuesAreTheCommonStagesInputs)
{
    SquareDetector s;
    TestFrame frame(100, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    std::vector<float> values(9, -99.0f);
    s.det.getFeature(in.image, makeWindow(40, 40, 64, 64), 9, values);
    // Edge contrast 200 over a deviation of 200 * sqrt(256 * 320) / 576.
    for (int i = 0; i < 4; ++i)
        EXPECT_NEAR(values[i], 2.0125f, 0.01f) << i;
    for (int i = 4; i < 8; ++i)
        EXPECT_NEAR(values[i], 0.0f, 1e-5f) << i;
    EXPECT_NEAR(values[8], 1.0f / 99.38f, 1e-4f); // the deviation feature
    std::vector<float> untouched(2, -1.0f);
    s.det.getFeature(in.image, makeWindow(40, 40, 64, 64), 0, untouched);
    EXPECT_EQ(untouched[0], -1.0f);
    std::vector<float> shortList(2);
    EXPECT_THROW(s.det.getFeature(in.image, makeWindow(40, 40, 64, 64), 3, shortList), std::out_of_range);
    std::vector<float> many(20);
    EXPECT_THROW(s.det.getFeature(in.image, makeWindow(40, 40, 64, 64), 20, many), std::out_of_range);
    EXPECT_THROW(s.det.getFeature(in.image, makeWindow(0, 40, 24, 64), 2, values), qv_invalid_argument);
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
    TestFrame frame(120, 100);
    frame.squareForWindow(40, 40, 24);
    Integral in(frame);
    {
        SquareDetector s(branchedCascade(0)); // branch death reports stage 1
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(in.image, {makeWindow(38, 40, 120, 41)}, &hits);
        // Branch 0 accepts everything else in the row, but the square's window
        // was skipped.
        for (auto const& h : hits)
            EXPECT_NE(boxOf(h.window), squareBox(40, 40, 24));
    }
    {
        SquareDetector s(branchedCascade(9)); // 10 common stages
        std::vector<ScoredWindow> hits;
        s.det.exhaustiveDetect(in.image, {makeWindow(38, 40, 120, 41)}, &hits);
        ASSERT_FALSE(hits.empty());
        bool found = false;
        for (auto const& h : hits)
            if (boxOf(h.window) == squareBox(40, 40, 24)) {
                found = true;
                EXPECT_EQ(h.category, 1);
                EXPECT_EQ(h.categoryScores[1], 2.0f);
            }
        EXPECT_TRUE(found);
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
