#ifndef QUORIN_IMAGE_INTEGRALIMAGE_H
#define QUORIN_IMAGE_INTEGRALIMAGE_H

#include <cstdint>

#include "image/DetectionWindow.h"

class IMAGE;
class IN_IMAGE;

// Integral image with one extra row and column of zeros: the entry at column x,
// row y is the sum of all pixels left of x and above y, so `stride` is the
// pixel width plus 1. Sums wrap at 32 bits. Allocation failures are reported by
// a false result. The read accessors don't check bounds: windows are the
// caller's to keep inside.
class I_IMAGE {
public:
    int32_t stride = 0;   // entries per row, pixel width + 1
    int32_t rows = 0;     // pixel height + 1
    int32_t capacity = 0; // entries allocated
    uint32_t* data = nullptr;

    I_IMAGE() = default;
    I_IMAGE(int width, int height);
    ~I_IMAGE();

    I_IMAGE(I_IMAGE const&) = delete;
    I_IMAGE& operator=(I_IMAGE const&) = delete;

    // Room for (width + 1) * (height + 1) entries; sets stride and rows.
    bool Realloc(int width, int height);
    void Release();
    // Reallocates when the size differs, then fills from 8-bit pixels.
    bool Init(int width, int height, int stride, unsigned char const* pixels);
    bool Init(IMAGE const* image);

    int pixelWidth() const { return stride - 1; }
    int pixelHeight() const { return rows - 1; }

    uint32_t valueAt(int x, int y) const { return data[y * stride + x]; }

    // Mean of a window (right/bottom exclusive); zero area is not allowed.
    float ComputeAvg(DetectionWindow const& window) const;
    float ComputeAvg(int left, int top, int right, int bottom) const;

    // Fills this image, at its present size, with samples of `source`:
    // entry (j, i) = source(left + round(j * scale), top + round(i * scale)).
    // Samples outside the source are clamped to its last row or column.
    void resampleFrom(IN_IMAGE const* source, int left, int top, float scale);

    // Bilinear reading of the integral at a fractional corner; fractions below
    // 0.001 count as 0 so that a read on the last row or column stays inside.
    double interpolate(double x, double y) const;

    // Box-filters the window (clipped to the image) into `target`; a target of
    // no size gets the clipped window's size. Throws the text
    // "memory allocation failure" (as const char*) when scratch can't be had.
    void CropScaleToImage(IMAGE* target, DetectionWindow const* window) const;

protected:
    void fill(int width, int height, int stride, unsigned char const* pixels);
};

// Integral image with the integral of squares beside it, answering the inverse
// deviation of any window in constant time. Allocation failures throw the text
// "memory allocation failure" as a const char*.
class IN_IMAGE : public I_IMAGE {
public:
    uint64_t* squared = nullptr;
    // sqrt(i) for i below 65536; one table shared by all instances.
    float const* sqrtTable = nullptr;

    IN_IMAGE();
    IN_IMAGE(int width, int height);
    ~IN_IMAGE();

    bool Realloc(int width, int height);
    void Release();
    bool Init(int width, int height, int stride, unsigned char const* pixels);
    bool Init(IMAGE const* image);

    uint64_t squaredValueAt(int x, int y) const { return squared[y * stride + x]; }

    // Inverse standard deviation of a window, at most 1: a window with a
    // deviation below 1 (flat) is not amplified.
    float ComputeNorm(DetectionWindow const& window) const;

private:
    int32_t squaredCapacity = 0;
    // 1 / sqrtTable[i], or 1 where the root is below 1; shared like sqrtTable.
    float const* inverseDeviationTable = nullptr;
};

#endif
