#ifndef QUORIN_DETECTOR_CASCADESTAGE_H
#define QUORIN_DETECTOR_CASCADESTAGE_H

#include <cstdint>

#include "image/ScoredWindow.h"

class ModelReader;
class WindowFeature;

// One decision step of a cascade: the stage's feature value falls into one of
// eight bins, and each of up to 15 parallel scores gets that bin's score; a
// score below its reject threshold dies (kDeadScore). A plain value; the
// per-scale features live beside the stages, in the detector.
class CascadeStage {
public:
    static constexpr int kBins = 8;
    static constexpr int kBinThresholds = 7;

    int32_t remapFlag = 0;
    int32_t scoreCount = 0;
    int32_t remap[kMaxCategories] = {};
    float binScores[kMaxCategories][kBins] = {};
    float rejectThreshold[kMaxCategories] = {};
    WindowFeature* feature = nullptr; // the stage's base feature, not owned; informative only
    float binThresholds[kBinThresholds] = {};

    // Reads the model header (window width, height, number of bin
    // thresholds); true when it is 24, 24, 7.
    static bool checkHeader(ModelReader& reader);

    // Reads one stage record with its feature into `feature`. Throws
    // qv_data_error for a scoreCount outside 0..15 or a remap entry outside
    // 0..scoreCount-1; the reader throws on truncated data.
    void Init(ModelReader& reader, WindowFeature* feature);
    static void loadStages(ModelReader& reader, int count, CascadeStage* stages, WindowFeature* features);
    static void scaleFeatures(WindowFeature const* source, WindowFeature* destination, int count, float scale);
    static void destroyStages(CascadeStage* stages);

    // The bin of a feature value, 0 for the highest values. Three
    // comparisons down the tree of thresholds: value >= t[3] picks the half,
    // then t[1] or t[5] the quarter, then t[0], t[2], t[4] or t[6] the bin.
    // Written with indices instead of branches, since the branches follow the
    // image and mispredict; the comparisons are the same, so a NaN still
    // lands in bin 6.
    int binOf(float value) const { return binOf(binThresholds, value); }
    // The same over seven thresholds laid out elsewhere (StageTables).
    static int binOf(float const* t, float value)
    {
        const int lowerHalf = !(value >= t[3]);
        const int lowerQuarter = !(value >= t[1 + 4 * lowerHalf]);
        const int quarter = 4 * lowerHalf + 2 * lowerQuarter;
        return quarter + (value < t[quarter] ? 1 : 0);
    }

    // True when the stage updates one score and doesn't remap: it then only
    // adds binScores[0][bin] and tests rejectThreshold[0], and a caller may
    // keep that score in a register (UpdateScoreAndThreshold gives the same).
    bool singleScore() const { return scoreCount == 1 && remapFlag == 0; }

    // Applies the stage to `scores` (15 floats, zeroed by the caller before
    // the first stage); true when the window is rejected here.
    bool UpdateScoreAndThreshold(float value, float* scores) const
    {
        const int bin = binOf(value);
        if (remapFlag != 0)
            applyRemap(scores);
        if (scoreCount == 1) {
            scores[0] += binScores[0][bin];
            return scores[0] < rejectThreshold[0];
        }
        int dead = 0;
        for (int i = 0; i < scoreCount; ++i)
            dead += updateOne(scores[i], bin, i);
        return dead == scoreCount;
    }

    // Score i of a multi-score stage: a dead score stays dead, a live one
    // adds its bin and dies below its threshold; true when dead afterwards.
    [[gnu::always_inline]] bool updateOne(float& score, int bin, int i) const
    {
        return updateScore(score, binScores[i][bin], rejectThreshold[i]);
    }
    [[gnu::always_inline]] static bool updateScore(float& score, float add, float threshold)
    {
        if (score <= kDeadScore)
            return true;
        score += add;
        if (score < threshold) {
            score = kDeadScore;
            return true;
        }
        return false;
    }

private:
    void applyRemap(float* scores) const;
};

#endif
