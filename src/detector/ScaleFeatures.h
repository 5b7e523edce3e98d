#ifndef QUORIN_DETECTOR_SCALEFEATURES_H
#define QUORIN_DETECTOR_SCALEFEATURES_H

#include <cstddef>
#include <cstdint>
#include <vector>

#include "detector/WindowFeature.h"

// The features of one scale laid out for the search loop: every rectangle of
// every stage's feature in one array, in stage order (common stages, then
// each branch), with its corner offsets for one row stride and its weight.
// A window's feature is then a walk along that array, with no pointer to
// follow and nothing to look up. Built from the WindowFeature objects, which
// stay the model's own form; evaluation gives their values bit for bit.
class ScaleFeatures {
public:
    struct Rect {
        uint32_t topLeft;
        uint32_t bottomLeft;
        uint32_t topRight;
        uint32_t bottomRight;
        float weight;
    };
    struct Feature {
        int32_t kind;  // WindowFeature::HAAR, DEVIATION or any other (value 0)
        int32_t count; // rectangles, 0 unless HAAR
    };

    // A cursor over the features of one chain (the common stages or one
    // branch): value() evaluates the current feature, next() moves on.
    class Cursor {
    public:
        Cursor(Feature const* feature, Rect const* rect) : feature_(feature), rect_(rect) {}

        // Same arithmetic as HaarFeature::Eval: unsigned corner sums, each
        // times its weight, accumulated in rectangle order, then scaled.
        [[gnu::always_inline]] float value(uint32_t const* p, float inverseDeviation) const
        {
            const Feature f = *feature_;
            if (f.kind == WindowFeature::HAAR) {
                Rect const* r = rect_;
                if (f.count == 2) {
                    float v = sum(p, r[0]) * r[0].weight;
                    v += sum(p, r[1]) * r[1].weight;
                    return v * inverseDeviation;
                }
                if (f.count == 3) {
                    // As the loop below: from 0, which keeps the sign of a zero sum.
                    float v = 0.0f;
                    v += sum(p, r[0]) * r[0].weight;
                    v += sum(p, r[1]) * r[1].weight;
                    v += sum(p, r[2]) * r[2].weight;
                    return v * inverseDeviation;
                }
                if (f.count == 4) {
                    float v = sum(p, r[0]) * r[0].weight;
                    v += sum(p, r[1]) * r[1].weight;
                    v += sum(p, r[2]) * r[2].weight;
                    v += sum(p, r[3]) * r[3].weight;
                    return v * inverseDeviation;
                }
                float v = 0.0f;
                for (int i = 0; i < f.count; ++i)
                    v += sum(p, r[i]) * r[i].weight;
                return v * inverseDeviation;
            }
            if (f.kind == WindowFeature::DEVIATION)
                return inverseDeviation;
            return 0.0f;
        }
        void next()
        {
            rect_ += feature_->count;
            ++feature_;
        }

    private:
        [[gnu::always_inline]] static float sum(uint32_t const* p, Rect const& r)
        {
            return static_cast<float>(p[r.bottomRight] + p[r.topLeft] - p[r.topRight] - p[r.bottomLeft]);
        }
        Feature const* feature_;
        Rect const* rect_;
    };

    // Lays out `common` and `branches` (indexed by branch, then stage) for
    // row stride `stride`. A Haar feature without rectangles (its allocation
    // failed) evaluates to 0. Returns false when memory runs out; the object
    // is then cleared (stride 0).
    bool build(std::vector<WindowFeature> const& common, std::vector<std::vector<WindowFeature>> const& branches,
               int stride);
    void clear();

    // The stride built for; 0 when not built.
    int32_t stride() const { return stride_; }

    Cursor common() const { return Cursor(features_.data(), rects_.data()); }
    // Requires: 0 <= branch < the number of branches given to build.
    Cursor branch(int branch) const
    {
        return Cursor(features_.data() + branchFeature_[static_cast<std::size_t>(branch)],
                      rects_.data() + branchRect_[static_cast<std::size_t>(branch)]);
    }

private:
    void append(WindowFeature const& feature, int stride);

    int32_t stride_ = 0;
    std::vector<Feature> features_;
    std::vector<Rect> rects_;
    std::vector<uint32_t> branchFeature_; // index of each branch's first feature
    std::vector<uint32_t> branchRect_;    // and of its first rectangle
};

#endif
