#include <gtest/gtest.h>

#include <algorithm>
#include <set>
#include <stdexcept>
#include <string>
#include <tuple>
#include <vector>

#include "CascadeWriter.h"
#include "core/Errors.h"
#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"
#include "support/ExpectThrow.h"
#include "support/ScopedModel.h"
#include "support/SquareCascade.h"
#include "support/TrackSupport.h"

namespace {

using Box = std::tuple<int, int, int, int>; // left, top, right, bottom

Box squareBox(int x, int y, int size)
{
    return Box(x, y, x + size, y + size);
}

std::set<Box> boxesOf(std::vector<ScoredWindow> const& hits)
{
    std::set<Box> out;
    for (auto const& h : hits)
        out.insert(Box(h.window.left, h.window.top, h.window.right, h.window.bottom));
    return out;
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

// A frame with the squares the cascade accepts in the windows given, and its
// integral image.
struct Scene {
    TestFrame frame;
    IN_IMAGE in;
    Scene(int w, int h, std::vector<Box> const& squares = {}) : frame(w, h)
    {
        for (auto const& [x, y, right, bottom] : squares)
            frame.squareForWindow(x, y, right - x);
        in.Init(frame.width, frame.height, frame.width, frame.pixels.data());
    }
    std::set<Box> detect(CascadeDetector& det, std::vector<DetectionWindow> const& regions)
    {
        std::vector<ScoredWindow> hits;
        det.exhaustiveDetect(in, regions, &hits);
        return boxesOf(hits);
    }
    std::set<Box> detectAll(CascadeDetector& det) { return detect(det, {makeWindow(0, 0, frame.width, frame.height)}); }
};

} // namespace

TEST(CascadeConfiguration, SizesFixTheScaleRangeAndRangesBeyondTheTablesAreRefused)
{
    ScopedModel model("squarecascade", CascadeWriter::toBytes(squareCascade()));
    const struct {
        std::string config;
        int minScale, maxScale; // -1: refused
    } cases[] = {
        {detectorConfig("squarecascade", 640, 40, 200), 3, 9}, // ceil(2.29), floor(9.5) on log base 1.25
        {detectorConfig("squarecascade", 320, 0, 0), 0, 11},   // the maximum from the image size
        {"{\"model\":\"squarecascade\"}", 0, 16},
        {detectorConfig("squarecascade", 1024, 24, 1065), 0, 16},
        {detectorConfig("squarecascade", 1024, 24, 1066), -1, -1},
        {detectorConfig("squarecascade", 2000, 24, 0), -1, -1},
        {detectorConfig("squarecascade", 1 << 30, 24, 100), -1, -1},
    };
    for (auto const& c : cases) {
        SCOPED_TRACE(c.config);
        if (c.minScale < 0) {
            EXPECT_THROW(CascadeDetector det(c.config), qv_invalid_argument);
            continue;
        }
        CascadeDetector det(c.config);
        EXPECT_EQ(det.minScale, c.minScale);
        EXPECT_EQ(det.maxScale, c.maxScale);
        EXPECT_EQ(det.commonFeatures.size(), size_t(c.maxScale) + 1);
    }
}

TEST(CascadeSearch, FindsSquaresWithinTheRegionAndTheFrameAndSkipsAfterEarlyRejects)
{
    const std::vector<Box> three{squareBox(40, 40, 24), squareBox(100, 60, 47), squareBox(203, 105, 73)};
    const Box one = squareBox(40, 40, 24);
    const DetectionWindow whole = makeWindow(-500, -500, 5000, 5000); // clamped to the frame
    const struct {
        const char* what;
        int fillers; // pass-all stages before the edge tests
        int width, height;
        std::vector<Box> squares;
        DetectionWindow region;
        std::set<Box> found;
    } cases[] = {
        {"scales 0, 3 and 5 (steps 2, 5, 7)", 0, 320, 240, three, whole, {three.begin(), three.end()}},
        {"no square", 0, 100, 80, {}, whole, {}},
        {"no pixels", 0, 0, 0, {}, whole, {}},
        {"a window never touches the last column", 0, 64, 64, {squareBox(40, 20, 24)}, whole, {}},
        {"nor the last row", 0, 64, 64, {squareBox(20, 40, 24)}, whole, {}},
        {"one pixel more fits", 0, 65, 65, {one}, whole, {one}},
        {"the region bounds the origin only", 0, 120, 100, {one}, makeWindow(40, 40, 41, 41), {one}},
        {"origins right of the region", 0, 120, 100, {one}, makeWindow(41, 0, 120, 100), {}},
        // The window left of the square dies at stage `fillers` and spares its
        // right neighbour below stage 10; the window above dies at the top
        // test, two stages later.
        {"skipped after a reject at 9", 9, 120, 100, {one}, makeWindow(38, 40, 120, 41), {}},
        {"the window at 36 skips 38 only", 9, 120, 100, {one}, makeWindow(36, 40, 120, 41), {one}},
        {"not skipped after a reject at 10", 10, 120, 100, {one}, makeWindow(38, 40, 120, 41), {one}},
        {"skipped below after a reject at 9", 7, 120, 100, {one}, makeWindow(40, 38, 41, 100), {}},
        {"not skipped below after a reject at 10", 8, 120, 100, {one}, makeWindow(40, 38, 41, 100), {one}},
    };
    for (auto const& c : cases) {
        SquareDetector s(squareCascade(c.fillers));
        Scene scene(c.width, c.height, c.squares);
        EXPECT_EQ(scene.detect(s.det, {c.region}), c.found) << c.what;
    }
    SquareDetector s;
    Scene scene(120, 100, {one});
    std::vector<ScoredWindow> hits;
    s.det.exhaustiveSearch(scene.in, makeWindow(-1000000, 2000000000, 2000000000, 2100000000), &hits);
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSearch, ImageSideAboveTheMaximumIsRefusedAndEqualIsAccepted)
{
    SquareDetector s(squareCascade(), 100);
    EXPECT_NO_THROW(Scene(100, 60).detectAll(s.det));
    Scene big(60, 101);
    std::vector<ScoredWindow> hits;
    const char* text = "Image is larger than the maximum supported size";
    expectThrowWith<qv_data_error>([&] { big.detectAll(s.det); }, text);
    expectThrowWith<qv_data_error>([&] { s.det.spreadDetect(big.in, {makeWindow(0, 0, 30, 30)}, {}, &hits); }, text);
    expectThrowWith<qv_data_error>([&] { s.det.exhaustiveSearch(big.in, makeWindow(0, 0, 60, 101), &hits); }, text);
}

TEST(CascadeSizeRange, NarrowingSkipsScalesAndOnlyTheInitialBoundsMayBeRestored)
{
    SquareDetector s(squareCascade(), 1024, 24, 400);
    Scene scene(200, 150, {squareBox(40, 40, 24), squareBox(100, 60, 47)});
    s.det.setFaceSizeRange(30, 0);
    EXPECT_EQ(scene.detectAll(s.det), (std::set<Box>{squareBox(100, 60, 47)}));
    s.det.setFaceSizeRange(24, 40);
    EXPECT_EQ(scene.detectAll(s.det), (std::set<Box>{squareBox(40, 40, 24)}));
    s.det.setFaceSizeRange(24, 400);
    EXPECT_EQ(scene.detectAll(s.det).size(), 2u);

    SquareDetector bounded(squareCascade(), 1024, 40, 200);
    for (auto const& [minSize, maxSize] : {std::pair{24, 0}, std::pair{0, 500}})
        expectThrowWith<qv_invalid_argument>([&] { bounded.det.setFaceSizeRange(minSize, maxSize); },
                                             "Face size range exceeds the initial bounds");
    // The stored bounds reach scales that have no features; searches keep to
    // the ones that have.
    EXPECT_EQ(scene.detectAll(bounded.det), (std::set<Box>{squareBox(100, 60, 47)}));
}

TEST(CascadeSpread, FallsBackToThePredictedWindowOnlyWhenThePreviousFails)
{
    SquareDetector s(squareCascade(0, 3.0f));
    Scene scene(300, 200, {squareBox(40, 40, 24), squareBox(200, 120, 24)});
    std::vector<ScoredWindow> hits;
    // First face found at its previous place; second only through its prediction.
    s.det.spreadDetect(scene.in, {makeWindow(40, 40, 64, 64), makeWindow(100, 100, 124, 124)},
                       {makeWindow(240, 150, 264, 174), makeWindow(188, 112, 1000, 1000)}, &hits);
    ASSERT_EQ(boxesOf(hits), (std::set<Box>{squareBox(40, 40, 24), squareBox(200, 120, 24)}));
    EXPECT_EQ(hits[0].score, 3.0f);
    // A shorter prediction list is not read past.
    hits.clear();
    s.det.spreadDetect(scene.in, {makeWindow(100, 100, 124, 124)}, {}, &hits);
    EXPECT_TRUE(hits.empty());
}

TEST(CascadeSingleWindow, ScoresAndFeaturesNeedAWindowInsideTheImage)
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
        EXPECT_EQ(s.det.getScore(scene.in, window), score) << window.left << "," << window.top;
    // The deviation feature: 576 / (200 * sqrt(256 * 320)). Windows outside the
    // image are the trackers' observers' to refuse (test_particle_trackers).
    std::vector<float> values(9, -99.0f);
    s.det.getFeature(scene.in, makeWindow(40, 40, 64, 64), 9, values);
    EXPECT_NEAR(values[8], 1.0f / 99.38f, 1e-4f);
}

namespace {

// The square cascade whose last stage splits into two branches, so that the
// loader reads branch stage counts and records too.
CascadeModel branchedCascade(int fillers)
{
    CascadeModel model = squareCascade(fillers);
    CascadeModelStage& last = model.common.back();
    last.scoreCount = 2;
    last.binScores.resize(2);
    last.rejectThresholds.resize(2);
    model.branches = {{passStage()}, {passStage(), CascadeWriter::stump(squareEdge(0), 1.5f, 0.0f, -1.0f, 1.5f)}};
    return model;
}

} // namespace

TEST(CascadeModelLoading, EveryTruncationIsADataErrorAndNeverAnOverrun)
{
    const std::vector<uint8_t> full = CascadeWriter::toBytes(branchedCascade(2));
    auto load = [](const std::vector<uint8_t>& bytes) {
        ScopedModel cut("truncatedcascade", bytes);
        CascadeDetector(detectorConfig("truncatedcascade"));
    };
    expectEveryCutThrows<qv_data_error>(full, load);
    EXPECT_NO_THROW(load(full));
}

TEST(CascadeModelLoading, StageCountsBeyondTheRecordsPresentAreRefusedBeforeReading)
{
    const std::vector<uint8_t> valid = CascadeWriter::toBytes(branchedCascade(1));
    // A stage record takes at least 40 bytes: a count above size / 40 can't be
    // met, though it is below the size in bytes. It is refused as a count,
    // not found out as a truncation after reserving the stages.
    const int32_t recordsAtMost = static_cast<int32_t>(valid.size() / 40);
    for (int32_t bad : {-1, recordsAtMost + 1, static_cast<int32_t>(valid.size()) - 1, 1 << 20, 0x7FFFFFFF}) {
        std::vector<uint8_t> bytes = valid, count;
        CascadeWriter::putInt(count, bad);
        std::copy(count.begin(), count.end(), bytes.begin() + 12); // after the header: the common stage count
        ScopedModel m("corruptcascade", bytes);
        SCOPED_TRACE(bad);
        expectThrowWith<qv_data_error>([] { CascadeDetector(detectorConfig("corruptcascade")); },
                                       "Cascade model is malformed: stage count out of range");
    }
    std::vector<uint8_t> header = valid;
    header[0] = 99; // a wrong header is not acted on
    ScopedModel m("corruptcascade", header);
    EXPECT_NO_THROW(CascadeDetector(detectorConfig("corruptcascade")));
}

TEST(CascadeModelLoading, AStagelessModelPassesEveryWindowAndAMissingOneIsADataError)
{
    ScopedModel empty("emptycascade", CascadeWriter::toBytes(CascadeModel()));
    CascadeDetector det(detectorConfig("emptycascade"));
    EXPECT_TRUE(det.branchStages.empty());
    EXPECT_EQ(Scene(30, 30).detectAll(det).size(), 9u);
    EXPECT_THROW(CascadeDetector(detectorConfig("nosuchcascade")), qv_data_error);
}
