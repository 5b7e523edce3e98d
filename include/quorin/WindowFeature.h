#ifndef QUORIN_WINDOWFEATURE_H
#define QUORIN_WINDOWFEATURE_H

#include <cstdint>

#include "quorin/export.h"

class HaarFeature;
class IN_IMAGE;
class ModelReader;

// A tagged window feature of the cascade: kind 1 is a Haar feature (weighted
// rectangles), kind 2 the window's inverse deviation itself, kind 0 empty.
//
// A host reaches only the two static members, which are exported, and reads
// `kind` of the elements they hand out. Everything else is the engine's own:
// its types are not public and its members are not exported.
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
    void prepareOffsets(int stride);
    float Eval(IN_IMAGE const& image, float inverseDeviation, int offset) const;
    float Eval(IN_IMAGE const& image, float inverseDeviation, int x, int y) const;

    // The feature vocabulary of a width x height window.
    // requires: sizes in pixels; ratios as fractions of a cell.
    // ensures: an array of *count features: element 0 of kind 2, then every
    //   feature of six rectangle families (two cells side by side, stacked,
    //   three side by side, stacked, 2 x 2, 3 x 3) that fits the window, cells
    //   growing from minWidth x minHeight by growRatio (at least one pixel per
    //   step) and shifted by shiftRatio of a cell (at least one pixel), all of
    //   kind 1. Null, with *count untouched, for a null `count`, a pool too
    //   large to hold, or an array that can't be allocated.
    // throws: std::bad_alloc if a feature's own memory runs out; nothing is
    //   leaked then.
    QUORIN_EXPORT static WindowFeature* generateFeaturePool(int width, int height, int minWidth, int minHeight,
                                                            float shiftRatio, float growRatio, int* count);
    // requires: null, or an array from generateFeaturePool not yet destroyed.
    // ensures: the features and the array are freed.
    QUORIN_EXPORT static void destroyFeaturePool(WindowFeature* pool);
};

#endif
