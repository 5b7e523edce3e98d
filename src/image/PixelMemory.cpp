#include "image/PixelMemory.h"

#include <cstdlib>

bool growPixels(unsigned char*& data, int32_t& capacity, int64_t bytes)
{
    if (bytes <= capacity)
        return true;
    unsigned char* fresh = static_cast<unsigned char*>(std::malloc(static_cast<size_t>(bytes)));
    if (fresh == nullptr)
        return false;
    if (capacity > 0)
        std::free(data);
    data = fresh;
    capacity = static_cast<int32_t>(bytes);
    return true;
}

void freePixels(unsigned char*& data, int32_t capacity)
{
    if (capacity > 0) {
        std::free(data);
        data = nullptr;
    }
}
