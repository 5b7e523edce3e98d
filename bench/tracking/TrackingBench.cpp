// Costs of the trackers' frame step and of the detector front end with and
// without a tracker, on synthetic frames with bright squares that the test
// cascade accepts.

#include <benchmark/benchmark.h>

#include <vector>

#include "detector/FaceDetector.h"
#include "image/IntegralImage.h"
#include "support/FaceDetectorRig.h"
#include "tracking/KFTracker.h"
#include "tracking/Tracker.h"

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

} // namespace

BENCHMARK(BM_SimpleTrackerFrame)->Arg(1)->Arg(5)->Arg(20);
BENCHMARK(BM_KalmanTrackerFrame)->Arg(1)->Arg(5)->Arg(20);
BENCHMARK(BM_FaceDetectorFrame)->Arg(0)->Arg(1)->Arg(2)->Unit(benchmark::kMicrosecond);
