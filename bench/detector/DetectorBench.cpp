// The detector's inner loop with the built-in cascade: integral image
// construction and the exhaustive search at the work sizes of the detect
// entries. The frame is a real group photo from the development data cache
// when it has been fetched (scripts/fetch-data.sh), else seeded noise with a
// gradient, which the cascade rejects early like most of a real frame. A plain
// pass over the frame's bytes runs beside them as the reference for ratios.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <random>
#include <string>
#include <vector>

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"
#pragma GCC diagnostic ignored "-Wsign-compare"
#pragma GCC diagnostic ignored "-Wunused-function"
#define STB_IMAGE_IMPLEMENTATION
#define STBI_NO_HDR
#include <stb/stb_image.h>
#pragma GCC diagnostic pop

#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"

namespace {

// A w x h gray frame: the cached photo sampled to that size, or noise.
std::vector<unsigned char> frame(int w, int h)
{
    std::vector<unsigned char> out(static_cast<size_t>(w) * h);
    const char* env = std::getenv("QUORIN_DATA_DIR");
    const char* home = std::getenv("HOME");
    const std::string path = std::string(env ? env : (home ? std::string(home) + "/.cache/quorin" : ".")) +
                             "/photos/tracking_faces.jpg";
    int pw = 0, ph = 0, n = 0;
    if (unsigned char* photo = stbi_load(path.c_str(), &pw, &ph, &n, 1)) {
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x)
                out[static_cast<size_t>(y) * w + x] = photo[static_cast<size_t>(y * ph / h) * pw + x * pw / w];
        stbi_image_free(photo);
        return out;
    }
    std::mt19937 rng(7);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x)
            out[static_cast<size_t>(y) * w + x] = static_cast<unsigned char>((x + y) / 8 + rng() % 64);
    return out;
}

void BM_FrameBytePass(benchmark::State& state)
{
    const int w = int(state.range(0)), h = int(state.range(1));
    const std::vector<unsigned char> pixels = frame(w, h);
    for (auto _ : state) {
        uint32_t sum = 0;
        for (unsigned char p : pixels)
            sum += p;
        benchmark::DoNotOptimize(sum);
    }
    state.SetBytesProcessed(state.iterations() * int64_t(w) * h);
}

void BM_IntegralImage(benchmark::State& state)
{
    const int w = int(state.range(0)), h = int(state.range(1));
    const std::vector<unsigned char> pixels = frame(w, h);
    IN_IMAGE image;
    for (auto _ : state) {
        image.Init(w, h, w, pixels.data());
        benchmark::ClobberMemory();
    }
    state.SetBytesProcessed(state.iterations() * int64_t(w) * h);
}

// As the detect entries search a work frame without a tracker: smallest face
// max(32, short side / 8), steps 0.1 (state.range(2) = 10) or 0.15 (15).
void BM_ExhaustiveDetect(benchmark::State& state)
{
    const int w = int(state.range(0)), h = int(state.range(1));
    const float step = float(state.range(2)) / 100.0f;
    const std::vector<unsigned char> pixels = frame(w, h);
    CascadeDetector cascade(R"({"model":"mdcb","imageMaxSize":640,"faceMinSize":32,"faceMaxSize":640})");
    cascade.setSearchStep(step, step);
    cascade.setFaceSizeRange(std::max(32, std::min(w, h) / 8), std::min(w, h));
    IN_IMAGE image;
    image.Init(w, h, w, pixels.data());
    DetectionWindow whole;
    whole.left = 0;
    whole.top = 0;
    whole.right = w;
    whole.bottom = h;
    std::vector<ScoredWindow> hits;
    for (auto _ : state) {
        hits.clear();
        cascade.exhaustiveDetect(image, {whole}, &hits);
        benchmark::DoNotOptimize(hits.data());
    }
    state.counters["hits"] = double(hits.size());
}

} // namespace

BENCHMARK(BM_FrameBytePass)->Args({320, 240})->Args({640, 480});
BENCHMARK(BM_IntegralImage)->Args({320, 240})->Args({640, 480});
BENCHMARK(BM_ExhaustiveDetect)->Args({320, 240, 15})->Args({320, 240, 10})->Args({640, 480, 10})->Unit(benchmark::kMillisecond);
