// The numeric building blocks at realistic sizes, each beside a plain loop
// doing the same arithmetic in the same run: a 1-D kernel over 10^6 samples,
// a 2-D Gaussian over a 640x480 float image, a PCA projection 945 -> 64.
// Compare each pair's times (the ratio is what matters across machines).
#include <benchmark/benchmark.h>

#include <random>
#include <vector>

#include "quorin/Filter1D.h"
#include "quorin/Filter2D.h"
#include "quorin/ProjectionTransforms.h"

namespace {

std::vector<float> noise(std::size_t n, unsigned seed) {
    std::mt19937 rng(seed);
    std::uniform_real_distribution<float> u(-1.0f, 1.0f);
    std::vector<float> v(n);
    for (float& x : v) x = u(rng);
    return v;
}

inline int clampTo(int i, int n) { return i < 0 ? 0 : (i >= n ? n - 1 : i); }

// Convolution with replicated borders, accumulating in a local.
void plainConvolve(const float* data, int n, const std::vector<float>& k, int anchor, float* out) {
    const int taps = static_cast<int>(k.size());
    for (int i = 0; i < n; ++i) {
        float s = 0.0f;
        for (int j = 0; j < taps; ++j) s += k[j] * data[clampTo(anchor + i - j, n)];
        out[i] = s;
    }
}

std::vector<float> taps(const QVFilterKernel1D& k) {
    std::vector<float> c(k.size());
    for (unsigned int i = 0; i < k.size(); ++i) c[i] = k[i];
    return c;
}

constexpr int kSamples = 1000000;

void BM_Kernel1D_Gaussian2_1M(benchmark::State& state) {
    const std::vector<float> signal = noise(kSamples, 1);
    std::vector<float> out(kSamples);
    GaussianFilter1D g(2.0f);  // 13 taps
    for (auto _ : state) {
        g.filter(signal.data(), kSamples, 1, 1, out.data());
        benchmark::DoNotOptimize(out.data());
    }
    state.SetItemsProcessed(state.iterations() * kSamples);
}
BENCHMARK(BM_Kernel1D_Gaussian2_1M)->Unit(benchmark::kMillisecond);

void BM_Kernel1D_Reference_1M(benchmark::State& state) {
    const std::vector<float> signal = noise(kSamples, 1);
    std::vector<float> out(kSamples);
    const GaussianFilter1D g(2.0f);
    const std::vector<float> k = taps(g.kernel());
    for (auto _ : state) {
        plainConvolve(signal.data(), kSamples, k, g.kernel().getAnchor(), out.data());
        benchmark::DoNotOptimize(out.data());
    }
    state.SetItemsProcessed(state.iterations() * kSamples);
}
BENCHMARK(BM_Kernel1D_Reference_1M)->Unit(benchmark::kMillisecond);

constexpr int kWidth = 640, kHeight = 480;

void BM_Gaussian2D_640x480(benchmark::State& state) {
    const std::vector<float> image = noise(kWidth * kHeight, 2);
    std::vector<float> out(kWidth * kHeight);
    GaussianFilter2D g(1.5f);  // 9 taps each way
    for (auto _ : state) {
        g.filter(image.data(), kWidth, kHeight, kWidth, kWidth, out.data());
        benchmark::DoNotOptimize(out.data());
    }
    state.SetItemsProcessed(state.iterations() * kWidth * kHeight);
}
BENCHMARK(BM_Gaussian2D_640x480)->Unit(benchmark::kMillisecond);

void BM_Gaussian2D_Reference_640x480(benchmark::State& state) {
    const std::vector<float> image = noise(kWidth * kHeight, 2);
    std::vector<float> rows(kWidth * kHeight), out(kWidth * kHeight), column(kHeight), filtered(kHeight);
    const GaussianFilter1D g(1.5f);
    const std::vector<float> k = taps(g.kernel());
    const int anchor = g.kernel().getAnchor();
    for (auto _ : state) {
        for (int y = 0; y < kHeight; ++y) plainConvolve(&image[y * kWidth], kWidth, k, anchor, &rows[y * kWidth]);
        for (int x = 0; x < kWidth; ++x) {
            for (int y = 0; y < kHeight; ++y) column[y] = rows[y * kWidth + x];
            plainConvolve(column.data(), kHeight, k, anchor, filtered.data());
            for (int y = 0; y < kHeight; ++y) out[y * kWidth + x] = filtered[y];
        }
        benchmark::DoNotOptimize(out.data());
    }
    state.SetItemsProcessed(state.iterations() * kWidth * kHeight);
}
BENCHMARK(BM_Gaussian2D_Reference_640x480)->Unit(benchmark::kMillisecond);

constexpr int kRaw = 945, kPca = 64;

void BM_Pca_945_to_64(benchmark::State& state) {
    const std::vector<float> m = noise(kRaw, 3), p = noise(kRaw * kPca, 4), in = noise(kRaw, 5);
    Eigen::MatrixXf projection(kPca, kRaw);
    for (int r = 0; r < kPca; ++r)
        for (int c = 0; c < kRaw; ++c) projection(r, c) = p[r * kRaw + c];
    const PcaTransform pca(Eigen::Map<const Eigen::VectorXf>(m.data(), kRaw), projection);
    std::vector<float> out(kPca);
    for (auto _ : state) {
        pca.transform(in.data(), kRaw, out.data());
        benchmark::DoNotOptimize(out.data());
    }
}
BENCHMARK(BM_Pca_945_to_64)->Unit(benchmark::kMicrosecond);

void BM_Pca_Reference_945_to_64(benchmark::State& state) {
    const std::vector<float> m = noise(kRaw, 3), p = noise(kRaw * kPca, 4), in = noise(kRaw, 5);
    std::vector<float> centred(kRaw), out(kPca);
    for (auto _ : state) {
        for (int c = 0; c < kRaw; ++c) centred[c] = in[c] - m[c];
        for (int r = 0; r < kPca; ++r) {
            float s = 0.0f;
            for (int c = 0; c < kRaw; ++c) s += p[r * kRaw + c] * centred[c];
            out[r] = s;
        }
        benchmark::DoNotOptimize(out.data());
    }
}
BENCHMARK(BM_Pca_Reference_945_to_64)->Unit(benchmark::kMicrosecond);

}  // namespace
