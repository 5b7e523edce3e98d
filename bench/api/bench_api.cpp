// Costs of the API layer around the engines: the frame shrink and turn, one
// whole quorin_detect with stand-in stages that report a fixed list of faces
// (so the text bridge, sort and block writing are what is measured), and the
// whole entry with the real engines in each detection mode on a 640 x 480
// frame: a face photo of the development data cache when it has been
// fetched (scripts/fetch-data.sh), else a fixed pattern.

#include <benchmark/benchmark.h>

#include <string>
#include <vector>

#include "StbImageDecoder.h"

#include "api/FrameOps.h"
#include "quorin/quorinapi.h"
#include "support/DevData.h"
#include "support/ScriptedStages.h"

namespace {

void BM_ResizeNearest(benchmark::State& state) {
    const int W = static_cast<int>(state.range(0)), H = W * 3 / 4;
    const int w = 640, h = 480;
    std::vector<unsigned char> src = qtest::patternFrame(W, H), dst(static_cast<size_t>(w) * h);
    for (auto _ : state) {
        resizeNearest(src.data(), W, H, dst.data(), w, h);
        benchmark::DoNotOptimize(dst.data());
    }
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(w) * h);
}
BENCHMARK(BM_ResizeNearest)->Arg(1280)->Arg(1920);

void BM_RotateFrame(benchmark::State& state) {
    const int rotation = static_cast<int>(state.range(0));
    std::vector<unsigned char> src = qtest::patternFrame(320, 240), dst(320 * 240);
    for (auto _ : state) {
        int w = 320, h = 240;
        rotateFrame(dst.data(), src.data(), w, h, rotation);
        benchmark::DoNotOptimize(dst.data());
    }
    state.SetBytesProcessed(state.iterations() * 320 * 240);
}
BENCHMARK(BM_RotateFrame)->Arg(0)->Arg(90)->Arg(180)->Arg(270);

// One frame of 1280 x 960 in tracking mode with `faces` faces reported.
void BM_DetectEntry(benchmark::State& state) {
    qtest::ScriptedStages stages;
    for (int i = 0; i < state.range(0); ++i)
        stages.fallback.push_back(qtest::makeFace(i * 3, i * 2, i * 3 + 60, i * 2 + 60, 0.01f * static_cast<float>(i)));
    qtest::ScopedStages guard(stages);
    quorin_init();
    quorin_setDetectionMode(1);
    std::vector<unsigned char> frame = qtest::patternFrame(1280, 960);
    std::vector<int> results(100 * 17);
    for (auto _ : state) {
        stages.frames.clear();  // the stand-in keeps a copy of each work frame
        benchmark::DoNotOptimize(quorin_detect(frame.data(), 1280, 960, results.data(), 100, 90));
    }
    quorin_release();
}
BENCHMARK(BM_DetectEntry)->Arg(0)->Arg(1)->Arg(10)->Arg(100);

std::vector<unsigned char> facePhoto640() {
    int w = 0, h = 0, n = 0;
    unsigned char* photo = stbi_load(devdata::photo("franck_01829.jpg").c_str(), &w, &h, &n, 1);
    if (photo == nullptr) return qtest::patternFrame(640, 480);
    std::vector<unsigned char> frame(640 * 480);
    resizeNearest(photo, w, h, frame.data(), 640, 480);
    stbi_image_free(photo);
    return frame;
}

// One 640 x 480 frame through quorin_detect with the built-in engines, in
// mode state.range(0) (0: step 0.15, 1: tracking at 320, 2: step 0.1 at 640).
// In mode 1 the tracker carries the faces from frame to frame, as on a clip.
void BM_DetectEntryMode(benchmark::State& state) {
    const std::vector<unsigned char> source = facePhoto640();
    std::vector<unsigned char> frame(source);
    std::vector<int> results(100 * 17);
    quorin_init();
    quorin_setDetectionMode(static_cast<unsigned>(state.range(0)));
    int faces = 0;
    for (auto _ : state) {
        faces = quorin_detect(frame.data(), 640, 480, results.data(), 100, 0);
        benchmark::DoNotOptimize(results.data());
    }
    quorin_release();
    state.counters["faces"] = faces;
}
BENCHMARK(BM_DetectEntryMode)->Arg(0)->Arg(1)->Arg(2)->Unit(benchmark::kMillisecond);

}  // namespace
