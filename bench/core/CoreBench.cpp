// The shared core on the per-frame path: every face goes through its text form
// once per frame, enumeration labels are descrambled per face, and models are
// read byte-wise by some loaders and in blocks by others.
#include <benchmark/benchmark.h>

#include <vector>

#include "container/ModelReader.h"
#include "core/Descramble.h"
#include "core/FaceData.h"
#include "core/FaceModelPaths.h"
#include "core/Json.h"
#include "core/ScrambledTexts.h"
#include "support/ScopedModel.h"

static void BM_FaceDataTextRoundTrip(benchmark::State& state) {
    FaceData face;
    const std::string text = face.toJson();
    for (auto _ : state) {
        FaceData copy;
        copy.fromJson(face.toJson());
        benchmark::DoNotOptimize(copy);
    }
    state.counters["bytes"] = static_cast<double>(text.size());
}
BENCHMARK(BM_FaceDataTextRoundTrip);

static void BM_ParseDefaultConfiguration(benchmark::State& state) {
    const std::string text = FaceModelPaths(nullptr).detection();
    for (auto _ : state) benchmark::DoNotOptimize(parseJsonObject(text));
}
BENCHMARK(BM_ParseDefaultConfiguration);

static void BM_DescrambleMessage(benchmark::State& state) {
    for (auto _ : state) benchmark::DoNotOptimize(descrambleText(scrambled::kFaceRecordReadFailed));
}
BENCHMARK(BM_DescrambleMessage);

static void BM_ModelReaderRead(benchmark::State& state) {
    const unsigned chunk = static_cast<unsigned>(state.range(0));
    const std::vector<uint8_t> payload(1 << 16, 0x5A);
    ScopedModel model("bench_model", payload);
    std::vector<uint8_t> out(payload.size());
    for (auto _ : state) {
        ModelReader reader("bench_model", ModelReader::RAW);
        for (std::size_t done = 0; done < out.size(); done += chunk) reader.read(out.data() + done, 1, chunk);
        benchmark::DoNotOptimize(out.data());
    }
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * static_cast<int64_t>(payload.size()));
}
BENCHMARK(BM_ModelReaderRead)->Arg(1)->Arg(4)->Arg(65536);
