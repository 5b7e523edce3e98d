#ifndef QUORIN_POSTFILTER_ILABSPOSTFILTER_H
#define QUORIN_POSTFILTER_ILABSPOSTFILTER_H

#include <string>

#include "postfilter/ILabsClassifier.h"
#include "postfilter/LbpDescriptor.h"
#include "postfilter/PostFilter.h"

class IMAGE;

// Passes hits with a high cascade score at once and judges the others by a
// per-category quadratic classifier on [cascade score, LBP histogram of the
// 24 x 24 patch]. Parameters: {"model":"<model path>"}.
class ILabsPostFilter : public PostFilter {
public:
    static constexpr int LBP_CELL_NUMBER = 4;
    static constexpr int SCALED_FACE_SIZE = 24;

    // No model: only fast-pass hits may be judged.
    ILabsPostFilter();
    // Loads the model (see init).
    explicit ILabsPostFilter(const std::string& modelPath);

    // Stores the path, sets the 4 x 4 cell descriptor and loads the model;
    // a bad path or model raises the reader's or loader's exception.
    void init(const std::string& modelPath);

    // A new filter configured from `parameters`, or null when a std::exception
    // is raised on the way (malformed text, unknown or bad model).
    static PostFilter* create(const std::string& parameters);

    // Hits with a score of 6.0 or above pass unjudged; every other hit is
    // judged by the model of its category, and a category outside the model
    // (or no model) raises qv_invalid_argument.
    void filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
                std::vector<ScoredWindow>* output) const override;
    std::string toJson() const override;
    void fromJson(std::string const& text) override;
    std::string name() const override;

    // The 945 values a hit is judged by: its cascade score, then the LBP
    // histogram of its window cropped and scaled to 24 x 24.
    std::vector<float> feature(IN_IMAGE const& image, ScoredWindow const& hit) const;

    const ILabsClassifier& getClassifier() const { return classifier; }
    ILabsClassifier& getClassifier() { return classifier; }
    const LbpDescriptor& getDescriptor() const { return descriptor; }

private:
    void extract(IN_IMAGE const& image, ScoredWindow const& hit, IMAGE& patch, float* pixels, float* out) const;

    std::string modelPath;
    LbpDescriptor descriptor;
    ILabsClassifier classifier;
};

#endif
