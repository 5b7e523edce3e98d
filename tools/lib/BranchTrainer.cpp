#include "BranchTrainer.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <random>
#include <thread>

namespace cascadetrain {

int JointStump::binOf(float v, std::array<float, 7> const& t)
{
    if (v >= t[3]) {
        if (v >= t[1])
            return v < t[0] ? 1 : 0;
        return v < t[2] ? 3 : 2;
    }
    if (v >= t[5])
        return v < t[4] ? 5 : 4;
    return v < t[6] ? 7 : 6;
}

std::vector<float> JointStage::sums(const uint32_t* integral, float inverseDeviation) const
{
    std::vector<float> s(stumps.empty() ? 0 : stumps[0].out.size(), 0.0f);
    for (JointStump const& st : stumps) {
        const int b = JointStump::binOf(st.feature.eval(integral, inverseDeviation), st.t);
        for (size_t c = 0; c < s.size(); ++c)
            s[c] += st.out[c][static_cast<size_t>(b)];
    }
    return s;
}

namespace {

constexpr float kNever = -1e30f;

// The background once, then each category's positives; each category's
// entries are its positives, then the whole background (index into the flat
// list, label).
struct Flat {
    std::vector<const uint32_t*> integral;
    std::vector<float> inverseDeviation;
    std::vector<std::vector<size_t>> index; // per category
    std::vector<std::vector<double>> label; // per category
};

Flat flatten(std::vector<SampleSet const*> const& positives, SampleSet const& background)
{
    Flat f;
    auto place = [&](SampleSet const& s) {
        const size_t at = f.integral.size();
        for (size_t i = 0; i < s.size(); ++i) {
            f.integral.push_back(s.integral(i));
            f.inverseDeviation.push_back(s.inverseDeviation(i));
        }
        return at;
    };
    place(background);
    for (SampleSet const* p : positives) {
        std::vector<size_t> idx;
        std::vector<double> lab(p->size(), 1.0);
        const size_t at = place(*p);
        for (size_t i = 0; i < p->size(); ++i)
            idx.push_back(at + i);
        for (size_t i = 0; i < background.size(); ++i) {
            idx.push_back(i);
            lab.push_back(-1.0);
        }
        f.index.push_back(std::move(idx));
        f.label.push_back(std::move(lab));
    }
    return f;
}

struct Pick {
    double gain = -1.0;
    size_t order = 0;
    size_t feature = 0;
    float threshold = 0.0f;
};

bool better(Pick const& a, Pick const& b) { return a.gain > b.gain || (a.gain == b.gain && a.order < b.order); }

void searchJoint(FeaturePool const& pool, Flat const& f, std::vector<std::vector<double>> const& w,
                 std::vector<size_t> const& draw, size_t first, size_t step, int bins, Pick* best)
{
    const size_t K = f.index.size();
    std::vector<float> values(f.integral.size());
    std::vector<std::vector<double>> binW(K, std::vector<double>(bins)), binS(K, std::vector<double>(bins));
    std::vector<double> totalW(K, 0), totalS(K, 0), rightW(K), rightS(K);
    for (size_t c = 0; c < K; ++c)
        for (size_t i = 0; i < f.index[c].size(); ++i) {
            totalW[c] += w[c][i];
            totalS[c] += w[c][i] * f.label[c][i];
        }
    for (size_t d = first; d < draw.size(); d += step) {
        Feature const& feat = pool[draw[d]];
        float lo = INFINITY, hi = -INFINITY;
        for (size_t g = 0; g < values.size(); ++g) {
            const float v = feat.eval(f.integral[g], f.inverseDeviation[g]);
            values[g] = v;
            lo = std::min(lo, v);
            hi = std::max(hi, v);
        }
        if (!(hi > lo))
            continue;
        const double scale = bins / (static_cast<double>(hi) - lo);
        for (size_t c = 0; c < K; ++c) {
            std::fill(binW[c].begin(), binW[c].end(), 0.0);
            std::fill(binS[c].begin(), binS[c].end(), 0.0);
            for (size_t i = 0; i < f.index[c].size(); ++i) {
                const int b = std::min(bins - 1, static_cast<int>((values[f.index[c][i]] - lo) * scale));
                binW[c][b] += w[c][i];
                binS[c][b] += w[c][i] * f.label[c][i];
            }
        }
        std::fill(rightW.begin(), rightW.end(), 0.0);
        std::fill(rightS.begin(), rightS.end(), 0.0);
        for (int k = bins - 1; k >= 1; --k) {
            double gain = 0;
            for (size_t c = 0; c < K; ++c) {
                rightW[c] += binW[c][k];
                rightS[c] += binS[c][k];
                const double leftW = totalW[c] - rightW[c], leftS = totalS[c] - rightS[c];
                if (rightW[c] > 1e-12)
                    gain += rightS[c] * rightS[c] / rightW[c];
                if (leftW > 1e-12)
                    gain += leftS * leftS / leftW;
            }
            const Pick p{gain, d, draw[d], static_cast<float>(lo + k / scale)};
            if (better(p, *best))
                *best = p;
        }
    }
}

} // namespace

namespace {

// Gentle boosting state over the flat samples of all categories, started from
// the sums the earlier stages left (soft cascade: a stage goes on from where
// the last one stopped, and its threshold applies to the running sum).
struct Booster {
    Flat f;
    std::vector<std::vector<double>> w; // per category entry
    std::vector<std::vector<float>> F;  // per category, every flat sample

    // masks[c][i]: background sample i (category c's negatives after its
    // positives) is still alive in category c; the others weigh nothing
    Booster(std::vector<SampleSet const*> const& positives, SampleSet const& background, PriorSums const& prior,
            std::vector<std::vector<char>> const& masks)
        : f(flatten(positives, background))
    {
        const size_t K = positives.size();
        F.assign(K, std::vector<float>(f.integral.size(), 0.0f));
        std::vector<float> sums(K);
        for (size_t g = 0; g < f.integral.size(); ++g)
            if (prior) {
                prior(f.integral[g], f.inverseDeviation[g], sums.data());
                for (size_t c = 0; c < K; ++c)
                    F[c][g] = sums[c];
            }
        for (size_t c = 0; c < K; ++c) {
            const size_t np = positives[c]->size();
            w.emplace_back(f.index[c].size());
            double pos = 0, neg = 0;
            for (size_t i = 0; i < w[c].size(); ++i) {
                w[c][i] = std::exp(-f.label[c][i] * F[c][f.index[c][i]]);
                if (i >= np && c < masks.size() && i - np < masks[c].size() && !masks[c][i - np])
                    w[c][i] = 0;
                (i < np ? pos : neg) += w[c][i];
            }
            // positives and negatives weigh the same in all
            for (size_t i = 0; i < w[c].size(); ++i)
                w[c][i] *= 0.5 / std::max(1e-300, i < np ? pos : neg);
        }
    }

    std::vector<int> bins(JointStump const& st) const
    {
        std::vector<int> b(f.integral.size());
        for (size_t g = 0; g < b.size(); ++g)
            b[g] = JointStump::binOf(st.feature.eval(f.integral[g], f.inverseDeviation[g]), st.t);
        return b;
    }

    // Category c's table for the stump's bins (the weighted mean label per bin);
    // then its sums and weights move on.
    void apply(size_t c, std::vector<int> const& b, std::array<float, 8>* table)
    {
        double sw[8] = {}, ss[8] = {};
        for (size_t i = 0; i < f.index[c].size(); ++i) {
            sw[b[f.index[c][i]]] += w[c][i];
            ss[b[f.index[c][i]]] += w[c][i] * f.label[c][i];
        }
        for (int k = 0; k < 8; ++k)
            (*table)[static_cast<size_t>(k)] = sw[k] > 0 ? static_cast<float>(ss[k] / sw[k]) : 0.0f;
        for (size_t g = 0; g < F[c].size(); ++g)
            F[c][g] += (*table)[static_cast<size_t>(b[g])];
        double total = 0;
        for (size_t i = 0; i < f.index[c].size(); ++i) {
            w[c][i] *= std::exp(-f.label[c][i] * (*table)[static_cast<size_t>(b[f.index[c][i]])]);
            total += w[c][i];
        }
        for (double& x : w[c])
            x /= total;
    }

    // The best feature and split of one round over all categories, with the
    // bin edges of its table: the split, and the quartiles of each side.
    JointStump round(FeaturePool const& pool, StageOptions const& options, std::mt19937_64& rng, bool* ok) const
    {
        const size_t perRound =
            std::max<size_t>(1, static_cast<size_t>(options.featureFraction * static_cast<double>(pool.size())));
        const int threads = std::max(1, options.threads);
        std::vector<size_t> draw(perRound);
        for (size_t& d : draw)
            d = static_cast<size_t>(rng() % pool.size());
        std::vector<Pick> best(static_cast<size_t>(threads));
        std::vector<std::thread> workers;
        for (int t = 1; t < threads; ++t)
            workers.emplace_back(searchJoint, std::cref(pool), std::cref(f), std::cref(w), std::cref(draw), static_cast<size_t>(t), static_cast<size_t>(threads), options.bins,
                                 &best[static_cast<size_t>(t)]);
        searchJoint(pool, f, w, draw, 0, static_cast<size_t>(threads), options.bins, &best[0]);
        for (std::thread& th : workers)
            th.join();
        Pick top = best[0];
        for (Pick const& p : best)
            if (better(p, top))
                top = p;
        *ok = top.gain >= 0;
        JointStump st;
        st.feature = pool[top.feature];
        std::vector<float> above, below;
        for (size_t g = 0; g < f.integral.size(); ++g) {
            const float v = st.feature.eval(f.integral[g], f.inverseDeviation[g]);
            (v >= top.threshold ? above : below).push_back(v);
        }
        std::sort(above.begin(), above.end());
        std::sort(below.begin(), below.end());
        auto q = [&](std::vector<float> const& v, double p) {
            return v.empty() ? top.threshold
                             : v[std::min(v.size() - 1, static_cast<size_t>(p * static_cast<double>(v.size())))];
        };
        st.t = {q(above, 0.75), q(above, 0.5), q(above, 0.25), top.threshold, q(below, 0.75), q(below, 0.5), q(below, 0.25)};
        st.out.assign(f.index.size(), std::array<float, 8>{});
        return st;
    }

    // The threshold that keeps `hitRate` of category c's positives, and the share kept.
    float cut(size_t c, size_t np, double hitRate, double* kept) const
    {
        std::vector<float> pos(np);
        for (size_t i = 0; i < np; ++i)
            pos[i] = F[c][f.index[c][i]];
        std::sort(pos.begin(), pos.end());
        const size_t at = std::min(np - 1, static_cast<size_t>((1.0 - hitRate) * static_cast<double>(np)));
        *kept = static_cast<double>(pos.end() - std::lower_bound(pos.begin(), pos.end(), pos[at])) / np;
        return pos[at];
    }
};

} // namespace

JointStage trainSoftStage(FeaturePool const& pool, std::vector<SampleSet const*> const& positives,
                          SampleSet const& background, PriorSums const& prior,
                          std::vector<std::vector<char>> const& alive, StageOptions const& options, JointReport* report)
{
    Booster boost(positives, background, prior, alive);
    const size_t K = positives.size();
    JointStage stage;
    JointReport rep;
    std::mt19937_64 rng(options.seed);
    while (static_cast<int>(stage.stumps.size()) < options.maxStumps) {
        bool ok = false;
        JointStump st = boost.round(pool, options, rng, &ok);
        if (!ok)
            break;
        const std::vector<int> b = boost.bins(st);
        for (size_t c = 0; c < K; ++c)
            boost.apply(c, b, &st.out[c]);
        stage.stumps.push_back(std::move(st));
        stage.thresholds.assign(K, 0.0f);
        rep.hitRate.assign(K, 0.0);
        for (size_t c = 0; c < K; ++c)
            stage.thresholds[c] = boost.cut(c, positives[c]->size(), options.minHitRate, &rep.hitRate[c]);
        size_t kept = 0;
        for (size_t g = 0; g < background.size(); ++g) {
            bool any = false;
            for (size_t c = 0; c < K && !any; ++c)
                any = (c >= alive.size() || alive[c][g]) && boost.F[c][g] >= stage.thresholds[c];
            kept += any;
        }
        rep.falseRate = static_cast<double>(kept) / std::max<size_t>(1, background.size());
        rep.stumps = static_cast<int>(stage.stumps.size());
        if (rep.stumps >= options.minStumps && rep.falseRate <= options.maxFalseRate)
            break;
    }
    {
        std::vector<float> margins;
        const size_t np = positives[0]->size();
        for (size_t i = 0; i < np; ++i) {
            const float v = boost.F[0][boost.f.index[0][i]] - (stage.thresholds.empty() ? 0.0f : stage.thresholds[0]);
            if (v >= 0)
                margins.push_back(v);
        }
        if (!margins.empty()) {
            std::nth_element(margins.begin(), margins.begin() + static_cast<std::ptrdiff_t>(margins.size() / 2), margins.end());
            stage.medianMargin = margins[margins.size() / 2];
        }
    }
    if (report != nullptr)
        *report = rep;
    return stage;
}

void extendSoftStage(JointStage& stage, std::vector<SampleSet const*> const& positives, SampleSet const& background,
                     PriorSums const& prior, std::vector<std::vector<char>> const& alive, double hitRate,
                     JointReport* report)
{
    Booster boost(positives, background, prior, alive);
    const size_t K = positives.size();
    for (JointStump& st : stage.stumps) {
        const std::vector<int> b = boost.bins(st);
        for (size_t c = 0; c < K; ++c) {
            std::array<float, 8> table{};
            boost.apply(c, b, &table);
            st.out.push_back(table);
        }
    }
    JointReport rep;
    rep.hitRate.assign(K, 0.0);
    for (size_t c = 0; c < K; ++c)
        stage.thresholds.push_back(boost.cut(c, positives[c]->size(), hitRate, &rep.hitRate[c]));
    size_t kept = 0;
    for (size_t g = 0; g < background.size(); ++g) {
        bool any = false;
        for (size_t c = 0; c < K && !any; ++c)
            any = (c >= alive.size() || alive[c][g]) && boost.F[c][g] >= stage.thresholds[stage.thresholds.size() - K + c];
        kept += any;
    }
    rep.falseRate = static_cast<double>(kept) / std::max<size_t>(1, background.size());
    rep.stumps = static_cast<int>(stage.stumps.size());
    if (report != nullptr)
        *report = rep;
}

// ------------------------------------------------------------------ the branched cascade

void JointCascade::commonSums(const uint32_t* integral, float inverseDeviation, float* F, bool* alive) const
{
    const size_t K = static_cast<size_t>(categories());
    for (size_t c = 0; c < K; ++c) {
        F[c] = 0.0f;
        alive[c] = inverseDeviation < kGateInverseDeviation;
    }
    for (JointStage const& s : common) {
        for (size_t j = 0; j < s.stumps.size(); ++j) {
            JointStump const& st = s.stumps[j];
            const size_t b = static_cast<size_t>(JointStump::binOf(st.feature.eval(integral, inverseDeviation), st.t));
            for (size_t c = 0; c < K; ++c) {
                F[c] += st.out[c][b];
                if (j < s.early.size())
                    alive[c] = alive[c] && F[c] >= s.early[j][c];
            }
        }
        for (size_t c = 0; c < K; ++c)
            alive[c] = alive[c] && F[c] >= s.thresholds[c];
    }
}

void JointCascade::traceCommon(std::vector<SampleSet const*> const& positives, std::vector<double> const& quantiles)
{
    const size_t K = static_cast<size_t>(categories());
    for (JointStage& s : common)
        s.early.clear();
    // partial sums after every stump of every common stage, per category, of
    // the positives that pass
    std::vector<std::vector<std::vector<float>>> partial(K);
    std::vector<float> F(K);
    std::unique_ptr<bool[]> alive(new bool[K]);
    for (size_t c = 0; c < K && c < positives.size(); ++c)
        for (size_t i = 0; i < positives[c]->size(); ++i) {
            const uint32_t* ii = positives[c]->integral(i);
            const float inv = positives[c]->inverseDeviation(i);
            commonSums(ii, inv, F.data(), alive.get());
            if (!alive[c])
                continue;
            float sum = 0.0f;
            size_t n = 0;
            for (JointStage const& s : common)
                for (JointStump const& st : s.stumps) {
                    sum += st.out[c][static_cast<size_t>(JointStump::binOf(st.feature.eval(ii, inv), st.t))];
                    if (partial[c].size() <= n)
                        partial[c].emplace_back();
                    partial[c][n++].push_back(sum);
                }
        }
    size_t n = 0;
    for (size_t k = 0; k < common.size(); ++k) {
        JointStage& s = common[k];
        s.early.assign(s.stumps.size() - 1, std::vector<float>(K, kNever));
        for (size_t j = 0; j < s.stumps.size(); ++j, ++n)
            for (size_t c = 0; c < K && j + 1 < s.stumps.size() && k < quantiles.size() && quantiles[k] >= 0; ++c) {
                if (n >= partial[c].size() || partial[c][n].empty())
                    continue;
                std::vector<float>& v = partial[c][n];
                const size_t q = std::min(v.size() - 1, static_cast<size_t>(quantiles[k] * static_cast<double>(v.size())));
                std::nth_element(v.begin(), v.begin() + static_cast<std::ptrdiff_t>(q), v.end());
                s.early[j][c] = v[q] - 1e-4f;
            }
    }
}

int JointCascade::route(const uint32_t* integral, float inverseDeviation, bool* passes) const
{
    std::vector<float> F(static_cast<size_t>(categories()));
    std::unique_ptr<bool[]> alive(new bool[F.size()]);
    commonSums(integral, inverseDeviation, F.data(), alive.get());
    int best = 0;
    float top = -20.0f;
    *passes = false;
    for (size_t c = 0; c < F.size(); ++c) {
        if (!alive[c])
            continue;
        *passes = true;
        const float m = margin(static_cast<int>(c), F[c]);
        if (m > top) {
            top = m;
            best = static_cast<int>(c);
        }
    }
    return best;
}

float JointCascade::margin(int c, float F) const
{
    const float t = common.empty() ? 0.0f : common.back().thresholds[static_cast<size_t>(c)];
    return F - t + (c == 0 ? uprightBias : 0.0f) - (c >= 3 ? sideBias : 0.0f);
}

float JointCascade::branchGain(size_t b) const
{
    Cascade c;
    if (b < branch.size() && !branch[b].empty()) {
        Stage s;
        s.medianMargin = branch[b].back().medianMargin;
        c.stages.push_back(s);
    }
    return c.scoreGain();
}

bool JointCascade::branchPasses(size_t b, const uint32_t* integral, float inverseDeviation) const
{
    float F = 0.0f;
    for (JointStage const& s : branch[b]) {
        F += s.sums(integral, inverseDeviation)[0];
        if (F < s.thresholds[0])
            return false;
    }
    return true;
}

namespace {

// One joint stump as an engine stage; `reject` per category (kNever: none).
CascadeModelStage engineStage(JointStump const& s, float gain, bool remapFirst, std::vector<float> const& reject)
{
    CascadeModelStage m;
    m.feature.kind = 1;
    for (Rect const& r : s.feature.rects)
        m.feature.rects.push_back({r.weight, r.left, r.top, r.right, r.bottom});
    m.binThresholds = s.t;
    m.scoreCount = static_cast<int32_t>(s.out.size());
    if (remapFirst) {
        // every category starts from the one score the gate left
        m.remapFlag = 1;
        m.remap.assign(s.out.size(), 0);
    }
    for (size_t c = 0; c < s.out.size(); ++c) {
        std::array<float, 8> bins = s.out[c];
        for (float& v : bins)
            v *= gain;
        m.binScores.push_back(bins);
        m.rejectThresholds.push_back(reject[c]);
    }
    return m;
}

// Zeroes all 15 scores from slot 14, which no stage writes: a branch then runs
// its own cascade from 0, as it was trained.
CascadeModelStage zeroAll()
{
    CascadeModelStage s;
    s.feature.kind = 0;
    s.binThresholds.fill(0.0f);
    s.scoreCount = 15;
    s.remapFlag = 1;
    s.remap.assign(15, 14);
    s.binScores.assign(15, std::array<float, 8>{});
    s.rejectThresholds.assign(15, kNever);
    return s;
}

void mirrorStages(std::vector<CascadeModelStage>& stages)
{
    for (CascadeModelStage& s : stages)
        for (CascadeModelRect& r : s.feature.rects) {
            const int32_t left = kPatch - r.right, right = kPatch - r.left;
            r.left = left;
            r.right = right;
        }
}

} // namespace

std::vector<CascadeModelStage> asBranch(CascadeModel const& single)
{
    // After the one zeroing stage slot 1 stays 0 in the branch, so the
    // cascade's own two-score resets (slot 1 into 0 and 1) start each stage
    // from 0 as they did, at a fraction of a fifteen-score reset's cost.
    std::vector<CascadeModelStage> out{zeroAll()};
    out.insert(out.end(), single.common.begin() + (single.common.empty() ? 0 : 1), single.common.end());
    return out;
}

CascadeModel JointCascade::toModel() const
{
    CascadeModel m;
    m.common.push_back(CascadeWriter::stump(CascadeWriter::deviation(), kGateInverseDeviation, -1.0f, 0.0f, -0.5f));
    const size_t K = static_cast<size_t>(categories());
    bool first = true;
    for (JointStage const& s : common)
        for (size_t j = 0; j < s.stumps.size(); ++j) {
            std::vector<float> reject(K, kNever);
            if (j + 1 == s.stumps.size())
                reject = s.thresholds;
            else if (j < s.early.size())
                reject = s.early[j];
            m.common.push_back(engineStage(s.stumps[j], 1.0f, first, reject));
            first = false;
        }
    // the category scores compare as margins over the last common thresholds
    std::vector<float> shift(K, 0.0f);
    for (size_t c = 0; c < K; ++c)
        shift[c] = margin(static_cast<int>(c), 0.0f);
    m.common.push_back(CascadeWriter::constants(shift));
    // branch 0 upright, then per band the clockwise one and its mirror image
    for (size_t b = 0; b < K; ++b) {
        const size_t source = b == 0 ? 0 : 1 + (b - 1) / 2;
        std::vector<CascadeModelStage> out{zeroAll()};
        const float g = branchGain(source);
        if (source < branch.size())
            for (JointStage const& s : branch[source])
                for (size_t j = 0; j < s.stumps.size(); ++j)
                    out.push_back(engineStage(s.stumps[j], g, false,
                                              {j + 1 == s.stumps.size() ? s.thresholds[0] * g : kNever}));
        const float last = source < branch.size() && !branch[source].empty() ? branch[source].back().thresholds[0] : 0.0f;
        out.push_back(CascadeWriter::constants({-last * g}));
        if (b > 0 && (b - 1) % 2 == 1)
            mirrorStages(out);
        m.branches.push_back(std::move(out));
    }
    return m;
}

namespace {

void saveJoint(std::FILE* f, JointStage const& s)
{
    std::fprintf(f, "jstage %zu %zu %a\n", s.stumps.size(), s.thresholds.size(), static_cast<double>(s.medianMargin));
    for (float t : s.thresholds)
        std::fprintf(f, " %a", static_cast<double>(t));
    std::fprintf(f, "\n");
    for (JointStump const& st : s.stumps) {
        std::fprintf(f, "jstump %zu %zu", st.out.size(), st.feature.rects.size());
        for (float t : st.t)
            std::fprintf(f, " %a", static_cast<double>(t));
        for (std::array<float, 8> const& o : st.out)
            for (float v : o)
                std::fprintf(f, " %a", static_cast<double>(v));
        for (Rect const& r : st.feature.rects)
            std::fprintf(f, " %a %d %d %d %d", static_cast<double>(r.weight), r.left, r.top, r.right, r.bottom);
        std::fprintf(f, "\n");
    }
}

float hexFloat(std::istream& in)
{
    std::string s;
    in >> s;
    return std::strtof(s.c_str(), nullptr);
}

bool loadJoint(std::istream& in, JointStage& s)
{
    std::string word;
    size_t count = 0, thresholds = 0;
    if (!(in >> word >> count >> thresholds) || word != "jstage" || count > 10000 || thresholds > 15)
        return false;
    s = JointStage{};
    s.medianMargin = hexFloat(in);
    for (size_t c = 0; c < thresholds; ++c)
        s.thresholds.push_back(hexFloat(in));
    for (size_t j = 0; j < count; ++j) {
        JointStump st;
        size_t K = 0, rects = 0;
        if (!(in >> word >> K >> rects) || word != "jstump" || K > 15 || rects > 64)
            return false;
        for (float& t : st.t)
            t = hexFloat(in);
        st.out.resize(K);
        for (std::array<float, 8>& o : st.out)
            for (float& v : o)
                v = hexFloat(in);
        for (size_t r = 0; r < rects; ++r) {
            Rect rc{};
            rc.weight = hexFloat(in);
            if (!(in >> rc.left >> rc.top >> rc.right >> rc.bottom) || rc.left < 0 || rc.top < 0 ||
                rc.right > kPatch || rc.bottom > kPatch || rc.left > rc.right || rc.top > rc.bottom)
                return false;
            st.feature.rects.push_back(rc);
        }
        s.stumps.push_back(std::move(st));
    }
    return static_cast<bool>(in);
}

} // namespace

bool JointCascade::save(std::string const& path) const
{
    const std::string tmp = path + ".tmp";
    std::FILE* f = std::fopen(tmp.c_str(), "w");
    if (f == nullptr)
        return false;
    // version 2 adds band 2's bias; a one-band state keeps version 1's text
    if (bands > 1)
        std::fprintf(f, "joint-cascade 2\nbands %d\nbias %a\nside-bias %a\ncommon %zu\n", bands,
                     static_cast<double>(uprightBias), static_cast<double>(sideBias), common.size());
    else
        std::fprintf(f, "joint-cascade 1\nbands %d\nbias %a\ncommon %zu\n", bands, static_cast<double>(uprightBias),
                     common.size());
    for (JointStage const& s : common)
        saveJoint(f, s);
    std::fprintf(f, "branches %zu\n", branch.size());
    for (std::vector<JointStage> const& b : branch) {
        std::fprintf(f, "branch %zu\n", b.size());
        for (JointStage const& s : b)
            saveJoint(f, s);
    }
    const bool ok = std::fclose(f) == 0;
    return ok && std::rename(tmp.c_str(), path.c_str()) == 0;
}

bool JointCascade::load(std::string const& path)
{
    std::ifstream in(path);
    std::string word;
    int version = 0;
    size_t count = 0;
    JointCascade c;
    if (!(in >> word >> version) || word != "joint-cascade" || (version != 1 && version != 2))
        return false;
    if (!(in >> word >> c.bands) || word != "bands" || c.bands < 1 || c.bands > 7)
        return false;
    if (!(in >> word) || word != "bias")
        return false;
    c.uprightBias = hexFloat(in);
    if (version == 2) {
        if (!(in >> word) || word != "side-bias")
            return false;
        c.sideBias = hexFloat(in);
    }
    if (!(in >> word >> count) || word != "common" || count > 100)
        return false;
    c.common.resize(count);
    for (JointStage& s : c.common)
        if (!loadJoint(in, s) || s.thresholds.size() != static_cast<size_t>(c.categories()))
            return false;
    if (!(in >> word >> count) || word != "branches" || count > 15)
        return false;
    c.branch.resize(count);
    for (std::vector<JointStage>& b : c.branch) {
        size_t n = 0;
        if (!(in >> word >> n) || word != "branch" || n > 1000)
            return false;
        b.resize(n);
        for (JointStage& s : b)
            if (!loadJoint(in, s) || s.thresholds.size() != 1)
                return false;
    }
    *this = std::move(c);
    return true;
}

} // namespace cascadetrain
