// The exported entry points driven with scripted faces: session and modes,
// the frame road to the result blocks, the scaled mapping, the orientation
// search, and hostile arguments.

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstring>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/ScriptedStages.h"
#include "api/FrameOps.h"
#include "api/Session.h"
#include "core/ApiError.h"
#include "core/Errors.h"
#include "quorin/quorinapi.h"

namespace {

using qtest::makeFace;
using qtest::patternFrame;
using Frame = std::vector<unsigned char>;
using Blocks = std::vector<int>;

constexpr int kSentinel = 0x5A5A5A5A;

Blocks blocks(int count) { return Blocks(static_cast<size_t>(count) * 17, kSentinel); }
const int* block(const Blocks& b, int k) { return b.data() + 17 * k; }

class QuorinApiTest : public ::testing::Test {
protected:
    void SetUp() override {
        quorin_release();
        quorin_init();
        stages.trackingModes.clear();
        stages.searchSteps.clear();
    }
    void TearDown() override { quorin_release(); }

    qtest::ScriptedStages stages;
    qtest::ScopedStages guard{stages};
};

// ---------------------------------------------------------------- session

TEST(QuorinSession, DetectWithoutSessionReturnsZeroAndTouchesNothing) {
    quorin_release();
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    Frame frame = patternFrame(64, 48);
    Blocks out = blocks(2);
    EXPECT_EQ(quorin_detect(frame.data(), 64, 48, out.data(), 2, 90), 0);
    EXPECT_EQ(quorin_detectScaled(frame.data(), 64, 48, out.data(), 2, 90), 0);
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), 64, 48, out.data(), 2), 0);
    EXPECT_EQ(quorin_detect360High(frame.data(), 64, 48, out.data(), 2), 0);
    EXPECT_EQ(frame, patternFrame(64, 48));
    EXPECT_EQ(out, blocks(2));
    EXPECT_TRUE(stages.frames.empty());
    quorin_release();  // a second release does nothing
    EXPECT_FALSE(sessionSnapshot().open);
}

TEST(QuorinSession, ModeChangeWithoutSessionIsRefusedButTheCurrentModeIsQuiet) {
    quorin_release();
    const int mode = sessionSnapshot().detectionMode;
    EXPECT_NO_THROW(quorin_setDetectionMode(static_cast<unsigned>(mode)));
    EXPECT_THROW(quorin_setDetectionMode(mode == 1 ? 2u : 1u), ApiError);
    EXPECT_EQ(sessionSnapshot().detectionMode, mode);
}

// Stand-ins whose construction fails, as engines with a broken model would.
class FailingInitStages : public qtest::ScriptedStages {
public:
    void init(const std::string&, const std::string&) override { throw std::runtime_error("no model"); }
};

TEST(QuorinSession, FailedInitLeavesAnUnusableSessionThatFailsCleanly) {
    quorin_release();
    FailingInitStages stages;
    qtest::ScopedStages guard(stages);
    try {
        quorin_init();
        FAIL() << "init should fail";
    } catch (const ApiError& e) {
        EXPECT_STREQ(e.what(), "QVFace Detection API initialization error");
    }
    SessionSnapshot s = sessionSnapshot();
    EXPECT_TRUE(s.open);
    EXPECT_FALSE(s.buffersAllocated);
    Frame frame = patternFrame(64, 48);
    Blocks out = blocks(1);
    EXPECT_THROW(quorin_detect(frame.data(), 64, 48, out.data(), 1, 0), ApiError);
    EXPECT_THROW(quorin_detect360Tracking(frame.data(), 64, 48, out.data(), 1), ApiError);
    EXPECT_THROW(quorin_detect360High(frame.data(), 64, 48, out.data(), 1), ApiError);
    EXPECT_TRUE(stages.frames.empty());
    EXPECT_EQ(out, blocks(1));
    quorin_release();
    EXPECT_FALSE(sessionSnapshot().open);
}

TEST_F(QuorinApiTest, NewSessionStartsInHighModeWithUnknownOrientation) {
    SessionSnapshot s = sessionSnapshot();
    EXPECT_TRUE(s.open);
    EXPECT_TRUE(s.buffersAllocated);
    EXPECT_EQ(s.detectionMode, 2);
    EXPECT_EQ(s.orientation, -1);
    EXPECT_EQ(s.orientationHold, 0u);
    EXPECT_EQ(s.lastFrameWidth, -1);
    EXPECT_EQ(s.lastFrameHeight, -1);
}

TEST_F(QuorinApiTest, InitTwiceReplacesTheSession) {
    quorin_setDetectionMode(1);
    quorin_init();  // no release in between; the old session is dropped, not leaked
    EXPECT_EQ(sessionSnapshot().detectionMode, 2);
}

TEST_F(QuorinApiTest, ModesSetSearchStepAndTrackerOnlyOnRealChange) {
    quorin_setDetectionMode(2);
    EXPECT_TRUE(stages.searchSteps.empty());
    EXPECT_TRUE(stages.trackingModes.empty());

    quorin_setDetectionMode(1);
    ASSERT_EQ(stages.searchSteps.size(), 1u);
    EXPECT_FLOAT_EQ(stages.searchSteps[0].first, 0.15f);
    ASSERT_EQ(stages.trackingModes.size(), 1u);
    EXPECT_EQ(stages.trackingModes[0], QV_TRACKING_KF);
    quorin_setDetectionMode(1);  // the tracker survives a repeated request
    EXPECT_EQ(stages.trackingModes.size(), 1u);

    quorin_setDetectionMode(0);
    EXPECT_FLOAT_EQ(stages.searchSteps.back().second, 0.15f);
    EXPECT_EQ(stages.trackingModes.back(), QV_TRACKING_NONE);
    quorin_setDetectionMode(2);
    EXPECT_FLOAT_EQ(stages.searchSteps.back().first, 0.1f);
    EXPECT_EQ(stages.trackingModes.back(), QV_TRACKING_NONE);
}

TEST_F(QuorinApiTest, UnknownModeKeepsModeAndTrackerButForgetsTheRecordedSize) {
    quorin_setDetectionMode(1);
    stages.trackingModes.clear();
    quorin_setDetectionMode(7);
    EXPECT_TRUE(stages.trackingModes.empty());
    SessionSnapshot s = sessionSnapshot();
    EXPECT_EQ(s.detectionMode, 1);
    EXPECT_EQ(s.lastFrameWidth, -1);
    EXPECT_EQ(s.historyPresentCount, 0);
}

// ------------------------------------------------------- frame to work frame

TEST_F(QuorinApiTest, FrameAtTheTargetIsAnalysedInPlace) {
    Frame frame = patternFrame(640, 480);
    Blocks out = blocks(1);
    quorin_detect(frame.data(), 640, 480, out.data(), 1, 0);
    ASSERT_EQ(stages.frames.size(), 1u);
    EXPECT_EQ(stages.frames[0].pointer, frame.data());
    EXPECT_EQ(stages.frames[0].width, 640);
    EXPECT_EQ(stages.frames[0].height, 480);
    EXPECT_EQ(stages.sizeRanges.back(), std::make_pair(60, 480));
}

TEST_F(QuorinApiTest, TrackingModeShrinksToLongSide320AndBoundsTheFaceSize) {
    quorin_setDetectionMode(1);
    Frame a = patternFrame(640, 480), b = patternFrame(1280, 1280);
    Blocks out = blocks(1);
    quorin_detect(a.data(), 640, 480, out.data(), 1, 0);
    quorin_detect(b.data(), 1280, 1280, out.data(), 1, 0);
    ASSERT_EQ(stages.frames.size(), 2u);
    EXPECT_EQ(stages.frames[0].width, 320);
    EXPECT_EQ(stages.frames[0].height, 240);
    EXPECT_EQ(stages.sizeRanges[0], std::make_pair(32, 240));  // 240/8 = 30 is below the floor
    EXPECT_EQ(stages.frames[1].width, 320);
    EXPECT_EQ(stages.sizeRanges[1], std::make_pair(40, 320));
    // Nearest neighbour by halving: work pixel (x, y) is host pixel (2x, 2y).
    for (int y = 0; y < 240; y += 17)
        for (int x = 0; x < 320; x += 13)
            EXPECT_EQ(stages.frames[0].pixels[y * 320 + x], a[(2 * y) * 640 + 2 * x]);
}

TEST_F(QuorinApiTest, ShrinkThenTurnWritesTheTurnedFrameIntoTheHostsMemory) {
    quorin_setDetectionMode(1);
    Frame frame = patternFrame(640, 480);
    Blocks out = blocks(1);
    quorin_detect(frame.data(), 640, 480, out.data(), 1, 180);
    ASSERT_EQ(stages.frames.size(), 1u);
    EXPECT_EQ(stages.frames[0].pointer, frame.data());
    EXPECT_EQ(stages.frames[0].width, 320);
    // The work frame is the half-size frame turned by 180 degrees.
    const Frame original = patternFrame(640, 480);
    EXPECT_EQ(stages.frames[0].pixels[0], original[(2 * 239) * 640 + 2 * 319]);
}

TEST_F(QuorinApiTest, TurnWithoutShrinkGoesThroughTheFrameBuffer) {
    Frame frame = patternFrame(40, 20);
    Blocks out = blocks(1);
    quorin_detect(frame.data(), 40, 20, out.data(), 1, 90);
    quorin_detect(frame.data(), 40, 20, out.data(), 1, 360);
    ASSERT_EQ(stages.frames.size(), 2u);
    EXPECT_NE(stages.frames[0].pointer, frame.data());
    EXPECT_EQ(stages.frames[0].width, 20);
    EXPECT_EQ(stages.frames[0].height, 40);
    EXPECT_EQ(frame, patternFrame(40, 20)) << "the host frame stays as it was";
    // 360 copies the frame and changes nothing else.
    EXPECT_NE(stages.frames[1].pointer, frame.data());
    EXPECT_EQ(stages.frames[1].pixels, frame);
}

// ------------------------------------------------------------ result blocks

TEST_F(QuorinApiTest, BlockLayoutRectangleLandmarksAndRoll) {
    FaceData face = makeFace(100, 50, 200, 170, 1.0f);
    face.setLandmark("leftEye", Point2<float>(110, 60));
    face.setLandmark("rightEye", Point2<float>(120, 70));
    face.setLandmark("nose", Point2<float>(130, 80));
    face.setLandmark("leftMouthCorner", Point2<float>(140, 90));
    face.setLandmark("rightMouthCorner", Point2<float>(150, 100));
    stages.script.push_back({face});
    Frame frame = patternFrame(640, 480);
    Blocks out = blocks(1);
    ASSERT_EQ(quorin_detect(frame.data(), 640, 480, out.data(), 1, 0), 1);
    const Blocks expected = {45, kSentinel, kSentinel, 50, 170, 100, 200, 110, 60, 120, 70,
                             140, 90, 150, 100, 130, 80};
    EXPECT_EQ(out, expected);
    EXPECT_EQ(stages.locateCalls, 1);
}

TEST_F(QuorinApiTest, BlocksAreScaledBackToTheHostFrame) {
    quorin_setDetectionMode(1);  // 640 x 480 -> 320 x 240, factor 2 both ways
    FaceData face = makeFace(10, 20, 74, 84, 1.0f);
    // 100.49999 reaches the block as 100.5 (six digits), so 201 and not 200.
    face.setLandmark("nose", Point2<float>(100.49999f, 7.25f));
    stages.script.push_back({face});
    Frame frame = patternFrame(640, 480);
    Blocks out = blocks(1);
    ASSERT_EQ(quorin_detect(frame.data(), 640, 480, out.data(), 1, 0), 1);
    EXPECT_EQ(out[3], 40);
    EXPECT_EQ(out[4], 168);
    EXPECT_EQ(out[5], 20);
    EXPECT_EQ(out[6], 148);
    EXPECT_EQ(out[15], 201);
    EXPECT_EQ(out[16], 14);
}

TEST_F(QuorinApiTest, QuarterTurnOfAnUnturnableFrameStillSwapsTheScale) {
    // 640 x 480 in mode 2 needs no shrink and is above the turn bound: it is
    // analysed unturned, yet scaled as if turned (480/640 across, 640/480 down).
    stages.script.push_back({makeFace(100, 60, 300, 240, 1.0f)});
    Frame frame = patternFrame(640, 480);
    Blocks out = blocks(1);
    ASSERT_EQ(quorin_detect(frame.data(), 640, 480, out.data(), 1, 90), 1);
    EXPECT_EQ(stages.frames[0].pointer, frame.data());
    EXPECT_EQ(stages.frames[0].width, 640);
    EXPECT_EQ(out[5], 75);   // 100 * 0.75
    EXPECT_EQ(out[6], 225);  // 300 * 0.75
    EXPECT_EQ(out[3], 80);   // 60 * 4/3
    EXPECT_EQ(out[4], 320);  // 240 * 4/3
}

TEST_F(QuorinApiTest, OddRotationsTurnOrSwapOnlyWhereTheyMatch) {
    Frame frame = patternFrame(40, 20);
    Blocks out = blocks(1);
    // 45: no turn, no swap.
    stages.script.push_back({makeFace(4, 2, 14, 12, 1.0f)});
    ASSERT_EQ(quorin_detect(frame.data(), 40, 20, out.data(), 1, 45), 1);
    EXPECT_EQ(stages.frames[0].pointer, frame.data());
    EXPECT_EQ(out[5], 4);
    EXPECT_EQ(out[3], 2);
    // 450: the frame turns by 90 (20 x 40), but the scale isn't swapped:
    // across 40/20 = 2, down 20/40 = 0.5.
    stages.script.push_back({makeFace(4, 2, 14, 12, 1.0f)});
    ASSERT_EQ(quorin_detect(frame.data(), 40, 20, out.data(), 1, 450), 1);
    EXPECT_EQ(stages.frames[1].width, 20);
    EXPECT_EQ(out[5], 8);
    EXPECT_EQ(out[6], 28);
    EXPECT_EQ(out[3], 1);
    EXPECT_EQ(out[4], 6);
}

TEST_F(QuorinApiTest, FacesAreOrderedByScoreBestFirst) {
    stages.script.push_back({makeFace(0, 0, 40, 40, 0.2f), makeFace(40, 0, 80, 40, 0.9f),
                             makeFace(80, 0, 120, 40, 0.5f), makeFace(120, 0, 160, 40, 0.7f)});
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(4);
    ASSERT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 4, 0), 4);
    const int lefts[] = {40, 120, 80, 0};
    for (int k = 0; k < 4; ++k) EXPECT_EQ(block(out, k)[5], lefts[k]) << k;
}

TEST_F(QuorinApiTest, ScoresEqualInSixDigitsKeepTheirPlace) {
    // Different as floats, equal after the text form: no swap.
    stages.script.push_back({makeFace(0, 0, 40, 40, 0.1234561f), makeFace(40, 0, 80, 40, 0.1234564f)});
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(2);
    ASSERT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 2, 0), 2);
    EXPECT_EQ(block(out, 0)[5], 0);
    EXPECT_EQ(block(out, 1)[5], 40);
}

TEST_F(QuorinApiTest, MaxFacesRules) {
    std::vector<FaceData> three = {makeFace(0, 0, 40, 40, 0.1f), makeFace(40, 0, 80, 40, 0.3f),
                                   makeFace(80, 0, 120, 40, 0.2f)};
    Frame frame = patternFrame(320, 240);
    // 0: the detection runs, nothing is written.
    stages.script.push_back(three);
    Blocks out = blocks(3);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, nullptr, 0, 0), 0);
    EXPECT_EQ(stages.frames.size(), 1u);
    // Fewer than found: only the best ones.
    stages.script.push_back(three);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 2, 0), 2);
    EXPECT_EQ(block(out, 0)[5], 40);
    EXPECT_EQ(block(out, 1)[5], 80);
    EXPECT_EQ(block(out, 2)[5], kSentinel);
    // Negative: all found are written and the negative number comes back.
    stages.script.push_back(three);
    out = blocks(3);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), -4, 0), -4);
    EXPECT_EQ(block(out, 2)[5], 0);
}

TEST_F(QuorinApiTest, AtMostHundredBlocksAreWrittenAndSorted) {
    std::vector<FaceData> many;
    for (int i = 0; i < 120; ++i) many.push_back(makeFace(i, 0, i + 40, 40, i < 100 ? 0.01f * i : 5.0f));
    stages.script.push_back(many);
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(120);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 150, 0), 120);
    EXPECT_EQ(block(out, 0)[5], 99) << "the five best faces lie past 100 and take no part";
    EXPECT_EQ(block(out, 99)[5], 0);
    EXPECT_EQ(block(out, 100)[5], kSentinel);
}

TEST_F(QuorinApiTest, NoFaceLeavesTheBlocksUntouched) {
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(2);
    EXPECT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 2, 0), 0);
    EXPECT_EQ(out, blocks(2));
    EXPECT_EQ(stages.locateCalls, 0) << "the locator isn't run on a frame without faces";
}

TEST_F(QuorinApiTest, ResultsAreNeverSmoothedOverFrames) {
    quorin_setDetectionMode(1);
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(1);
    stages.script.push_back({makeFace(10, 10, 110, 110, 1.0f)});
    stages.script.push_back({makeFace(20, 20, 120, 120, 1.0f)});
    quorin_detect(frame.data(), 320, 240, out.data(), 1, 0);
    quorin_detect(frame.data(), 320, 240, out.data(), 1, 0);
    EXPECT_EQ(out[5], 20);
    EXPECT_EQ(out[3], 20);
    SessionSnapshot s = sessionSnapshot();
    EXPECT_EQ(s.lastFrameWidth, -1);
    EXPECT_EQ(s.historyPresentCount, 0);
}

TEST_F(QuorinApiTest, FaceWithoutLandmarksIsReportedAsAnError) {
    stages.script.push_back({makeFace(10, 10, 110, 110, 1.0f)});
    stages.dropLandmarks = true;
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(1);
    try {
        quorin_detect(frame.data(), 320, 240, out.data(), 1, 0);
        FAIL() << "expected an exception";
    } catch (const std::invalid_argument& e) {
        EXPECT_STREQ(e.what(), "No value available for the input landmark");
    }
}

TEST_F(QuorinApiTest, LandmarksFarOutsideTheIntRangeSaturate) {
    FaceData face = makeFace(10, 10, 110, 110, 1.0f);
    face.setLandmark("nose", Point2<float>(3e30f, -3e30f));
    stages.script.push_back({face});
    Frame frame = patternFrame(320, 240);
    Blocks out = blocks(1);
    ASSERT_EQ(quorin_detect(frame.data(), 320, 240, out.data(), 1, 0), 1);
    EXPECT_EQ(out[15], INT_MAX);
    EXPECT_EQ(out[16], INT_MIN);
}

// ----------------------------------------------------------- scaled results

struct Turn {
    int rotation;
    // Where host pixel (x, y) of a W x H frame lies in the turned work frame.
    static void place(int rotation, int x, int y, int W, int H, int& u, int& v) {
        switch (rotation) {
            case 90: u = H - 1 - y; v = x; break;
            case 180: u = W - 1 - x; v = H - 1 - y; break;
            case 270: u = y; v = W - 1 - x; break;
            default: u = x; v = y; break;
        }
    }
};

TEST_F(QuorinApiTest, ScaledResultsReferToTheUnturnedHostFrame) {
    const int W = 300, H = 200;  // small enough to be turned, no shrink
    for (int rotation : {0, 90, 180, 270}) {
        // A face in the middle of the turned frame, and a nose at host (60, 150).
        const int tw = (rotation == 90 || rotation == 270) ? H : W;
        const int th = (rotation == 90 || rotation == 270) ? W : H;
        // Half-sides that map without a remainder, so the middle is exact.
        FaceData face = makeFace(tw / 2 - 42, th / 2 - 42, tw / 2 + 42, th / 2 + 42, 1.0f);
        int u, v;
        Turn::place(rotation, 60, 150, W, H, u, v);
        face.setLandmark("nose", Point2<float>(static_cast<float>(u), static_cast<float>(v)));
        stages.script.push_back({face});
        Frame frame = patternFrame(W, H);
        Blocks out = blocks(1);
        ASSERT_EQ(quorin_detectScaled(frame.data(), W, H, out.data(), 1, rotation), 1) << rotation;
        EXPECT_EQ(out[3], -out[4]) << rotation;
        EXPECT_EQ(out[5], -out[6]) << rotation;
        EXPECT_LT(out[3], out[4]) << rotation;
        EXPECT_LT(out[5], out[6]) << rotation;
        // Host (60, 150) is (-600, 500) in -1000..1000, within a pixel's step.
        EXPECT_NEAR(out[15], -600, 2 * 2000 / W) << rotation;
        EXPECT_NEAR(out[16], 500, 2 * 2000 / H) << rotation;
    }
}

TEST_F(QuorinApiTest, ScaledMapsUnwrittenBlocksPastTheHundredth) {
    std::vector<FaceData> many;
    for (int i = 0; i < 101; ++i) many.push_back(makeFace(0, 0, 40, 40, 1.0f));
    stages.script.push_back(many);
    Frame frame = patternFrame(320, 240);
    Blocks out(101 * 17, 160);
    EXPECT_EQ(quorin_detectScaled(frame.data(), 320, 240, out.data(), 101, 0), 101);
    EXPECT_EQ(block(out, 100)[5], 0) << "160 of 320 maps to the middle";
    EXPECT_EQ(block(out, 100)[4], 333) << "160 of 240";
    EXPECT_EQ(block(out, 100)[1], 160) << "ints 1 and 2 are never touched";
}

// ------------------------------------------------------ orientation search

// Which turn of `host` (W x H) the work frame shows: 0, 90, 180, 270, or -1.
int turnSeen(const qtest::WorkFrame& work, const Frame& host, int W, int H) {
    for (int rotation : {0, 90, 180, 270}) {
        Frame turned(host.size());
        int w = W, h = H;
        if (!rotateFrame(turned.data(), host.data(), w, h, rotation)) continue;
        if (w != work.width || h != work.height || work.pixels.size() != turned.size()) continue;
        // The 270 turn never writes its last byte, which holds whatever was there.
        const size_t compared = rotation == 270 ? turned.size() - 1 : turned.size();
        if (std::equal(turned.begin(), turned.begin() + compared, work.pixels.begin())) return rotation;
    }
    return -1;
}

std::vector<int> turnsSeen(const qtest::ScriptedStages& stages, size_t from, const Frame& host, int W, int H) {
    std::vector<int> turns;
    for (size_t i = from; i < stages.frames.size(); ++i) turns.push_back(turnSeen(stages.frames[i], host, W, H));
    return turns;
}

TEST_F(QuorinApiTest, TrackingSearchTriesEachTurnAndHoldsTheOneThatWorked) {
    const int W = 60, H = 40;
    const Frame host = patternFrame(W, H);
    Frame frame = host;
    Blocks out = blocks(1);
    const std::vector<FaceData> none;
    const std::vector<FaceData> one = {makeFace(5, 5, 45, 45, 1.0f)};
    stages.script = {none, none, one};

    EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 1);
    EXPECT_EQ(turnsSeen(stages, 0, host, W, H), (std::vector<int>{0, 90, 180}));
    for (const auto& f : stages.frames) EXPECT_NE(f.pointer, frame.data()) << "the search works on a copy";
    SessionSnapshot s = sessionSnapshot();
    EXPECT_EQ(s.orientation, 180);
    EXPECT_EQ(s.detectionMode, 0);
    EXPECT_EQ(s.orientationHold, 5u);

    // The next call switches to tracking and looks at 180 only.
    stages.script = {one};
    stages.trackingModes.clear();
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 1);
    EXPECT_EQ(stages.trackingModes, (std::vector<QVFaceTrackingMode>{QV_TRACKING_KF}));
    EXPECT_EQ(turnSeen(stages.frames.back(), host, W, H), 180);
    EXPECT_EQ(sessionSnapshot().orientationHold, 4u) << "frames with faces count toward the hold too";

    // Four more empty frames use up the hold without a search ...
    const size_t before = stages.frames.size();
    for (int i = 0; i < 4; ++i) EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 0);
    EXPECT_EQ(stages.frames.size(), before + 4);
    s = sessionSnapshot();
    EXPECT_EQ(s.orientation, 180);
    EXPECT_EQ(s.orientationHold, 0u);
    // ... the next empty one gives the orientation up ...
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 0);
    EXPECT_EQ(sessionSnapshot().orientation, -1);
    EXPECT_EQ(stages.frames.size(), before + 5);
    // ... and the one after searches all four turns again, in mode 0.
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 0);
    EXPECT_EQ(turnsSeen(stages, before + 5, host, W, H), (std::vector<int>{0, 90, 180, 270}));
    EXPECT_EQ(sessionSnapshot().orientation, -1);
    EXPECT_EQ(sessionSnapshot().detectionMode, 0);
}

TEST_F(QuorinApiTest, TrackingSearchCopiesTheFrameAnewForEachAttempt) {
    // 1280 x 960 in mode 0 is shrunk and then turned into the memory it was
    // given: each attempt must start again from the host's own frame.
    const int W = 1280, H = 960;
    const Frame host = patternFrame(W, H);
    Frame frame = host;
    Blocks out = blocks(1);
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), W, H, out.data(), 1), 0);
    ASSERT_EQ(stages.frames.size(), 4u);
    EXPECT_EQ(frame, host) << "the host's frame is never written during a search";
    Frame shrunk(240 * 180);
    ASSERT_TRUE(resizeNearest(host.data(), W, H, shrunk.data(), 240, 180));
    EXPECT_EQ(turnsSeen(stages, 0, shrunk, 240, 180), (std::vector<int>{0, 90, 180, 270}));
}

TEST_F(QuorinApiTest, HighSearchStartsFromTheLastWorkingTurn) {
    const int W = 60, H = 40;
    const Frame host = patternFrame(W, H);
    Frame frame = host;
    Blocks out = blocks(1);
    const std::vector<FaceData> none;
    const std::vector<FaceData> one = {makeFace(5, 5, 45, 45, 1.0f)};
    stages.script = {none, one};
    EXPECT_EQ(quorin_detect360High(frame.data(), W, H, out.data(), 1), 1);
    EXPECT_EQ(sessionSnapshot().orientation, 90);
    EXPECT_EQ(sessionSnapshot().detectionMode, 2);
    const size_t before = stages.frames.size();
    EXPECT_EQ(quorin_detect360High(frame.data(), W, H, out.data(), 1), 0);
    EXPECT_EQ(turnsSeen(stages, before, host, W, H), (std::vector<int>{90, 180, 270, 0}));
    EXPECT_EQ(sessionSnapshot().orientation, -1);
}

TEST_F(QuorinApiTest, OrientationIsReportedAfterEverySearch) {
    Frame frame = patternFrame(60, 40);
    Blocks out = blocks(1);
    int orientation = 12345;
    EXPECT_EQ(quorin_detect360TrackingScaled_ornt(frame.data(), 60, 40, out.data(), 1, &orientation), 0);
    EXPECT_EQ(orientation, -1);
    stages.script = {{}, {makeFace(5, 5, 35, 35, 1.0f)}};
    EXPECT_EQ(quorin_detect360TrackingScaled_ornt(frame.data(), 60, 40, out.data(), 1, &orientation), 1);
    EXPECT_EQ(orientation, 90);
    EXPECT_THROW(quorin_detect360TrackingScaled_ornt(frame.data(), 60, 40, out.data(), 1, nullptr),
                 qv_invalid_argument);
}

// ------------------------------------------------------------ hostile input

TEST_F(QuorinApiTest, BadFrameArgumentsAreRefusedWithoutChangingTheSession) {
    Frame frame = patternFrame(64, 48);
    Blocks out = blocks(1);
    const SessionSnapshot before = sessionSnapshot();
    EXPECT_THROW(quorin_detect(nullptr, 64, 48, out.data(), 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detect(frame.data(), 0, 48, out.data(), 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detect(frame.data(), 64, -1, out.data(), 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detect(frame.data(), -64, -48, out.data(), 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detect(frame.data(), 64, 48, nullptr, 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detect(frame.data(), 65536, 65536, out.data(), 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detectScaled(frame.data(), 64, 0, out.data(), 1, 0), qv_invalid_argument);
    EXPECT_THROW(quorin_detect360Tracking(frame.data(), 0, 0, out.data(), 1), qv_invalid_argument);
    EXPECT_THROW(quorin_detect360High(nullptr, 64, 48, out.data(), 1), qv_invalid_argument);
    const SessionSnapshot after = sessionSnapshot();
    EXPECT_EQ(after.orientation, before.orientation);
    EXPECT_EQ(after.detectionMode, before.detectionMode);
    EXPECT_TRUE(stages.frames.empty());
    EXPECT_EQ(out, blocks(1));
}

TEST_F(QuorinApiTest, SoElongatedThatASideVanishesFindsNothing) {
    // 10000 x 5 in mode 2 would shrink to 640 x 0.
    Frame frame(10000 * 5, 7);
    Blocks out = blocks(1);
    stages.fallback = {makeFace(0, 0, 40, 40, 1.0f)};
    EXPECT_EQ(quorin_detect(frame.data(), 10000, 5, out.data(), 1, 90), 0);
    EXPECT_EQ(quorin_detect360Tracking(frame.data(), 5, 10000, out.data(), 1), 0);
    EXPECT_TRUE(stages.frames.empty());
    EXPECT_EQ(out, blocks(1));
}

TEST_F(QuorinApiTest, LargeFramesStayInsideTheBuffers) {
    // Mode 2 shrinks 1280 x 960 to 640 x 480, more than 320 x 320 pixels.
    const std::vector<std::pair<int, int>> sizes = {{1280, 960}, {1280, 1280}, {4000, 3000}, {641, 639}};
    for (auto size : sizes) {
        Frame frame = patternFrame(size.first, size.second);
        Blocks out = blocks(1);
        for (int rotation : {0, 90, 180, 270}) quorin_detect(frame.data(), size.first, size.second, out.data(), 1, rotation);
    }
    ASSERT_EQ(stages.frames.size(), 16u);
    EXPECT_EQ(stages.frames[0].width, 640);
    EXPECT_EQ(stages.frames[0].height, 480);
    EXPECT_EQ(stages.frames[4].width, 640);
    EXPECT_EQ(stages.frames[4].height, 640);
}

TEST_F(QuorinApiTest, FramesLargerThanTheOrientationCopyGrowIt) {
    const int W = 1500, H = 1000;  // 1.5 MB, above the initial 1 MiB copy
    Frame frame = patternFrame(W, H);
    Blocks out = blocks(1);
    EXPECT_EQ(quorin_detect360TrackingScaled(frame.data(), W, H, out.data(), 1), 0);
    EXPECT_GE(sessionSnapshot().orientationFrameBytes, static_cast<size_t>(W) * H);
    EXPECT_EQ(stages.frames.size(), 4u);
}

}  // namespace
