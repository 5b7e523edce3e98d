#ifndef QUORIN_POSTFILTER_LBPSVMPOSTFILTER_H
#define QUORIN_POSTFILTER_LBPSVMPOSTFILTER_H

#include <string>

#include "postfilter/LbpPatchFilter.h"
#include "postfilter/SvmClassifier.h"

// Judges every hit by a support vector classifier on [cascade score, LBP
// histogram of the transposed 24 x 24 patch]: one model for category 0, one
// for all others; a hit passes when the label is 1.
// Parameters: {"model":"<model path>"}; the model holds both classifiers.
class LbpSvmPostFilter : public LbpPatchFilter {
public:
    LbpSvmPostFilter();
    // Reads the primary, then the secondary classifier from the one model.
    explicit LbpSvmPostFilter(const std::string& modelPath);

    static PostFilter* create(const std::string& parameters);

    // Without a model every hit raises qv_unsupported_error.
    std::string name() const override;

private:
    void loadModel(const std::string& modelPath) override;
    bool judge(ScoredWindow const& hit, const float* values, int count) const override;

    SvmClassifier primaryClassifier;
    SvmClassifier secondaryClassifier;
};

#endif
