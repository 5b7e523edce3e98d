#include "image/ColorImage.h"

#include <limits>

#include "image/PixelMemory.h"

IMAGEC::IMAGEC(int w, int h, COLORSPACE space, int s, unsigned char* pixels) : colorspace(space)
{
    if (pixels == nullptr) {
        Realloc(w, h);
        return;
    }
    borrowPixels(*this, w, h, s, pixels);
}

IMAGEC::~IMAGEC()
{
    Release();
}

void IMAGEC::Realloc(int w, int h)
{
    // The row length follows the width held before this call.
    const int64_t newStride = (3 * (static_cast<int64_t>(width) + 1) / 4) * 4;
    const int64_t bytes = newStride * (h > 0 ? h : 0);
    if (w < 0 || h < 0 || newStride < 0 || bytes > std::numeric_limits<int32_t>::max())
        throw "memory allocation failure";
    stride = static_cast<int32_t>(newStride);
    width = w;
    height = h;
    if (!growPixels(data, capacity, bytes))
        throw "memory allocation failure";
}

void IMAGEC::Release()
{
    freePixels(data, capacity);
    width = height = stride = capacity = 0;
}
