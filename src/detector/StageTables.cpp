#include "detector/StageTables.h"

#include <algorithm>
#include <cstddef>
#include <limits>

void StageTables::build(std::vector<CascadeStage> const& stages)
{
    kinds_.clear();
    lines_.clear();
    general_.clear();
    singleOnly_ = true;
    width_ = 0;
    std::size_t total = 0;
    for (CascadeStage const& s : stages)
        if (s.remapFlag == 0 && s.scoreCount > 0)
            total += static_cast<std::size_t>(stageRecordFloats(s.scoreCount)) / 16;
    kinds_.reserve(stages.size());
    lines_.resize(total);
    float* rec = lines_.empty() ? nullptr : lines_.front().v;
    for (CascadeStage const& s : stages) {
        const int k = s.scoreCount;
        if (s.remapFlag != 0 || k == 0) {
            kinds_.push_back(0);
            general_.push_back(s);
            continue;
        }
        kinds_.push_back(static_cast<uint8_t>(k));
        singleOnly_ = singleOnly_ && k == 1;
        width_ = std::max(width_, k);
        for (int t = 0; t < CascadeStage::kBinThresholds; ++t)
            rec[t] = s.binThresholds[t];
        if (k == 1) {
            rec[7] = s.rejectThreshold[0];
            for (int b = 0; b < CascadeStage::kBins; ++b)
                rec[8 + b] = s.binScores[0][b];
        } else {
            const int width = 4 * stageVectors(k);
            for (int c = 0; c < width; ++c)
                rec[8 + c] = c < k ? s.rejectThreshold[c] : -std::numeric_limits<float>::infinity();
            for (int b = 0; b < CascadeStage::kBins; ++b)
                for (int c = 0; c < width; ++c)
                    rec[8 + width + width * b + c] = c < k ? s.binScores[c][b] : 0.0f;
        }
        rec += stageRecordFloats(k);
    }
}
