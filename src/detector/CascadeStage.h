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

    // Applies the stage to `scores` (15 floats, zeroed by the caller before
    // the first stage); true when the window is rejected here.
    bool UpdateScoreAndThreshold(float value, float* scores) const
    {
        float const* t = binThresholds;
        int bin;
        if (value >= t[3]) {
            if (value >= t[1])
                bin = value < t[0] ? 1 : 0;
            else
                bin = value < t[2] ? 3 : 2;
        } else {
            if (value >= t[5])
                bin = value < t[4] ? 5 : 4;
            else
                bin = value < t[6] ? 7 : 6;
        }
        if (remapFlag != 0)
            applyRemap(scores);
        if (scoreCount == 1) {
            scores[0] += binScores[0][bin];
            return scores[0] < rejectThreshold[0];
        }
        int dead = 0;
        for (int i = 0; i < scoreCount; ++i) {
            if (scores[i] <= kDeadScore) {
                ++dead;
                continue;
            }
            scores[i] += binScores[i][bin];
            if (scores[i] < rejectThreshold[i]) {
                scores[i] = kDeadScore;
                ++dead;
            }
        }
        return dead == scoreCount;
    }

private:
    void applyRemap(float* scores) const;
};

#endif
