// Cost of the post filters per hit: the LBP histogram of a patch, the ILABS
// quadratic form and the SVM vote on a 945-value feature, and a whole filter
// call with crop. Models are random but of realistic shape.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <random>
#include <vector>

#include "PostFilterWriters.h"
#include "container/ModelReader.h"
#include "image/IntegralImage.h"
#include "postfilter/ILabsPostFilter.h"
#include "postfilter/LbpDescriptor.h"
#include "postfilter/LbpSvmPostFilter.h"
#include "postfilter/SvmClassifier.h"
#include "support/ScopedModel.h"

namespace {

constexpr int kFeature = 945;

std::vector<float> randomValues(std::mt19937& rng, std::size_t n, float scale)
{
    std::uniform_real_distribution<float> u(-scale, scale);
    std::vector<float> v(n);
    for (float& x : v)
        x = u(rng);
    return v;
}

postfilterwriters::IlabsCategory randomCategory(std::mt19937& rng, int rank)
{
    postfilterwriters::IlabsCategory c;
    c.linear = randomValues(rng, kFeature, 0.01f);
    c.quadraticWeights = randomValues(rng, rank, 0.01f);
    for (int r = 0; r < rank; ++r) {
        c.leftRows.push_back(randomValues(rng, kFeature, 0.01f));
        c.rightRows.push_back(randomValues(rng, kFeature, 0.01f));
    }
    c.bias = 0.0f;
    return c;
}

postfilterwriters::SvmModelParams randomSvm(std::mt19937& rng, int svTotal)
{
    postfilterwriters::SvmModelParams m;
    m.degree = 2;
    m.gamma = 0.001f;
    m.coef0 = 1.0f;
    m.classCount = 2;
    m.rho = {0.0f};
    m.decisionThresholds = {0.0f};
    m.labels = {1, -1};
    m.svCounts = {svTotal / 2, svTotal - svTotal / 2};
    m.featureLength = kFeature;
    for (int i = 0; i < svTotal; ++i)
        m.supportVectors.push_back(randomValues(rng, kFeature, 4.0f));
    m.coefficients = {randomValues(rng, svTotal, 1.0f)};
    return m;
}

struct Frame {
    std::vector<uint8_t> pixels;
    IN_IMAGE image;
    explicit Frame(int side) : pixels(side * side)
    {
        std::mt19937 rng(7);
        for (auto& p : pixels)
            p = static_cast<uint8_t>(rng());
        image.Init(side, side, side, pixels.data());
    }
};

std::vector<ScoredWindow> hits(int n, float score)
{
    std::vector<ScoredWindow> out(n);
    for (int i = 0; i < n; ++i) {
        out[i].score = score;
        out[i].category = i % 15;
        out[i].window = {10 + i, 10 + i + 60, 20, 80};
    }
    return out;
}

void BM_LbpHistogram24(benchmark::State& state)
{
    std::mt19937 rng(1);
    std::vector<float> patch = randomValues(rng, 24 * 24, 128.0f);
    LbpDescriptor d(4, 4);
    std::vector<float> h(d.getLength());
    for (auto _ : state) {
        d.getFeature(patch.data(), 24, 24, h.data());
        benchmark::DoNotOptimize(h.data());
    }
}
BENCHMARK(BM_LbpHistogram24);

void BM_ILabsCategoryScore(benchmark::State& state)
{
    std::mt19937 rng(2);
    const auto c = randomCategory(rng, static_cast<int>(state.range(0)));
    ILabsClassifier::CategoryModel m(c.linear, c.quadraticWeights, c.leftRows, c.rightRows, c.bias);
    std::vector<float> f = randomValues(rng, kFeature, 10.0f);
    for (auto _ : state)
        benchmark::DoNotOptimize(m.getScore(f.data(), kFeature));
}
BENCHMARK(BM_ILabsCategoryScore)->Arg(0)->Arg(8)->Arg(32);

void BM_SvmClassify(benchmark::State& state)
{
    std::mt19937 rng(3);
    SvmClassifier c;
    postfilterwriters::ByteWriter w;
    postfilterwriters::writeSvmModel(w, randomSvm(rng, static_cast<int>(state.range(0))));
    ScopedModel model("bench_svm", w.bytes());
    ModelReader reader("bench_svm", ModelReader::RAW);
    c.init(reader);
    std::vector<float> f = randomValues(rng, kFeature, 10.0f);
    for (auto _ : state)
        benchmark::DoNotOptimize(c.classify(f.data(), kFeature));
}
BENCHMARK(BM_SvmClassify)->Arg(100)->Arg(400);

// A frame's merged hits through the ILABS filter; range(1) 1: all fast pass.
void BM_ILabsFilter(benchmark::State& state)
{
    std::mt19937 rng(4);
    std::vector<postfilterwriters::IlabsCategory> cats;
    for (int i = 0; i < 15; ++i)
        cats.push_back(randomCategory(rng, 8));
    ScopedModel model("bench_ilabs", postfilterwriters::ilabsModelPayload(cats));
    ILabsPostFilter filter("bench_ilabs");
    Frame frame(320);
    const std::vector<ScoredWindow> in = hits(static_cast<int>(state.range(0)), state.range(1) ? 7.0f : 2.0f);
    std::vector<ScoredWindow> out;
    for (auto _ : state) {
        out.clear();
        filter.filter(frame.image, in, &out);
        benchmark::DoNotOptimize(out.data());
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(BM_ILabsFilter)->Args({10, 0})->Args({10, 1});

void BM_LbpSvmFilter(benchmark::State& state)
{
    std::mt19937 rng(5);
    auto m = randomSvm(rng, 200);
    ScopedModel model("bench_lbpsvm", postfilterwriters::svmModelPayload(m, m));
    LbpSvmPostFilter filter("bench_lbpsvm");
    Frame frame(320);
    const std::vector<ScoredWindow> in = hits(10, 2.0f);
    std::vector<ScoredWindow> out;
    for (auto _ : state) {
        out.clear();
        filter.filter(frame.image, in, &out);
        benchmark::DoNotOptimize(out.data());
    }
    state.SetItemsProcessed(state.iterations() * 10);
}
BENCHMARK(BM_LbpSvmFilter);

} // namespace
