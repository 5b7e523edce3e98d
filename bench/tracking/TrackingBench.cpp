// Costs of the trackers' frame step and of the detector front end with and
// without a tracker, on synthetic frames with bright squares that the test
// cascade accepts; and of all four trackers on a work frame with real faces
// and the built-in cascade.

#include <benchmark/benchmark.h>

#include <vector>

#include "engine/FaceDetector.h"
#include "image/IntegralImage.h"
#include "support/FaceDetectorRig.h"
#include "support/FaceSequence.h"
#include "tracking/CPFTracker.h"
#include "tracking/KFTracker.h"
#include "tracking/PFTracker.h"
#include "tracking/ParticleRandom.h"
#include "tracking/Tracker.h"

#include <chrono>
#include <memory>

namespace {

std::vector<DetectionWindow> faceRow(int count, int shift)
{
    std::vector<DetectionWindow> out;
    for (int i = 0; i < count; ++i) {
        DetectionWindow w;
        w.left = 10 + 60 * i + shift;
        w.right = w.left + 47;
        w.top = 20 + shift;
        w.bottom = w.top + 47;
        out.push_back(w);
    }
    return out;
}

template <typename T>
void trackerStep(benchmark::State& state)
{
    const int faces = int(state.range(0));
    T tracker;
    IN_IMAGE image;
    std::vector<DetectionWindow> predicted;
    int shift = 0;
    for (auto _ : state) {
        predicted.clear();
        tracker.predict(image, &predicted);
        tracker.update(image, faceRow(faces, shift));
        shift = (shift + 2) % 8;
        benchmark::DoNotOptimize(predicted.data());
    }
    state.SetItemsProcessed(state.iterations() * faces);
}

void BM_SimpleTrackerFrame(benchmark::State& state) { trackerStep<Tracker>(state); }
void BM_KalmanTrackerFrame(benchmark::State& state) { trackerStep<KFTracker>(state); }

// One 320 x 240 frame with three faces; mode 0 searches it whole, mode 2
// follows the known faces and searches one twelfth.
void BM_FaceDetectorFrame(benchmark::State& state)
{
    FaceDetectorModels models;
    FaceDetector fd;
    fd.init(FaceDetectorModels::config());
    fd.setTrackingMode(QVFaceTrackingMode(state.range(0)));
    TestFrame frame(320, 240);
    frame.squareForWindow(20, 30, 47);
    // Origins on the search grid of the whole frame and of their own cell
    // (the cell's grid starts at the cell's corner).
    frame.squareForWindow(246, 12, 59);
    frame.squareForWindow(140, 100, 38);
    std::vector<FaceData> faces;
    // Let every cell come round once so that all faces are tracked.
    for (int i = 0; i < 12; ++i) fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
    for (auto _ : state) {
        fd.detect(frame.pixels.data(), frame.width, frame.height, faces);
        benchmark::DoNotOptimize(faces.data());
    }
    state.counters["faces"] = double(faces.size());
}

// A 320 x 240 work frame with `count` faces of 48 pixels (the development
// face when the data cache is there, a flat block otherwise) and their boxes.
struct FaceFrame {
    IN_IMAGE image;
    std::vector<DetectionWindow> boxes;

    explicit FaceFrame(int count)
    {
        facesequence::Gray face = facesequence::faceCrop(48);
        if (face.pixels.empty()) {
            face.width = face.height = 48;
            face.pixels.assign(48 * 48, 200);
        }
        std::vector<uint8_t> px = facesequence::background(320, 240);
        for (int i = 0; i < count; ++i) {
            const int x = 10 + 60 * (i % 5), y = 30 + 100 * (i / 5);
            for (int r = 0; r < 48; ++r)
                for (int c = 0; c < 48; ++c) px[size_t((y + r) * 320 + x + c)] = face.at(c, r);
            boxes.push_back(makeWindow(x, y, x + 48, y + 48));
        }
        image.Init(320, 240, 320, px.data());
    }
};

std::unique_ptr<Tracker> trackerFor(int mode, CascadeDetector& cascade)
{
    switch (mode) {
    case 1: return std::make_unique<Tracker>();
    case 2: return std::make_unique<KFTracker>();
    case 3: {
        auto t = std::make_unique<PFTracker>();
        FaceEstimation e;
        e.setDetector(&cascade);
        t->setEstimator(e);
        return t;
    }
    default: {
        auto t = std::make_unique<CPFTracker>();
        t->setDetector(cascade);
        return t;
    }
    }
}

// One frame of a tracker that sees every face detected: predict, then update.
void frameStep(Tracker& t, FaceFrame& frame, std::vector<DetectionWindow>& predicted)
{
    predicted.clear();
    t.predict(frame.image, &predicted);
    t.update(frame.image, frame.boxes);
}

double nsPerFrame(int mode, CascadeDetector& cascade, FaceFrame& frame, int frames)
{
    std::unique_ptr<Tracker> t = trackerFor(mode, cascade);
    std::vector<DetectionWindow> predicted;
    frameStep(*t, frame, predicted);
    const auto t0 = std::chrono::steady_clock::now();
    for (int i = 0; i < frames; ++i) frameStep(*t, frame, predicted);
    return std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now() - t0).count() / frames;
}

// Args: tracking mode (1 simple, 2 KF, 3 PF, 4 CPF) and number of faces. The
// counter xKF is the cost over that of the Kalman tracker on the same frame,
// timed in the same run; msPerFace is per face and frame.
void BM_TrackerOnFaces(benchmark::State& state)
{
    const int mode = int(state.range(0));
    const int count = int(state.range(1));
    particle_random::fixSeed(17);
    auto cascade = facesequence::builtInCascade();
    FaceFrame frame(count);
    std::unique_ptr<Tracker> t = trackerFor(mode, *cascade);
    std::vector<DetectionWindow> predicted;
    frameStep(*t, frame, predicted); // open the tracks
    const auto t0 = std::chrono::steady_clock::now();
    for (auto _ : state) {
        frameStep(*t, frame, predicted);
        benchmark::DoNotOptimize(predicted.data());
    }
    const double ns = std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now() - t0).count() /
                      double(state.iterations());
    state.counters["xKF"] = ns / nsPerFrame(2, *cascade, frame, 2000);
    state.counters["msPerFace"] = ns / 1e6 / count;
    particle_random::clearFixedSeed();
}

} // namespace

BENCHMARK(BM_TrackerOnFaces)
    ->ArgsProduct({{1, 2, 3, 4}, {1, 3, 10}})
    ->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_SimpleTrackerFrame)->Arg(1)->Arg(5)->Arg(20);
BENCHMARK(BM_KalmanTrackerFrame)->Arg(1)->Arg(5)->Arg(20);
BENCHMARK(BM_FaceDetectorFrame)->Arg(0)->Arg(1)->Arg(2)->Unit(benchmark::kMicrosecond);
