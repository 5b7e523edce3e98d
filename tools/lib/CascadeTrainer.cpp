#include "CascadeTrainer.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>
#include <thread>

#include "detector/WindowFeature.h"

namespace cascadetrain {

void SampleSet::add(const uint8_t* patch, float inverseDeviation)
{
    const size_t base = integrals.size();
    integrals.resize(base + kIntegralSize, 0);
    uint32_t* ii = integrals.data() + base;
    for (int y = 0; y < kPatch; ++y) {
        uint32_t row = 0;
        for (int x = 0; x < kPatch; ++x) {
            row += patch[y * kPatch + x];
            ii[(y + 1) * kStride + x + 1] = ii[y * kStride + x + 1] + row;
        }
    }
    inverseDeviations.push_back(inverseDeviation);
}

void SampleSet::addFrom(SampleSet const& other, size_t i)
{
    const uint32_t* src = other.integral(i);
    integrals.insert(integrals.end(), src, src + kIntegralSize);
    inverseDeviations.push_back(other.inverseDeviation(i));
}

// Same order and precision as the engine's evaluation.
float Feature::eval(const uint32_t* ii, float inverseDeviation) const
{
    float v = 0.0f;
    for (Rect const& r : rects) {
        const uint32_t sum = ii[r.bottom * kStride + r.right] + ii[r.top * kStride + r.left] -
                             ii[r.top * kStride + r.right] - ii[r.bottom * kStride + r.left];
        v += static_cast<float>(sum) * r.weight;
    }
    return v * inverseDeviation;
}

FeaturePool::FeaturePool(int minWidth, int minHeight, float shiftRatio, float growRatio)
{
    int count = 0;
    WindowFeature* pool =
        WindowFeature::generateFeaturePool(kPatch, kPatch, minWidth, minHeight, shiftRatio, growRatio, &count);
    if (pool == nullptr)
        return;
    for (int i = 0; i < count; ++i) {
        if (pool[i].kind != WindowFeature::HAAR || pool[i].haar == nullptr)
            continue;
        Feature f;
        for (int k = 0; k < pool[i].haar->count; ++k) {
            HaarRect const& r = pool[i].haar->rects[k];
            f.rects.push_back({r.weight, r.left, r.top, r.right, r.bottom});
        }
        features.push_back(std::move(f));
    }
    WindowFeature::destroyFeaturePool(pool);
}

float Stage::sum(const uint32_t* integral, float inverseDeviation) const
{
    float s = 0.0f;
    for (Stump const& st : stumps)
        s += st.eval(integral, inverseDeviation);
    return s;
}

bool Cascade::passes(const uint32_t* integral, float inverseDeviation) const
{
    if (inverseDeviation >= kGateInverseDeviation)
        return false;
    for (Stage const& s : stages)
        if (!s.passes(integral, inverseDeviation))
            return false;
    return true;
}

float Cascade::scoreGain() const
{
    if (stages.empty() || !(stages.back().medianMargin > 0.0f))
        return 1.0f;
    const double e = std::round(std::log2(targetMedianScore / stages.back().medianMargin));
    return static_cast<float>(std::ldexp(1.0, static_cast<int>(std::clamp(e, -20.0, 20.0))));
}

namespace {

constexpr float kNever = -1e30f;

// Copies the never-written slot 1 (exactly 0) over slot 0: the next boosted
// stage starts its sum from 0.
CascadeModelStage resetStage()
{
    CascadeModelStage s;
    s.feature.kind = 0;
    s.binThresholds.fill(0.0f);
    s.scoreCount = 2;
    s.remapFlag = 1;
    s.remap = {1, 1};
    s.binScores.assign(2, std::array<float, 8>{});
    s.rejectThresholds.assign(2, kNever);
    return s;
}

} // namespace

CascadeModel Cascade::toModel() const
{
    CascadeModel m;
    CascadeModelStage gate = CascadeWriter::stump(CascadeWriter::deviation(), kGateInverseDeviation, -1.0f, 0.0f, -0.5f);
    m.common.push_back(gate);
    const float gain = scoreGain();
    for (size_t k = 0; k < stages.size(); ++k) {
        const bool last = k + 1 == stages.size();
        const float g = last ? gain : 1.0f;
        if (k > 0)
            m.common.push_back(resetStage());
        Stage const& st = stages[k];
        for (size_t j = 0; j < st.stumps.size(); ++j) {
            Stump const& s = st.stumps[j];
            std::vector<CascadeModelRect> rects;
            for (Rect const& r : s.feature.rects)
                rects.push_back({r.weight, r.left, r.top, r.right, r.bottom});
            const float reject = j + 1 == st.stumps.size() ? st.threshold * g : kNever;
            m.common.push_back(CascadeWriter::stump(CascadeWriter::haar(rects), s.threshold, s.above * g,
                                                    s.below * g, reject));
        }
    }
    if (!stages.empty())
        m.common.push_back(CascadeWriter::constants({-stages.back().threshold * gain}));
    CascadeWriter::completeBranches(m);
    return m;
}

bool Cascade::save(std::string const& path) const
{
    const std::string tmp = path + ".tmp";
    std::FILE* f = std::fopen(tmp.c_str(), "w");
    if (f == nullptr)
        return false;
    std::fprintf(f, "cascade 1\ntarget %a\nstages %zu\n", static_cast<double>(targetMedianScore), stages.size());
    for (Stage const& s : stages) {
        std::fprintf(f, "stage %zu %a %a\n", s.stumps.size(), static_cast<double>(s.threshold),
                     static_cast<double>(s.medianMargin));
        for (Stump const& st : s.stumps) {
            std::fprintf(f, "stump %a %a %a %zu", static_cast<double>(st.threshold), static_cast<double>(st.above),
                         static_cast<double>(st.below), st.feature.rects.size());
            for (Rect const& r : st.feature.rects)
                std::fprintf(f, " %a %d %d %d %d", static_cast<double>(r.weight), r.left, r.top, r.right, r.bottom);
            std::fprintf(f, "\n");
        }
    }
    const bool ok = std::fclose(f) == 0;
    return ok && std::rename(tmp.c_str(), path.c_str()) == 0;
}

bool Cascade::load(std::string const& path)
{
    std::ifstream in(path);
    std::string word;
    int version = 0;
    size_t count = 0;
    std::string target;
    if (!(in >> word >> version) || word != "cascade" || version != 1)
        return false;
    if (!(in >> word >> target) || word != "target")
        return false;
    if (!(in >> word >> count) || word != "stages" || count > 100000)
        return false;
    Cascade c;
    c.targetMedianScore = std::strtof(target.c_str(), nullptr);
    for (size_t k = 0; k < count; ++k) {
        size_t n = 0;
        std::string thr, med;
        if (!(in >> word >> n >> thr >> med) || word != "stage" || n > 100000)
            return false;
        Stage s;
        s.threshold = std::strtof(thr.c_str(), nullptr);
        s.medianMargin = std::strtof(med.c_str(), nullptr);
        for (size_t j = 0; j < n; ++j) {
            std::string t, a, b;
            size_t rects = 0;
            if (!(in >> word >> t >> a >> b >> rects) || word != "stump" || rects > 64)
                return false;
            Stump st;
            st.threshold = std::strtof(t.c_str(), nullptr);
            st.above = std::strtof(a.c_str(), nullptr);
            st.below = std::strtof(b.c_str(), nullptr);
            for (size_t r = 0; r < rects; ++r) {
                std::string w;
                Rect rc{};
                if (!(in >> w >> rc.left >> rc.top >> rc.right >> rc.bottom))
                    return false;
                if (rc.left < 0 || rc.top < 0 || rc.right > kPatch || rc.bottom > kPatch || rc.left > rc.right ||
                    rc.top > rc.bottom)
                    return false;
                rc.weight = std::strtof(w.c_str(), nullptr);
                st.feature.rects.push_back(rc);
            }
            s.stumps.push_back(std::move(st));
        }
        c.stages.push_back(std::move(s));
    }
    *this = std::move(c);
    return true;
}

namespace {

struct Candidate {
    double gain = -1.0;
    size_t order = 0; // position in the round's draw: ties go to the earlier one
    size_t feature = 0;
    float threshold = 0.0f;
};

bool better(Candidate const& a, Candidate const& b)
{
    return a.gain > b.gain || (a.gain == b.gain && a.order < b.order);
}

struct Samples {
    std::vector<const uint32_t*> integral;
    std::vector<float> inverseDeviation;
    std::vector<double> label; // +1 / -1
};

void searchFeatures(FeaturePool const& pool, Samples const& s, std::vector<double> const& w,
                    std::vector<size_t> const& draw, size_t first, size_t step, int bins, Candidate* best)
{
    const size_t n = s.label.size();
    std::vector<float> values(n);
    std::vector<double> binW(bins), binS(bins);
    double totalW = 0, totalS = 0;
    for (size_t i = 0; i < n; ++i) {
        totalW += w[i];
        totalS += w[i] * s.label[i];
    }
    for (size_t d = first; d < draw.size(); d += step) {
        Feature const& f = pool[draw[d]];
        float lo = INFINITY, hi = -INFINITY;
        for (size_t i = 0; i < n; ++i) {
            const float v = f.eval(s.integral[i], s.inverseDeviation[i]);
            values[i] = v;
            lo = std::min(lo, v);
            hi = std::max(hi, v);
        }
        if (!(hi > lo))
            continue;
        std::fill(binW.begin(), binW.end(), 0.0);
        std::fill(binS.begin(), binS.end(), 0.0);
        const double scale = bins / (static_cast<double>(hi) - lo);
        for (size_t i = 0; i < n; ++i) {
            const int b = std::min(bins - 1, static_cast<int>((values[i] - lo) * scale));
            binW[b] += w[i];
            binS[b] += w[i] * s.label[i];
        }
        double rightW = 0, rightS = 0;
        for (int k = bins - 1; k >= 1; --k) {
            rightW += binW[k];
            rightS += binS[k];
            const double leftW = totalW - rightW, leftS = totalS - rightS;
            if (rightW <= 1e-12 || leftW <= 1e-12)
                continue;
            const double gain = rightS * rightS / rightW + leftS * leftS / leftW;
            Candidate c{gain, d, draw[d], static_cast<float>(lo + k / scale)};
            if (better(c, *best))
                *best = c;
        }
    }
}

} // namespace

Stage trainStage(FeaturePool const& pool, SampleSet const& positives, SampleSet const& negatives,
                 StageOptions const& options, StageReport* report)
{
    Samples s;
    const size_t np = positives.size(), nn = negatives.size();
    for (size_t i = 0; i < np; ++i) {
        s.integral.push_back(positives.integral(i));
        s.inverseDeviation.push_back(positives.inverseDeviation(i));
        s.label.push_back(1.0);
    }
    for (size_t i = 0; i < nn; ++i) {
        s.integral.push_back(negatives.integral(i));
        s.inverseDeviation.push_back(negatives.inverseDeviation(i));
        s.label.push_back(-1.0);
    }
    const size_t n = np + nn;
    std::vector<double> w(n);
    // a positive weight above 1 makes the stumps keep faces first (asymmetric
    // boosting): a stage held to very few stumps and a very high hit rate
    // otherwise spends them on the bulk and ties its score at the cut
    const double pw = options.positiveWeight / (options.positiveWeight + 1.0);
    for (size_t i = 0; i < n; ++i)
        w[i] = i < np ? pw / np : (1.0 - pw) / nn;
    std::vector<float> F(n, 0.0f);
    Stage stage;
    std::mt19937_64 rng(options.seed);
    const size_t perRound =
        std::max<size_t>(1, static_cast<size_t>(options.featureFraction * static_cast<double>(pool.size())));
    const int threads = std::max(1, options.threads);
    std::vector<float> sortedPos(np);
    double hit = 1.0, fp = 1.0;
    while (static_cast<int>(stage.stumps.size()) < options.maxStumps) {
        std::vector<size_t> draw(perRound);
        for (size_t& d : draw)
            d = static_cast<size_t>(rng() % pool.size());
        std::vector<Candidate> best(threads);
        std::vector<std::thread> workers;
        for (int t = 1; t < threads; ++t)
            workers.emplace_back(searchFeatures, std::cref(pool), std::cref(s), std::cref(w), std::cref(draw),
                                 static_cast<size_t>(t), static_cast<size_t>(threads), options.bins, &best[t]);
        searchFeatures(pool, s, w, draw, 0, threads, options.bins, &best[0]);
        for (std::thread& th : workers)
            th.join();
        Candidate top = best[0];
        for (Candidate const& c : best)
            if (better(c, top))
                top = c;
        if (top.gain < 0)
            break;
        Stump st;
        st.feature = pool[top.feature];
        st.threshold = top.threshold;
        double aw = 0, as = 0, bw = 0, bs = 0;
        std::vector<uint8_t> isAbove(n);
        for (size_t i = 0; i < n; ++i) {
            isAbove[i] = st.feature.eval(s.integral[i], s.inverseDeviation[i]) >= st.threshold;
            (isAbove[i] ? aw : bw) += w[i];
            (isAbove[i] ? as : bs) += w[i] * s.label[i];
        }
        st.above = aw > 0 ? static_cast<float>(as / aw) : 0.0f;
        st.below = bw > 0 ? static_cast<float>(bs / bw) : 0.0f;
        double total = 0;
        for (size_t i = 0; i < n; ++i) {
            const float f = isAbove[i] ? st.above : st.below;
            F[i] += f;
            w[i] *= std::exp(-s.label[i] * f);
            total += w[i];
        }
        for (double& x : w)
            x /= total;
        stage.stumps.push_back(std::move(st));

        std::copy(F.begin(), F.begin() + static_cast<std::ptrdiff_t>(np), sortedPos.begin());
        std::sort(sortedPos.begin(), sortedPos.end());
        const size_t cut = std::min(np - 1, static_cast<size_t>((1.0 - options.minHitRate) * static_cast<double>(np)));
        stage.threshold = sortedPos[cut];
        size_t kept = 0, falseKept = 0;
        for (size_t i = 0; i < np; ++i)
            kept += F[i] >= stage.threshold;
        for (size_t i = np; i < n; ++i)
            falseKept += F[i] >= stage.threshold;
        hit = static_cast<double>(kept) / np;
        fp = static_cast<double>(falseKept) / nn;
        if (static_cast<int>(stage.stumps.size()) >= options.minStumps && fp <= options.maxFalseRate)
            break;
    }
    std::vector<float> margins;
    for (size_t i = 0; i < np; ++i)
        if (F[i] >= stage.threshold)
            margins.push_back(F[i] - stage.threshold);
    if (!margins.empty()) {
        std::nth_element(margins.begin(), margins.begin() + static_cast<std::ptrdiff_t>(margins.size() / 2),
                         margins.end());
        stage.medianMargin = margins[margins.size() / 2];
    }
    if (report != nullptr)
        *report = {hit, fp, static_cast<int>(stage.stumps.size())};
    return stage;
}

bool cutPatch(const uint32_t* integral, int width, int height, double left, double top, double side, bool mirror,
              uint8_t* patch)
{
    if (!(side > 0) || left < 0 || top < 0 || left + side > width || top + side > height)
        return false;
    const int stride = width + 1;
    int xs[kPatch + 1], ys[kPatch + 1];
    for (int i = 0; i <= kPatch; ++i) {
        xs[i] = std::min(width, static_cast<int>(std::floor(left + i * side / kPatch)));
        ys[i] = std::min(height, static_cast<int>(std::floor(top + i * side / kPatch)));
    }
    for (int i = 0; i < kPatch; ++i) {
        // a cell narrower than a pixel takes the pixel it starts in
        if (xs[i + 1] <= xs[i])
            xs[i + 1] = std::min(width, xs[i] + 1);
        if (ys[i + 1] <= ys[i])
            ys[i + 1] = std::min(height, ys[i] + 1);
    }
    for (int r = 0; r < kPatch; ++r) {
        for (int c = 0; c < kPatch; ++c) {
            const int x0 = std::min(xs[c], width - 1), x1 = std::max(xs[c + 1], x0 + 1);
            const int y0 = std::min(ys[r], height - 1), y1 = std::max(ys[r + 1], y0 + 1);
            const uint32_t sum = integral[y1 * stride + x1] + integral[y0 * stride + x0] -
                                 integral[y0 * stride + x1] - integral[y1 * stride + x0];
            const uint32_t area = static_cast<uint32_t>((x1 - x0) * (y1 - y0));
            const uint8_t v = static_cast<uint8_t>((sum + area / 2) / area);
            patch[r * kPatch + (mirror ? kPatch - 1 - c : c)] = v;
        }
    }
    return true;
}

} // namespace cascadetrain
