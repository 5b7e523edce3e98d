#ifndef QUORIN_TOOLS_BRANCHTRAINER_H
#define QUORIN_TOOLS_BRANCHTRAINER_H

// Roll branches for the cascade trainer (tools/train_cascade.cpp, commands
// joint-train, joint-model and roll-measure).
//
// The branched cascade keeps one score per roll category in its common stages
// (upright, and per tilt band the head turned clockwise and counter-clockwise):
// every common stage evaluates one feature per engine stage and adds an
// eight-bin table per category, so the categories share the cost of the
// features; a category dies when its running sum falls below its threshold at
// the end of a stage, a window when all have died (within the first ten engine
// stages the search then skips its neighbours). The best surviving category's
// branch then finishes the decision with a cascade of its own.

#include <array>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "CascadeTrainer.h"

namespace cascadetrain {

// One feature with an eight-bin table per category (the engine's stage: seven
// descending bin thresholds shared by all categories, bin 0 the highest values).
struct JointStump {
    Feature feature;
    std::array<float, 7> t{};
    std::vector<std::array<float, 8>> out; // one table per category
    static int binOf(float value, std::array<float, 7> const& t);
};

// A stage of the soft cascade: tables added per category to the running sums,
// and per category the threshold the running sum must reach at its end.
struct JointStage {
    std::vector<JointStump> stumps;
    std::vector<float> thresholds;
    float medianMargin = 1.0f; // of the positives that pass (sets a branch's score gain)
    // Per stump but the last, per category: rejection thresholds inside the
    // stage (empty: only the stage's end rejects). Set after training from
    // the positives' partial sums, so a window that can't reach the end dies
    // sooner; not part of the saved state.
    std::vector<std::vector<float>> early;
    std::vector<float> sums(const uint32_t* integral, float inverseDeviation) const;
};

struct JointReport {
    std::vector<double> hitRate; // per category
    double falseRate = 0;        // share of the background any category keeps
    int stumps = 0;
};

// The running sums the earlier stages leave for a sample, one per category.
using PriorSums = std::function<void(const uint32_t* integral, float inverseDeviation, float* sums)>;

// Boosts one stage of the soft cascade, one category per positive set, all
// against `background`: each round takes the feature and split that lower the
// summed weighted error of all categories most (gentle boosting, started from
// the prior sums), and gives each category its own eight-bin table on that
// feature. alive[c][i] tells whether background sample i is still alive in
// category c (empty: all are); the others weigh nothing. Each category's
// threshold keeps options.minHitRate of its positives; the stage ends once at
// most options.maxFalseRate of the background passes some category, or at
// options.maxStumps. Deterministic for a seed.
JointStage trainSoftStage(FeaturePool const& pool, std::vector<SampleSet const*> const& positives,
                          SampleSet const& background, PriorSums const& prior,
                          std::vector<std::vector<char>> const& alive, StageOptions const& options, JointReport* report);

// Tables and thresholds for categories added to a trained stage, on its
// stumps as they stand (their features and bin edges), by the same gentle
// boosting from the prior sums; each new category's threshold keeps `hitRate`
// of its positives. The stage's cost per window stays the same features.
void extendSoftStage(JointStage& stage, std::vector<SampleSet const*> const& positives, SampleSet const& background,
                     PriorSums const& prior, std::vector<std::vector<char>> const& alive, double hitRate,
                     JointReport* report);

// The branched cascade: common stages over all categories, then per category
// a branch that runs its own cascade from 0 (the counter-clockwise bands are
// the mirror images of the clockwise ones' branches). Band 1 holds heads
// turned in the image plane; a band 2, when there is one, heads turned
// sideways (the nose to the image's right, and its mirror image), added to
// the trained common stages by extendSoftStage.
struct JointCascade {
    int bands = 1;
    float uprightBias = 0.0f;
    float sideBias = 0.0f; // taken off the margins of band 2's categories
    std::vector<JointStage> common;            // categories() thresholds each
    std::vector<std::vector<JointStage>> branch; // [0] upright, [1 + b] band b clockwise; one threshold each
    int categories() const { return 1 + 2 * bands; }
    // Running sums of the common stages, and the categories still alive.
    void commonSums(const uint32_t* integral, float inverseDeviation, float* F, bool* alive) const;
    // The category the engine's branch choice takes; `passes` false when no category is alive.
    int route(const uint32_t* integral, float inverseDeviation, bool* passes) const;
    float margin(int category, float F) const;
    bool branchPasses(size_t b, const uint32_t* integral, float inverseDeviation) const;
    float branchGain(size_t b) const;
    // Sets the common stages' early thresholds: per category the quantile
    // (one per common stage; negative: none) of the partial sums of that
    // category's positives that pass the common stages (0 keeps them all).
    void traceCommon(std::vector<SampleSet const*> const& positives, std::vector<double> const& quantiles);
    CascadeModel toModel() const;
    bool save(std::string const& path) const;
    bool load(std::string const& path);
};

// A one-category cascade (Cascade::toModel) as a branch: its contrast gate
// dropped (the common stages hold one), behind a stage that zeroes all scores,
// as a branch starts from the common stages' sums.
std::vector<CascadeModelStage> asBranch(CascadeModel const& single);

} // namespace cascadetrain

#endif
