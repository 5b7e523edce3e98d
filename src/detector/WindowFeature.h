#ifndef QUORIN_DETECTOR_WINDOWFEATURE_H
#define QUORIN_DETECTOR_WINDOWFEATURE_H

#include <cstdint>

#include "detector/HaarFeature.h"
#include "image/IntegralImage.h"
#include "quorin/export.h"

class ModelReader;

// A tagged window feature: kind 1 is a Haar feature, kind 2 the window's
// inverse deviation itself, kind 0 empty; any other kind read from a model
// evaluates to 0.
class WindowFeature {
public:
    enum Kind { EMPTY = 0, HAAR = 1, DEVIATION = 2 };

    int32_t kind = EMPTY;
    HaarFeature* haar = nullptr; // owned, meaningful for kind 1 only

    WindowFeature() = default;
    ~WindowFeature();
    WindowFeature(WindowFeature&& other) noexcept;
    WindowFeature& operator=(WindowFeature&& other) noexcept;
    WindowFeature(WindowFeature const&) = delete;
    WindowFeature& operator=(WindowFeature const&) = delete;

    // Reads a kind and, for kind 1, its rectangles. False for a kind other
    // than 1 or 2 (no further bytes are read) or a failed allocation.
    bool Init(ModelReader& reader);
    // Scaled copy of `source`; kind 2 copies as it is, other kinds give false.
    bool Init(WindowFeature const* source, float scale);
    void Release();
    void prepareOffsets(int stride)
    {
        if (kind == HAAR && haar != nullptr)
            haar->prepareOffsets(stride);
    }

    float Eval(IN_IMAGE const& image, float inverseDeviation, int offset) const
    {
        if (kind == HAAR)
            return haar->Eval(image, inverseDeviation, offset);
        if (kind == DEVIATION)
            return inverseDeviation;
        return 0.0f;
    }
    float Eval(IN_IMAGE const& image, float inverseDeviation, int x, int y) const;

    // Every feature of six rectangle families that fits a width x height
    // window, cells growing from minWidth x minHeight by growRatio (at least
    // one pixel per step) and shifted by shiftRatio of a cell (at least one
    // pixel); element 0 is a deviation feature. Returns an array of *count
    // features, or null (count untouched) when the array can't be had. Free it
    // with destroyFeaturePool.
    QUORIN_EXPORT static WindowFeature* generateFeaturePool(int width, int height, int minWidth, int minHeight,
                                                            float shiftRatio, float growRatio, int* count);
    // Accepts null.
    QUORIN_EXPORT static void destroyFeaturePool(WindowFeature* pool);
};

#endif
