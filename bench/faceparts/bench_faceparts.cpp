// Cost of the landmark stage: one integer net run at the sizes a landmark net
// uses, the fixed-point sigmoid, and one face through the whole locator.
#include <benchmark/benchmark.h>

#include <memory>
#include <random>
#include <string>
#include <vector>

#include "NetWriter.h"
#include "faceparts/FacePartLocator.h"
#include "faceparts/NeuralNet.h"
#include "support/ScopedModel.h"

namespace {

netwriter::NetDescription landmarkShape(uint16_t side, uint16_t hidden) {
    const uint16_t n = uint16_t(side * side);
    netwriter::NetDescription d =
        netwriter::denseNet({n, hidden, 10}, {0, TXF_SIGMOID, TXF_LINEAR}, {1, 4096, 1}, 42, 200, true, 12);
    d.inputDivisors.assign(n, 400);
    d.inputOffsets.assign(n, 800LL * 65535);
    return d;
}

std::vector<int32_t> patchInputs(size_t n, double zeroShare) {
    std::mt19937 rng(7);
    std::vector<int32_t> in(n);
    for (auto& v : in) v = (rng() % 1000) < zeroShare * 1000 ? 0 : int32_t(rng() % 2000);
    return in;
}

void BM_NetRun(benchmark::State& state) {
    const auto d = landmarkShape(uint16_t(state.range(0)), uint16_t(state.range(1)));
    const auto blob = netwriter::writeBlob(d);
    NeuralNet net;
    net.loadBuffer(blob.data(), blob.size());
    const auto in = patchInputs(d.layerSizes[0], 0.0);
    uint32_t best = 0;
    for (auto _ : state) benchmark::DoNotOptimize(net.Run(in.data(), &best));
    state.counters["connections"] = double(d.layerSizes[0]) * d.layerSizes[1] + 10.0 * d.layerSizes[1];
}
BENCHMARK(BM_NetRun)->Args({16, 32})->Args({16, 64})->Args({24, 64})->Args({32, 64})->Args({32, 128});

void BM_Sigmoid16(benchmark::State& state) {
    int32_t x = -0x90000;
    for (auto _ : state) {
        benchmark::DoNotOptimize(Sigmoid16(x));
        x = x >= 0x90000 ? -0x90000 : x + 977;
    }
}
BENCHMARK(BM_Sigmoid16);

// One 120 x 120 face in a 320 x 240 frame of noise through the locator.
void locateOneFace(benchmark::State& state, const char* model) {
    FacePartLocator locator;
    locator.init(std::string("{\"neuralNetModelPath\":\"") + model + "\"}");
    std::vector<unsigned char> frame(320 * 240);
    std::mt19937 rng(5);
    for (auto& p : frame) p = uint8_t(rng());
    std::vector<FaceData> faces(1);
    faces[0].setFaceRect(Rect2<int32_t>(100, 60, 220, 180));
    for (auto _ : state) locator.locateParts(frame.data(), 320, 240, faces);
}

void BM_LocateOneFace(benchmark::State& state) {
    const auto d = landmarkShape(uint16_t(state.range(0)), 64);
    ScopedModel model("benchlocnet", netwriter::writeContainer({netwriter::writeBlob(d)}));
    locateOneFace(state, "benchlocnet");
}
BENCHMARK(BM_LocateOneFace)->Arg(16)->Arg(24)->Arg(32);

// The shipped landmark net on one 120 x 120 face, as the pipeline runs it.
void BM_LocateOneFaceBuiltin(benchmark::State& state) {
    locateOneFace(state, "mdnb");
}
BENCHMARK(BM_LocateOneFaceBuiltin);

// Reference for the ratios: one plain pass summing the same 320 x 240 frame.
void BM_PlainFramePass(benchmark::State& state) {
    std::vector<unsigned char> frame(320 * 240, 7);
    for (auto _ : state) {
        unsigned sum = 0;
        for (unsigned char p : frame) sum += p;
        benchmark::DoNotOptimize(sum);
    }
}
BENCHMARK(BM_PlainFramePass);

}  // namespace
