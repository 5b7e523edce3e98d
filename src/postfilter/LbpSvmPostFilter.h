#ifndef QUORIN_POSTFILTER_LBPSVMPOSTFILTER_H
#define QUORIN_POSTFILTER_LBPSVMPOSTFILTER_H

#include <string>

#include "postfilter/LbpDescriptor.h"
#include "postfilter/PostFilter.h"

class IMAGE;
#include "postfilter/SvmClassifier.h"

// Judges every hit by a support vector classifier on [cascade score, LBP
// histogram of the transposed 24 x 24 patch]: one model for category 0, one
// for all others; a hit passes when the label is 1.
// Parameters: {"model":"<model path>"}; the model holds both classifiers.
class LbpSvmPostFilter : public PostFilter {
public:
    static constexpr int LBP_CELL_NUMBER = 4;
    static constexpr int SCALED_FACE_SIZE = 24;

    LbpSvmPostFilter();
    explicit LbpSvmPostFilter(const std::string& modelPath);

    // Stores the path, sets the 4 x 4 cell descriptor and reads the primary,
    // then the secondary classifier from the one model.
    void init(const std::string& modelPath);

    // A new filter configured from `parameters`, or null when a std::exception
    // is raised on the way.
    static PostFilter* create(const std::string& parameters);

    // Without a model every hit raises qv_unsupported_error.
    void filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
                std::vector<ScoredWindow>* output) const override;
    std::string toJson() const override;
    void fromJson(std::string const& text) override;
    std::string name() const override;

    // The 945 values a hit is judged by: its cascade score, then the LBP
    // histogram of its window cropped to 24 x 24 and transposed.
    std::vector<float> feature(IN_IMAGE const& image, ScoredWindow const& hit) const;

    SvmClassifier& getPrimaryClassifier() { return primaryClassifier; }
    SvmClassifier& getSecondaryClassifier() { return secondaryClassifier; }

private:
    void extract(IN_IMAGE const& image, ScoredWindow const& hit, IMAGE& patch, float* pixels, float* out) const;

    std::string modelPath;
    LbpDescriptor descriptor;
    SvmClassifier primaryClassifier;
    SvmClassifier secondaryClassifier;
};

#endif
