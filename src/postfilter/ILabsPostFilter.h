#ifndef QUORIN_POSTFILTER_ILABSPOSTFILTER_H
#define QUORIN_POSTFILTER_ILABSPOSTFILTER_H

#include <string>

#include "postfilter/ILabsClassifier.h"
#include "postfilter/LbpPatchFilter.h"

// Passes hits with a high cascade score at once and judges the others by a
// per-category quadratic classifier on [cascade score, LBP histogram of the
// 24 x 24 patch]. Parameters: {"model":"<model path>"}.
class ILabsPostFilter : public LbpPatchFilter {
public:
    // No model: only fast-pass hits may be judged.
    ILabsPostFilter();
    // Loads the model (see init).
    explicit ILabsPostFilter(const std::string& modelPath);

    static PostFilter* create(const std::string& parameters);

    // Hits with a score of 6.0 or above pass unjudged; every other hit is
    // judged by the model of its category, and a category outside the model
    // (or no model) raises qv_invalid_argument.
    std::string name() const override;

    const ILabsClassifier& getClassifier() const { return classifier; }
    ILabsClassifier& getClassifier() { return classifier; }

private:
    void loadModel(const std::string& modelPath) override;
    bool passesUnjudged(ScoredWindow const& hit) const override;
    bool judge(ScoredWindow const& hit, const float* values, int count) const override;

    ILabsClassifier classifier;
};

#endif
