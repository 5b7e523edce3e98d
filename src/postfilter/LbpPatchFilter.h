#ifndef QUORIN_POSTFILTER_LBPPATCHFILTER_H
#define QUORIN_POSTFILTER_LBPPATCHFILTER_H

#include <memory>
#include <string>
#include <vector>

#include "postfilter/LbpDescriptor.h"
#include "postfilter/PostFilter.h"

class IMAGE;

// The common half of the filters that judge a hit by [cascade score, LBP
// histogram of its window cropped and scaled to 24 x 24]: configuration, the
// feature and the walk over the hits. Subclasses load their model and judge.
// Parameters: {"model":"<model path>"}.
class LbpPatchFilter : public PostFilter {
public:
    static constexpr int LBP_CELL_NUMBER = 4;
    static constexpr int SCALED_FACE_SIZE = 24;

    // Stores the path, sets the 4 x 4 cell descriptor and loads the model;
    // a bad path or model raises the reader's or loader's exception.
    void init(const std::string& modelPath);

    void filter(IN_IMAGE const& image, std::vector<ScoredWindow> const& input,
                std::vector<ScoredWindow>* output) const override;
    std::string toJson() const override;
    void fromJson(std::string const& text) override;

    // The 945 values a hit is judged by: its cascade score, then the LBP
    // histogram of its window cropped and scaled to 24 x 24.
    std::vector<float> feature(IN_IMAGE const& image, ScoredWindow const& hit) const;

protected:
    // transposedPatch: the model was made on the patch read column by column.
    explicit LbpPatchFilter(bool transposedPatch);

    virtual void loadModel(const std::string& modelPath) = 0;
    // Hits that pass without their feature being computed.
    virtual bool passesUnjudged(ScoredWindow const&) const { return false; }
    virtual bool judge(ScoredWindow const& hit, const float* values, int count) const = 0;

private:
    void extract(IN_IMAGE const& image, ScoredWindow const& hit, IMAGE& patch, float* pixels, float* out) const;

    bool transposed;
    std::string modelPath;
    LbpDescriptor descriptor;
};

#endif
