#include "image/Image.h"

#include <cmath>
#include <cstdlib>
#include <cstring>
#include <limits>

#include "image/PixelMemory.h"

IMAGE::IMAGE(int w, int h, int s, unsigned char* pixels)
{
    if (pixels == nullptr) {
        Realloc(w, h);
        return;
    }
    borrowPixels(*this, w, h, s, pixels);
}

IMAGE::IMAGE(int w, int h, int s, int channels, unsigned char* pixels)
{
    if (pixels == nullptr || channels <= 0 || w <= 0) {
        Realloc(w, h);
        return;
    }
    const int step = s / w;
    if (step >= channels && step > 1) {
        if (!Realloc(w, h))
            return;
        for (int y = 0; y < h; ++y) {
            unsigned char const* src = pixels + static_cast<std::ptrdiff_t>(y) * s;
            unsigned char* dst = data + static_cast<std::ptrdiff_t>(y) * stride;
            for (int x = 0; x < w; ++x, src += step) {
                int sum = 0;
                for (int c = 0; c < channels; ++c)
                    sum += src[c];
                dst[x] = static_cast<unsigned char>(sum / channels);
            }
        }
        return;
    }
    borrowPixels(*this, w, h, s, pixels);
}

IMAGE::~IMAGE()
{
    Release();
}

bool IMAGE::Realloc(int w, int h)
{
    if (w < 0 || h < 0 || w > std::numeric_limits<int32_t>::max() - 3) {
        Release();
        return false;
    }
    const int32_t newStride = ((w + 3) / 4) * 4;
    const int64_t bytes = static_cast<int64_t>(newStride) * h;
    if (bytes > std::numeric_limits<int32_t>::max()) {
        Release();
        return false;
    }
    if (!growPixels(data, capacity, bytes)) {
        Release();
        return false;
    }
    width = w;
    height = h;
    stride = newStride;
    return true;
}

void IMAGE::Release()
{
    freePixels(data, capacity);
    width = stride = height = capacity = 0;
}

void IMAGE::ZeroImage()
{
    if (data != nullptr && height > 0 && stride > 0)
        std::memset(data, 0, static_cast<size_t>(height) * static_cast<size_t>(stride));
}

void IMAGE::FillBox(int left, int right, int top, int bottom, unsigned char value)
{
    if (data == nullptr || top > bottom)
        return;
    // The box lands at the first byte whatever its position; the length is
    // bounded by the image so that no box can write past the pixels.
    const int64_t extent = static_cast<int64_t>(stride) * height;
    int64_t count = static_cast<int64_t>(right) - left + 1;
    if (count > extent)
        count = extent;
    if (count <= 0)
        return;
    for (int64_t row = top; row <= bottom; ++row)
        std::memset(data, value, static_cast<size_t>(count));
}

void IMAGE::PreProc4SVM(float* output) const
{
    const int n = width * height;
    if (output == nullptr || data == nullptr || width <= 0 || height <= 0)
        return;

    // Histogram equalisation to -1..1.
    int histogram[256] = {};
    for (int y = 0; y < height; ++y) {
        unsigned char const* row = data + static_cast<std::ptrdiff_t>(y) * stride;
        for (int x = 0; x < width; ++x)
            ++histogram[row[x]];
    }
    float level[256];
    const float invN = 1.0f / static_cast<float>(n);
    int cumulative = 0;
    for (int v = 0; v < 256; ++v) {
        cumulative += histogram[v];
        level[v] = static_cast<float>(2 * cumulative - n) * invN;
    }
    for (int y = 0; y < height; ++y) {
        unsigned char const* row = data + static_cast<std::ptrdiff_t>(y) * stride;
        float* out = output + static_cast<std::ptrdiff_t>(y) * width;
        for (int x = 0; x < width; ++x)
            out[x] = level[row[x]];
    }

    // Least-squares plane removal; the constants solve the 24 x 24 grid only.
    if (width == 24 && height == 24) {
        float s = 0.0f, sx = 0.0f, sy = 0.0f;
        for (int y = 0; y < 24; ++y)
            for (int x = 0; x < 24; ++x) {
                const float v = output[y * 24 + x];
                s += v;
                sx += v * static_cast<float>(x);
                sy += v * static_cast<float>(y);
            }
        const float slopeX = sx * 3.6231882e-5f - s * 0.00041666668f;
        const float slopeY = sy * 3.6231882e-5f - s * 0.00041666668f;
        float rowStart = -sy * 0.00041666668f - sx * 0.00041666668f + s * 0.0113194445f;
        for (int y = 0; y < 24; ++y) {
            float plane = rowStart;
            for (int x = 0; x < 24; ++x) {
                output[y * 24 + x] -= plane;
                plane += slopeX;
            }
            rowStart += slopeY;
        }
    }

    float sum = 0.0f, squares = 0.0f;
    for (int i = 0; i < n; ++i) {
        sum += output[i];
        squares += output[i] * output[i];
    }
    const float fn = static_cast<float>(n);
    const float deviation = std::sqrt((squares * fn - sum * sum) / static_cast<float>(static_cast<int64_t>(n) * n));
    if (!(deviation >= 1e-6f)) {
        std::memset(output, 0, sizeof(float) * static_cast<size_t>(n));
        return;
    }
    const float mean = sum / fn;
    const float invDeviation = 1.0f / deviation;
    for (int i = 0; i < n; ++i)
        output[i] = (output[i] - mean) * invDeviation;
}

float resizeImage(IMAGE const& source, IMAGE& target)
{
    float total = 0.0f;
    if (target.height <= 0 || target.width <= 0 || target.data == nullptr)
        return 0.0f;
    if (source.data == nullptr || source.width <= 0 || source.height <= 0)
        return 0.0f;
    for (int y = 0; y < target.height; ++y) {
        const int64_t sy = static_cast<int64_t>(static_cast<double>(static_cast<int64_t>(source.height) * y) /
                                                static_cast<double>(target.height));
        unsigned char const* src = source.data + sy * source.stride;
        unsigned char* dst = target.data + static_cast<std::ptrdiff_t>(y) * target.stride;
        for (int x = 0; x < target.width; ++x) {
            const int64_t sx = static_cast<int64_t>(static_cast<double>(static_cast<int64_t>(source.width) * x) /
                                                    static_cast<double>(target.width));
            dst[x] = src[sx];
            total += static_cast<float>(dst[x]);
        }
    }
    return total;
}
