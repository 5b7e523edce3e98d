#include "detector/ScaleFeatures.h"

#include <cstddef>
#include <new>

#include "detector/HaarFeature.h"

void ScaleFeatures::clear()
{
    stride_ = 0;
    features_.clear();
    rects_.clear();
    branchFeature_.clear();
    branchRect_.clear();
}

void ScaleFeatures::append(WindowFeature const& source, int stride)
{
    Feature f;
    f.kind = source.kind;
    f.count = 0;
    if (source.kind == WindowFeature::HAAR && source.haar != nullptr && source.haar->rects != nullptr) {
        HaarFeature const& haar = *source.haar;
        f.count = haar.count;
        for (int i = 0; i < haar.count; ++i) {
            HaarRect const& r = haar.rects[i];
            Rect out;
            out.topLeft = static_cast<uint32_t>(r.top * stride + r.left);
            out.bottomLeft = static_cast<uint32_t>(r.bottom * stride + r.left);
            out.topRight = static_cast<uint32_t>(r.top * stride + r.right);
            out.bottomRight = static_cast<uint32_t>(r.bottom * stride + r.right);
            out.weight = r.weight;
            rects_.push_back(out);
        }
    }
    features_.push_back(f);
}

bool ScaleFeatures::build(std::vector<WindowFeature> const& common,
                          std::vector<std::vector<WindowFeature>> const& branches, int stride)
{
    clear();
    try {
        // Sized once: a photo of a new width lays out every searched scale.
        std::size_t featureCount = 0;
        std::size_t rectCount = 0;
        auto count = [&](std::vector<WindowFeature> const& chain) {
            featureCount += chain.size();
            for (WindowFeature const& f : chain)
                if (f.kind == WindowFeature::HAAR && f.haar != nullptr && f.haar->rects != nullptr)
                    rectCount += static_cast<std::size_t>(f.haar->count);
        };
        count(common);
        for (std::vector<WindowFeature> const& branch : branches)
            count(branch);
        features_.reserve(featureCount);
        rects_.reserve(rectCount);
        for (WindowFeature const& f : common)
            append(f, stride);
        for (std::vector<WindowFeature> const& branch : branches) {
            branchFeature_.push_back(static_cast<uint32_t>(features_.size()));
            branchRect_.push_back(static_cast<uint32_t>(rects_.size()));
            for (WindowFeature const& f : branch)
                append(f, stride);
        }
    } catch (std::bad_alloc const&) {
        clear();
        return false;
    }
    stride_ = stride;
    return true;
}
