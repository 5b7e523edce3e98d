#ifndef QUORIN_IMAGE_PIXELMEMORY_H
#define QUORIN_IMAGE_PIXELMEMORY_H

#include <cstdint>

// The owned pixel memory of the gray and colour images: `capacity` bytes at
// `data` are owned when capacity is above 0, otherwise data is borrowed.

// Makes room for `bytes` (0 <= bytes <= INT32_MAX): new memory only when
// bytes exceed capacity, contents not kept, the old memory freed if owned.
// False, changing nothing, when the heap refuses.
bool growPixels(unsigned char*& data, int32_t& capacity, int64_t bytes);

// Frees owned memory and nulls data; a borrowed pointer stays.
void freePixels(unsigned char*& data, int32_t capacity);

// Points an image at the caller's pixels, as they stand, without owning them.
template <typename Image>
void borrowPixels(Image& image, int width, int height, int stride, unsigned char* pixels)
{
    image.width = width;
    image.height = height;
    image.stride = stride;
    image.data = pixels;
}

#endif
