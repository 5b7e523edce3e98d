#include "image/ColorImage.h"

#include <cstdlib>
#include <limits>

IMAGEC::IMAGEC(int w, int h, COLORSPACE space, int s, unsigned char* pixels) : colorspace(space)
{
    if (pixels == nullptr) {
        Realloc(w, h);
        return;
    }
    width = w;
    height = h;
    stride = s;
    data = pixels;
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
    if (bytes > capacity) {
        unsigned char* fresh = static_cast<unsigned char*>(std::malloc(static_cast<size_t>(bytes)));
        if (fresh == nullptr)
            throw "memory allocation failure";
        if (capacity > 0)
            std::free(data);
        data = fresh;
        capacity = static_cast<int32_t>(bytes);
    }
}

void IMAGEC::Release()
{
    if (capacity > 0) {
        std::free(data);
        data = nullptr;
    }
    width = height = stride = capacity = 0;
}
