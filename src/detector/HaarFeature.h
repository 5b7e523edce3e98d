#ifndef QUORIN_DETECTOR_HAARFEATURE_H
#define QUORIN_DETECTOR_HAARFEATURE_H

#include <cstdint>

#include "image/IntegralImage.h"

class ModelReader;

// One weighted rectangle of a Haar feature. Coordinates are relative to the
// window's origin (right/bottom one past the last pixel); the corner offsets
// are the same corners as indices into the integral data for one row stride,
// set by prepareOffsets, so that a rectangle sum is four reads.
struct HaarRect {
    uint32_t cornerTopLeft = 0;
    uint32_t cornerBottomLeft = 0;
    uint32_t cornerTopRight = 0;
    uint32_t cornerBottomRight = 0;
    float weight = 0.0f;
    int32_t left = 0;
    int32_t right = 0;
    int32_t top = 0;
    int32_t bottom = 0;
};

// Weighted sum of rectangle sums, times the window's inverse deviation.
// Allocation failures are reported by a false result, never by an exception.
class HaarFeature {
public:
    // Base window of every model feature.
    static constexpr int kBaseSize = 24;
    // Most rectangles a model feature may carry; a larger count is malformed.
    static constexpr int kMaxRects = 64;

    int32_t count = 0;
    HaarRect* rects = nullptr;

    HaarFeature() = default;
    // Scaled copy of `source` (see Init(source, scale)).
    HaarFeature(HaarFeature const* source, float scale);
    ~HaarFeature();

    HaarFeature(HaarFeature const&) = delete;
    HaarFeature& operator=(HaarFeature const&) = delete;
    HaarFeature(HaarFeature&& other) noexcept : count(other.count), rects(other.rects)
    {
        other.count = 0;
        other.rects = nullptr;
    }

    // Reads a rectangle count and the rectangles. Throws qv_data_error when
    // the count is negative or above kMaxRects, or a rectangle is empty or
    // leaves the 24 x 24 base window; the reader throws on truncated data.
    bool Init(ModelReader& reader);
    // Releases and allocates `count` uninitialised rectangles.
    bool Init(int count);
    // Rectangles rounded to scale (corners, half up) and weights corrected by
    // the ratio of the integer areas. Offsets are stale until prepareOffsets.
    // False for a null source or failed allocation (count then 0).
    bool Init(HaarFeature const* source, float scale);
    // Frees the rectangles; count stays.
    void Release();

    void prepareOffsets(int stride);

    // Requires prepared offsets for the image's stride; `offset` is the index
    // of the window's top-left corner in the integral data.
    float Eval(I_IMAGE const& image, float inverseDeviation, int offset) const
    {
        uint32_t const* p = image.data + offset;
        if (count == 2) {
            HaarRect const& a = rects[0];
            HaarRect const& b = rects[1];
            float v = static_cast<float>(p[a.cornerBottomRight] + p[a.cornerTopLeft] - p[a.cornerTopRight] -
                                         p[a.cornerBottomLeft]) * a.weight;
            v += static_cast<float>(p[b.cornerBottomRight] + p[b.cornerTopLeft] - p[b.cornerTopRight] -
                                    p[b.cornerBottomLeft]) * b.weight;
            return v * inverseDeviation;
        }
        return evalLoop(p, inverseDeviation);
    }
    // The same from coordinates, without prepared offsets.
    float Eval(I_IMAGE const& image, float inverseDeviation, int x, int y) const;

private:
    float evalLoop(uint32_t const* p, float inverseDeviation) const;
};

#endif
