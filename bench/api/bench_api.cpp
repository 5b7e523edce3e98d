// Costs of the API layer around the engines: the frame shrink and turn, and
// one whole quorin_detect with stand-in stages that report a fixed list of
// faces (so the text bridge, sort and block writing are what is measured).

#include <benchmark/benchmark.h>

#include <vector>

#include "api/FrameOps.h"
#include "quorin/quorinapi.h"
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

}  // namespace
