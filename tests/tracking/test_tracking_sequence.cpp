// All four trackers held on a moving real face, and the particle trackers'
// heap bounded over a long run with faces coming and going.

#include <gtest/gtest.h>

#include <malloc.h>

#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

#include "support/FaceSequence.h"
#include "tracking/CPFTracker.h"
#include "tracking/KFTracker.h"
#include "tracking/PFTracker.h"
#include "tracking/ParticleRandom.h"

#if defined(__SANITIZE_ADDRESS__)
// From the sanitizer runtime; its header doesn't come with every compiler.
extern "C" size_t __sanitizer_get_current_allocated_bytes();
#endif

namespace {

constexpr int kWidth = 320, kHeight = 240, kSide = 64;

struct FixedSeed {
    explicit FixedSeed(long seed) { particle_random::fixSeed(seed); }
    ~FixedSeed() { particle_random::clearFixedSeed(); }
};

size_t heapInUse()
{
#if defined(__SANITIZE_ADDRESS__)
    return __sanitizer_get_current_allocated_bytes();
#else
    return mallinfo2().uordblks;
#endif
}

std::unique_ptr<Tracker> makeTracker(const std::string& name, CascadeDetector& cascade)
{
    if (name == "SIMPLE_TRACKER") return std::make_unique<Tracker>();
    if (name == "KF_TRACKER") return std::make_unique<KFTracker>();
    if (name == "PF_TRACKER") {
        auto t = std::make_unique<PFTracker>();
        FaceEstimation e;
        e.setDetector(&cascade);
        t->setEstimator(e);
        return t;
    }
    auto t = std::make_unique<CPFTracker>();
    t->setDetector(cascade);
    return t;
}

// The detector's answer for frame t: the true box give or take two pixels,
// and nothing on every 17th frame.
std::vector<DetectionWindow> detectionsAt(int t, const DetectionWindow& truth)
{
    if (t % 17 == 16) return {};
    const int jx = (t * 7) % 5 - 2, jy = (t * 3) % 5 - 2;
    return {makeWindow(truth.left + jx, truth.top + jy, truth.right + jx, truth.bottom + jy)};
}

// Frames out of 160 on which the tracker's window keeps IoU >= 0.5 with the
// true box.
int framesHeld(const std::string& name, const facesequence::Gray& face, CascadeDetector& cascade, double slowness)
{
    constexpr int kFrames = 160;
    FixedSeed seed(1234);
    std::unique_ptr<Tracker> tracker = makeTracker(name, cascade);
    int held = 0;
    IN_IMAGE image;
    for (int t = 0; t < kFrames; ++t) {
        const DetectionWindow truth = facesequence::truthAt(t, kSide, slowness);
        const std::vector<uint8_t> px = facesequence::frameWithFace(face, kWidth, kHeight, truth.left, truth.top);
        EXPECT_TRUE(image.Init(kWidth, kHeight, kWidth, px.data()));
        // The tracker's window for this frame is its prediction, made before
        // it sees this frame's detections.
        std::vector<DetectionWindow> predicted;
        tracker->predict(image, &predicted);
        float best = 0.0f;
        for (const DetectionWindow& w : predicted) best = std::max(best, w.Overlap(truth));
        held += best >= 0.5f ? 1 : 0;
        tracker->update(image, detectionsAt(t, truth));
    }
    return held;
}

} // namespace

// A missed detection ends a track and the next frame has none: 150 of 160 is
// the most any tracker can hold. The cascade filter follows by appearance
// alone (no velocity, a nearly flat weighted mean), so it trails a face faster
// than about 1.5 pixels a frame: on the fast path it reaches 63 with this
// seed, and 60 is the floor (a poisoned cloud stops at 0).
TEST(TrackingSequence, EveryTrackerHoldsAMovingRealFace)
{
    const facesequence::Gray face = facesequence::faceCrop(kSide);
    if (face.pixels.empty()) GTEST_SKIP() << devdata::missingNote();
    auto cascade = facesequence::builtInCascade();

    struct Case {
        const char* tracker;
        double slowness; // 1: up to ~6 px a frame; 5: up to ~1.1 px a frame
        int required;    // of 160
    };
    const Case cases[] = {
        {"SIMPLE_TRACKER", 1.0, 144}, {"KF_TRACKER", 1.0, 144}, {"PF_TRACKER", 1.0, 144},
        {"CPF_TRACKER", 1.0, 60},     {"SIMPLE_TRACKER", 5.0, 144}, {"KF_TRACKER", 5.0, 144},
        {"PF_TRACKER", 5.0, 144},     {"CPF_TRACKER", 5.0, 144},
    };
    for (const Case& c : cases) {
        const int held = framesHeld(c.tracker, face, *cascade, c.slowness);
        EXPECT_GE(held, c.required) << c.tracker << " at slowness " << c.slowness;
        RecordProperty(std::string(c.tracker) + "_held_" + std::to_string(int(c.slowness)), held);
    }
}

namespace {

// 2000 frames: the face keeps moving, detections miss now and then, and a
// second face shows up for a few frames every so often, so tracks are born,
// die and reuse their slots all along.
void longRun(const std::string& name, int frames)
{
    const facesequence::Gray face = facesequence::faceCrop(48);
    if (face.pixels.empty()) GTEST_SKIP() << devdata::missingNote();
    auto cascade = facesequence::builtInCascade();
    FixedSeed seed(99);
    std::unique_ptr<Tracker> tracker = makeTracker(name, *cascade);
    IN_IMAGE image;
    std::vector<uint8_t> px;
    std::vector<DetectionWindow> predicted;
    const int warmUp = frames / 4;
    size_t atWarmUp = 0, highest = 0;
    for (int t = 0; t < frames; ++t) {
        const DetectionWindow truth = facesequence::truthAt(t, 48);
        px = facesequence::frameWithFace(face, kWidth, kHeight, truth.left, truth.top);
        ASSERT_TRUE(image.Init(kWidth, kHeight, kWidth, px.data()));
        predicted.clear();
        tracker->predict(image, &predicted);
        std::vector<DetectionWindow> detections = detectionsAt(t, truth);
        if (t % 50 < 5) detections.push_back(makeWindow(20, 150, 68, 198));
        if (t % 97 == 0) detections.push_back(makeWindow(260, 20, 308, 68));
        tracker->update(image, detections);
        if (t == warmUp) atWarmUp = heapInUse();
        if (t > warmUp) highest = std::max(highest, heapInUse());
    }
    // Vectors may still settle into a larger capacity once; anything beyond
    // that would be memory that grows with the length of the run.
    EXPECT_LE(highest, atWarmUp + 256 * 1024) << name << ": " << atWarmUp << " -> " << highest;
}

int longRunFrames()
{
    const char* v = std::getenv("QUORIN_LONG_RUN_FRAMES");
    return v ? std::max(100, std::atoi(v)) : 2000;
}

} // namespace

TEST(TrackingLongRun, ParticleTrackerMemoryStaysBounded) { longRun("PF_TRACKER", longRunFrames()); }

TEST(TrackingLongRun, CascadeParticleTrackerMemoryStaysBounded) { longRun("CPF_TRACKER", longRunFrames()); }
