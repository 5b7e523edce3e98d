// Hosts that break the one-thread rule: the entry points must serialise their
// calls, so that the process survives and the session stays whole. CI runs
// this program under ThreadSanitizer as well (scripts/tsan.sh).

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <future>
#include <thread>
#include <vector>

#include "api/Session.h"
#include "core/ApiError.h"
#include "quorin/quorinapi.h"
#include "support/FaceSequence.h"
#include "support/ScriptedStages.h"

namespace {

using Frame = std::vector<unsigned char>;
constexpr int kW = 160, kH = 120, kMaxFaces = 4;

// The development face on a textured background, or the background alone
// without the data cache (the threads then race over empty frames).
Frame faceFrame() {
    const facesequence::Gray face = facesequence::faceCrop(64);
    if (face.pixels.empty()) return facesequence::background(kW, kH);
    return facesequence::frameWithFace(face, kW, kH, 48, 28);
}

// One-thread blocks of `frame` in a fresh session, mode 2.
std::vector<int> referenceBlocks(const Frame& frame, int& n) {
    quorin_init();
    Frame copy = frame;
    std::vector<int> out(17 * kMaxFaces, 0);
    n = quorin_detect(copy.data(), kW, kH, out.data(), kMaxFaces, 0);
    quorin_release();
    return out;
}

// A call of one entry on a private copy of the frame; its result, which must
// count faces within maxFaces.
using Entry = std::function<int(unsigned char*, int*, int)>;

void runThreads(const std::vector<Entry>& entries, const Frame& frame, int rounds) {
    std::atomic<int> outOfRange{0};
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([&, t] {
            Frame copy;
            std::vector<int> out(17 * kMaxFaces);
            for (int i = 0; i < rounds; ++i) {
                copy = frame;
                const int n = entries[(t * 3 + i) % entries.size()](copy.data(), out.data(), i);
                if (n < 0 || n > kMaxFaces) ++outOfRange;
            }
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(outOfRange.load(), 0);
}

// Mode switches race with detection; between a release and the next init a
// new mode is refused as it is without threads.
int switchMode(unsigned int mode) {
    try {
        quorin_setDetectionMode(mode);
    } catch (const ApiError&) {
    }
    return 0;
}

class HostThreads : public ::testing::Test {
protected:
    void TearDown() override { quorin_release(); }
    const Frame frame = faceFrame();
};

// The case that crashed the process before the session had its lock: the
// detect and 360 entries and mode switches from four threads at once.
TEST_F(HostThreads, DetectAndModeSwitchesFromFourThreadsLeaveTheSessionWhole) {
    int expectedCount = 0;
    const std::vector<int> expected = referenceBlocks(frame, expectedCount);
    if (!facesequence::faceCrop(64).pixels.empty()) {
        ASSERT_GT(expectedCount, 0) << "the frame should show a face";
    }
    quorin_init();
    runThreads({[](unsigned char* f, int* r, int) { return quorin_detect(f, kW, kH, r, kMaxFaces, 0); },
                [](unsigned char* f, int* r, int) { return quorin_detect360Tracking(f, kW, kH, r, kMaxFaces); },
                [](unsigned char* f, int* r, int) { return quorin_detect360High(f, kW, kH, r, kMaxFaces); },
                [](unsigned char*, int*, int i) { return switchMode(static_cast<unsigned>(i % 3)); }},
               frame, 12);
    // The session still gives what one thread is given.
    quorin_setDetectionMode(1);
    quorin_setDetectionMode(2);
    Frame copy = frame;
    std::vector<int> out(17 * kMaxFaces, 0);
    EXPECT_EQ(quorin_detect(copy.data(), kW, kH, out.data(), kMaxFaces, 0), expectedCount);
    EXPECT_EQ(out, expected);
}

TEST_F(HostThreads, EveryEntryIncludingInitAndReleaseFromFourThreads) {
    std::atomic<int> strangeOrientations{0};
    runThreads({[](unsigned char*, int*, int i) { return i % 4 == 0 ? (quorin_init(), 0) : 0; },
                [](unsigned char* f, int* r, int) { return quorin_detect(f, kW, kH, r, kMaxFaces, 90); },
                [](unsigned char* f, int* r, int) { return quorin_detectScaled(f, kW, kH, r, kMaxFaces, 180); },
                [](unsigned char* f, int* r, int) { return quorin_detect360Tracking(f, kW, kH, r, kMaxFaces); },
                [](unsigned char* f, int* r, int) { return quorin_detect360TrackingScaled(f, kW, kH, r, kMaxFaces); },
                [](unsigned char* f, int* r, int) { return quorin_detect360High(f, kW, kH, r, kMaxFaces); },
                [](unsigned char* f, int* r, int) { return quorin_detect360HighScaled(f, kW, kH, r, kMaxFaces); },
                [&](unsigned char* f, int* r, int) {
                    thread_local int mine = 0;
                    const int n = quorin_detect360TrackingScaled_ornt(f, kW, kH, r, kMaxFaces, &mine);
                    if (mine < -1 || mine > 270 || (mine != -1 && mine % 90 != 0)) ++strangeOrientations;
                    return n;
                },
                [](unsigned char*, int*, int i) { return switchMode(static_cast<unsigned>(i % 4)); },
                [](unsigned char*, int*, int i) { return i % 3 == 0 ? (quorin_release(), 0) : 0; }},
               frame, 20);
    EXPECT_EQ(strangeOrientations.load(), 0) << "an orientation other than -1, 0, 90, 180, 270 was reported";
}

// A stand-in whose first detection waits until the test lets it go on.
class HeldStages : public qtest::ScriptedStages {
public:
    std::promise<void> entered;
    std::promise<void> proceed;
    void detect(const unsigned char* pixels, int width, int height, std::vector<FaceData>& faces) override {
        if (!held_) {
            held_ = true;
            entered.set_value();
            proceed.get_future().wait();
        }
        ScriptedStages::detect(pixels, width, height, faces);
    }

private:
    bool held_ = false;
};

TEST(HostThreadsOrder, ReleaseDuringADetectionWaitsForItAndLaterCallsFindNoSession) {
    HeldStages stages;
    qtest::ScopedStages guard(stages);
    stages.fallback = {qtest::makeFace(10, 10, 50, 50, 1.0f)};
    quorin_init();
    quorin_setDetectionMode(0);
    Frame frame = qtest::patternFrame(kW, kH);
    std::vector<int> out(17, 0);
    auto detecting = std::async(std::launch::async,
                                [&] { return quorin_detect(frame.data(), kW, kH, out.data(), 1, 0); });
    stages.entered.get_future().wait();
    std::atomic<bool> released{false};
    std::thread releasing([&] {
        quorin_release();
        released = true;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
    EXPECT_FALSE(released.load()) << "release went ahead of the detection in progress";
    stages.proceed.set_value();
    EXPECT_EQ(detecting.get(), 1);
    EXPECT_EQ(out[5], 10);
    releasing.join();
    EXPECT_TRUE(released.load());

    // After the release the entries behave as without a session.
    Frame again = qtest::patternFrame(kW, kH);
    EXPECT_EQ(quorin_detect(again.data(), kW, kH, out.data(), 1, 0), 0);
    EXPECT_EQ(quorin_detect360High(again.data(), kW, kH, out.data(), 1), 0);
    int orientation = 7;
    EXPECT_EQ(quorin_detect360TrackingScaled_ornt(again.data(), kW, kH, out.data(), 1, &orientation), 0);
    EXPECT_EQ(orientation, sessionSnapshot().orientation);
    EXPECT_THROW(quorin_setDetectionMode(1), ApiError);
    EXPECT_EQ(stages.frames.size(), 1u);
}

}  // namespace
