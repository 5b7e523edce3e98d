// The exported entry points driven with scripted faces: session and modes,
// the frame road to the result blocks, the scaled mapping, the orientation
// search, and hostile arguments.

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <stdexcept>
#include <string>
#include <vector>

#include "api/FrameOps.h"
#include "api/Session.h"
#include "core/ApiError.h"
#include "core/Errors.h"
#include "quorin/quorinapi.h"
#include "support/ExpectThrow.h"
#include "support/ScriptedStages.h"

namespace {

using qtest::makeFace;
using qtest::patternFrame;
using Frame = std::vector<unsigned char>;
using Blocks = std::vector<int>;
using Faces = std::vector<FaceData>;

constexpr int kSentinel = 0x5A5A5A5A;
Blocks blocks(int count) { return Blocks(static_cast<size_t>(count) * 17, kSentinel); }
const int* block(const Blocks& b, int k) { return b.data() + 17 * k; }

class QuorinApiTest : public ::testing::Test {
protected:
    void SetUp() override { quorin_init(); }
    void TearDown() override { quorin_release(); }
    // Runs one frame of W x H with `faces` and returns the blocks written.
    Blocks detectOnce(const Faces& faces, int W, int H, int maxFaces, int rotation, int* count = nullptr) {
        stages.script.push_back(faces);
        Frame frame = patternFrame(W, H);
        Blocks out = blocks(std::max(maxFaces, 1));
        const int n = quorin_detect(frame.data(), W, H, out.data(), maxFaces, rotation);
        if (count != nullptr) *count = n;
        return out;
    }

    qtest::ScriptedStages stages;
    qtest::ScopedStages guard{stages};
};

// Stand-ins whose construction fails, as engines with a broken model would.
class FailingInitStages : public qtest::ScriptedStages {
public:
    void init(const std::string&, const std::string&) override { throw std::runtime_error("no model"); }
};

TEST(QuorinSession, WithoutAWorkingSessionNothingIsTouched) {
    quorin_release();
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    Frame frame = patternFrame(64, 48);
    Blocks out = blocks(2);
    EXPECT_THROW(quorin_setDetectionMode(sessionSnapshot().detectionMode == 1 ? 2u : 1u), ApiError)
        << "a mode change needs a session";

    // A failed init leaves a session that refuses every frame.
    FailingInitStages failing;
    setPipelineStagesOverride(&failing);
    EXPECT_THROW(quorin_init(), ApiError);
    EXPECT_THROW(quorin_detect(frame.data(), 64, 48, out.data(), 1, 0), ApiError);
    quorin_release();
    EXPECT_EQ(frame, patternFrame(64, 48));
    EXPECT_EQ(out, blocks(2));
    EXPECT_TRUE(stages.frames.empty() && failing.frames.empty());
}

TEST_F(QuorinApiTest, WorkFrameIsShrunkToTheModesLongSideAndTurned) {
    Frame a = patternFrame(640, 480), b = patternFrame(1280, 1280), c = patternFrame(40, 20);
    Blocks out = blocks(1);
    quorin_detect(a.data(), 640, 480, out.data(), 1, 0);  // mode 2, at the target
    quorin_setDetectionMode(1);
    quorin_detect(b.data(), 1280, 1280, out.data(), 1, 0);
    quorin_detect(a.data(), 640, 480, out.data(), 1, 180);  // shrink, then turn into the host's memory
    quorin_detect(c.data(), 40, 20, out.data(), 1, 90);     // turn only, into the frame buffer
    ASSERT_EQ(stages.frames.size(), 4u);
    const auto& f = stages.frames;
    EXPECT_EQ(std::make_pair(f[1].width, f[1].height), std::make_pair(320, 320));
    EXPECT_EQ(std::make_pair(f[2].width, f[2].height), std::make_pair(320, 240));
    EXPECT_EQ(f[2].pointer, a.data());
    const Frame original = patternFrame(640, 480);
    for (int y = 0; y < 240; y += 7)
        for (int x = 0; x < 320; x += 5)
            ASSERT_EQ(f[2].pixels[(239 - y) * 320 + (319 - x)], original[(2 * y) * 640 + 2 * x]);
    EXPECT_EQ(std::make_pair(f[3].width, f[3].height), std::make_pair(20, 40));
    EXPECT_NE(f[3].pointer, c.data());
    EXPECT_EQ(c, patternFrame(40, 20)) << "a turn without shrink leaves the host frame alone";
    // Smallest face an eighth of the shorter side, never below 32.
    const std::vector<std::pair<int, int>> ranges = {{60, 480}, {40, 320}, {32, 240}, {32, 20}};
    EXPECT_EQ(stages.sizeRanges, ranges);
}

TEST_F(QuorinApiTest, BlockHoldsRollRectangleAndLandmarksInHostPixels) {
    FaceData face = makeFace(100, 50, 200, 170, 1.0f);
    const char* names[] = {"leftEye", "rightEye", "nose", "leftMouthCorner", "rightMouthCorner"};
    for (int i = 0; i < 5; ++i) face.setLandmark(names[i], Point2<float>(110.0f + 10 * i, 60.0f + 10 * i));
    int n = 0;
    Blocks out = detectOnce({face}, 640, 480, 1, 0, &n);
    EXPECT_EQ(n, 1);
    // Roll, two untouched ints, the rectangle, eyes, mouth corners, nose.
    EXPECT_EQ(out, (Blocks{45, kSentinel, kSentinel, 50, 170, 100, 200, 110, 60, 120, 70, 140, 90, 150, 100, 130, 80}));
    EXPECT_EQ(stages.locateCalls, 1);

    // Tracking mode halves 640 x 480: blocks come back doubled, and the
    // landmark 100.49999 arrives as 100.5 after the text form, so 201.
    quorin_setDetectionMode(1);
    face = makeFace(10, 20, 74, 84, 1.0f);
    face.setLandmark("nose", Point2<float>(100.49999f, 7.25f));
    out = detectOnce({face}, 640, 480, 1, 0);
    EXPECT_EQ((Blocks{out[3], out[4], out[5], out[6], out[15], out[16]}), (Blocks{40, 168, 20, 148, 201, 14}));
}

TEST_F(QuorinApiTest, FacesAreOrderedByTheirTextScores) {
    Blocks out = detectOnce({makeFace(0, 0, 40, 40, 0.2f), makeFace(40, 0, 80, 40, 0.9f),
                             makeFace(80, 0, 120, 40, 0.5f), makeFace(120, 0, 160, 40, 0.7f)},
                            320, 240, 4, 0);
    EXPECT_EQ((Blocks{block(out, 0)[5], block(out, 1)[5], block(out, 2)[5], block(out, 3)[5]}),
              (Blocks{40, 120, 80, 0}));
    // Different floats, equal in six digits: no swap.
    out = detectOnce({makeFace(0, 0, 40, 40, 0.1234561f), makeFace(40, 0, 80, 40, 0.1234564f)}, 320, 240, 2, 0);
    EXPECT_EQ(block(out, 0)[5], 0);
}

TEST_F(QuorinApiTest, MaxFacesAndTheHundredBlockLimit) {
    EXPECT_EQ(detectOnce({}, 320, 240, 2, 0), blocks(2)) << "no face: nothing written";
    EXPECT_EQ(stages.locateCalls, 0);
    const Faces three = {makeFace(0, 0, 40, 40, 0.1f), makeFace(40, 0, 80, 40, 0.3f), makeFace(80, 0, 120, 40, 0.2f)};
    Frame frame = patternFrame(320, 240);
    stages.script.push_back(three);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, nullptr, 0, 0), 0) << "0: detection runs, nothing written";
    int n = 0;
    Blocks out = detectOnce(three, 320, 240, 2, 0, &n);
    EXPECT_EQ(n, 2);
    EXPECT_EQ(block(out, 1)[5], 80);
    stages.script.push_back(three);
    out = blocks(3);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), -4, 0), -4) << "negative: all written";
    EXPECT_EQ(block(out, 2)[5], 0);

    Faces many;  // the five best lie past 100 and take no part in the order
    for (int i = 0; i < 120; ++i) many.push_back(makeFace(i, 0, i + 40, 40, i < 100 ? 0.01f * i : 5.0f));
    stages.script.push_back(many);
    out = blocks(120);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 150, 0), 120);
    EXPECT_EQ(block(out, 0)[5], 99);
    EXPECT_EQ(block(out, 99)[5], 0);
    EXPECT_EQ(block(out, 100)[5], kSentinel);
}

TEST_F(QuorinApiTest, HostileFacesFailOrSaturateWithoutUndefinedValues) {
    FaceData far = makeFace(10, 10, 110, 110, 1.0f);
    far.setLandmark("nose", Point2<float>(3e30f, -3e30f));
    Blocks out = detectOnce({far}, 320, 240, 1, 0);
    EXPECT_EQ((Blocks{out[15], out[16]}), (Blocks{INT_MAX, INT_MIN}));
    stages.dropLandmarks = true;
    expectThrowWith<std::invalid_argument>([&] { detectOnce({makeFace(10, 10, 110, 110, 1.0f)}, 320, 240, 1, 0); },
                                           "No value available for the input landmark");
}

TEST_F(QuorinApiTest, ScaledResultsReferToTheUnturnedHostFrame) {
    const int W = 300, H = 200;
    for (int rotation : {0, 90, 180, 270}) {
        SCOPED_TRACE(rotation);
        const bool quarter = rotation == 90 || rotation == 270;
        const int tw = quarter ? H : W, th = quarter ? W : H;
        // A middle face with half-sides that map without remainder, and the
        // nose at host pixel (60, 150), placed where the turn puts it.
        FaceData face = makeFace(tw / 2 - 42, th / 2 - 42, tw / 2 + 42, th / 2 + 42, 1.0f);
        const int u[] = {60, H - 1 - 150, W - 1 - 60, 150}, v[] = {150, 60, H - 1 - 150, W - 1 - 60};
        face.setLandmark("nose", Point2<float>(u[rotation / 90], v[rotation / 90]));
        stages.script.push_back({face});
        Frame frame = patternFrame(W, H);
        Blocks out = blocks(1);
        ASSERT_EQ(quorin_detectScaled(frame.data(), W, H, out.data(), 1, rotation), 1);
        EXPECT_EQ(out[3], -out[4]);
        EXPECT_EQ(out[5], -out[6]);
        EXPECT_LT(out[3], 0);
        EXPECT_LT(out[5], 0);
        EXPECT_NEAR(out[15], -600, 2 * 2000 / W);  // (60, 150) in -1000..1000
        EXPECT_NEAR(out[16], 500, 2 * 2000 / H);
    }
    // Past 100 faces the unwritten blocks are mapped as well; ints 1, 2 never.
    stages.script.push_back(Faces(101, makeFace(0, 0, 40, 40, 1.0f)));
    Frame frame = patternFrame(320, 240);
    Blocks out(101 * 17, 160);
    EXPECT_EQ(quorin_detectScaled(frame.data(), 320, 240, out.data(), 101, 0), 101);
    EXPECT_EQ((Blocks{block(out, 100)[1], block(out, 100)[4], block(out, 100)[5]}), (Blocks{160, 333, 0}));
}

// Which turn of `host` (W x H) each work frame from `from` on shows: 0, 90, 180, 270, or -1.
std::vector<int> turnsSeen(const qtest::ScriptedStages& stages, size_t from, const Frame& host, int W, int H) {
    std::vector<int> turns;
    for (size_t i = from; i < stages.frames.size(); ++i) {
        int seen = -1;
        for (int rotation : {0, 90, 180, 270}) {
            Frame turned(host.size());
            int w = W, h = H;
            if (!rotateFrame(turned.data(), host.data(), w, h, rotation) || w != stages.frames[i].width) continue;
            const size_t compared = turned.size() - (rotation == 270 ? 1 : 0);  // 270 leaves its last byte
            if (std::equal(turned.begin(), turned.begin() + compared, stages.frames[i].pixels.begin())) seen = rotation;
        }
        turns.push_back(seen);
    }
    return turns;
}

TEST_F(QuorinApiTest, TrackingSearchHoldsTheTurnThatWorkedForFiveFrames) {
    const int W = 60, H = 40;
    const Frame host = patternFrame(W, H);
    Frame frame = host;
    Blocks out = blocks(1);
    const Faces one = {makeFace(5, 5, 45, 45, 1.0f)};
    stages.script = {{}, {}, one};
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 1);
    EXPECT_EQ(turnsSeen(stages, 0, host, W, H), (std::vector<int>{0, 90, 180}));
    EXPECT_EQ(sessionSnapshot().detectionMode, 0);

    stages.script = {one};
    stages.trackingModes.clear();
    const size_t before = stages.frames.size();
    // One frame with faces and four without use up the hold at 180 in mode 1,
    // the next empty one gives the orientation up, the one after searches.
    std::vector<int> results, orientations;
    for (int i = 0; i < 7; ++i) {
        results.push_back(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1));
        orientations.push_back(sessionSnapshot().orientation);
    }
    EXPECT_EQ(results, (std::vector<int>{1, 0, 0, 0, 0, 0, 0}));
    EXPECT_EQ(orientations, (std::vector<int>{180, 180, 180, 180, 180, -1, -1}));
    EXPECT_EQ(turnsSeen(stages, before, host, W, H), (std::vector<int>{180, 180, 180, 180, 180, 180, 0, 90, 180, 270}));
    EXPECT_EQ(stages.trackingModes, (std::vector<QVFaceTrackingMode>{QV_TRACKING_KF, QV_TRACKING_NONE}));
    EXPECT_EQ(frame, host);

    // 1280 x 960 in mode 0 is shrunk and then turned into the memory it was
    // given; each attempt must start again from the host's own frame.
    const Frame large = patternFrame(1280, 960);
    Frame shrunk(240 * 180);
    ASSERT_TRUE(resizeNearest(large.data(), 1280, 960, shrunk.data(), 240, 180));
    frame = large;
    const size_t first = stages.frames.size();
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), 1280, 960, out.data(), 1), 0);
    EXPECT_EQ(frame, large);
    EXPECT_EQ(turnsSeen(stages, first, shrunk, 240, 180), (std::vector<int>{0, 90, 180, 270}));
}

TEST_F(QuorinApiTest, HighSearchStartsFromTheLastWorkingTurnAndReportsIt) {
    const Frame host = patternFrame(60, 40);
    Frame frame = host;
    Blocks out = blocks(1);
    stages.script = {{}, {makeFace(5, 5, 45, 45, 1.0f)}};
    EXPECT_EQ(quorin_detect360High(frame.data(), 60, 40, out.data(), 1), 1);
    EXPECT_EQ(sessionSnapshot().orientation, 90);
    EXPECT_EQ(quorin_detect360High(frame.data(), 60, 40, out.data(), 1), 0);
    EXPECT_EQ(turnsSeen(stages, 0, host, 60, 40), (std::vector<int>{0, 90, 90, 180, 270, 0}));
    EXPECT_EQ(sessionSnapshot().orientation, -1);
    int orientation = 12345;
    EXPECT_EQ(quorin_detect360TrackingScaled_ornt(frame.data(), 60, 40, out.data(), 1, &orientation), 0);
    EXPECT_EQ(orientation, -1) << "reported after a search that found nothing";
    stages.script = {{}, {makeFace(5, 5, 35, 35, 1.0f)}};
    EXPECT_EQ(quorin_detect360TrackingScaled_ornt(frame.data(), 60, 40, out.data(), 1, &orientation), 1);
    EXPECT_EQ(orientation, 90);
    EXPECT_THROW(quorin_detect360TrackingScaled_ornt(frame.data(), 60, 40, out.data(), 1, nullptr),
                 qv_invalid_argument);
}

// Null and zero-sized frame arguments are left to FuzzQuorinApi.
TEST_F(QuorinApiTest, FramesOfAnyShapeStayInsideTheBuffers) {
    // Shrunk work frames up to 640 x 640, more than the 320 x 320 turn bound.
    for (auto size : {std::make_pair(1280, 960), std::make_pair(1280, 1280), std::make_pair(4000, 3000)}) {
        Frame frame = patternFrame(size.first, size.second);
        Blocks out = blocks(1);
        for (int rotation : {0, 90, 180, 270}) quorin_detect(frame.data(), size.first, size.second, out.data(), 1, rotation);
    }
    ASSERT_EQ(stages.frames.size(), 12u);
    EXPECT_EQ(std::make_pair(stages.frames[4].width, stages.frames[4].height), std::make_pair(640, 640));
    // So elongated that a side shrinks to 0: nothing can be found.
    Frame thin(10000 * 5, 7);
    Blocks out = blocks(1);
    stages.fallback = {makeFace(0, 0, 40, 40, 1.0f)};
    EXPECT_EQ(quorin_detect(thin.data(), 10000, 5, out.data(), 1, 90), 0);
    EXPECT_EQ(quorin_detect360Tracking(thin.data(), 5, 10000, out.data(), 1), 0);
    EXPECT_EQ(stages.frames.size(), 12u);
    // Larger than the initial 1 MiB orientation copy: the copy grows.
    stages.fallback.clear();
    Frame large = patternFrame(1500, 1000);
    EXPECT_EQ(quorin_detect360TrackingScaled(large.data(), 1500, 1000, out.data(), 1), 0);
    EXPECT_GE(sessionSnapshot().orientationFrameBytes, 1500u * 1000u);
}

}  // namespace
