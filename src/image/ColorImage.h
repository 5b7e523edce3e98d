#ifndef QUORIN_IMAGE_COLORIMAGE_H
#define QUORIN_IMAGE_COLORIMAGE_H

#include <cstdint>

// Colour pixels; nothing in the detection path uses this class. Allocation
// failures throw the text "memory allocation failure" as a const char*.
class IMAGEC {
public:
    // Stored and not interpreted.
    enum COLORSPACE { COLORSPACE_UNKNOWN = 0, COLORSPACE_RGB = 1, COLORSPACE_BGR = 2, COLORSPACE_YUV = 3 };

    int32_t width = 0;
    int32_t height = 0;
    int32_t stride = 0;
    int32_t capacity = 0;
    unsigned char* data = nullptr;
    COLORSPACE colorspace = COLORSPACE_UNKNOWN;

    IMAGEC() = default;
    // With null data allocates, otherwise borrows.
    IMAGEC(int width, int height, COLORSPACE colorspace, int stride, unsigned char* data);
    ~IMAGEC();

    IMAGEC(IMAGEC const&) = delete;
    IMAGEC& operator=(IMAGEC const&) = delete;

    // The row length is computed from the width held before the call:
    // stride = (3 * (old width + 1) / 4) * 4; then the new width is stored.
    void Realloc(int width, int height);
    void Release();
};

#endif
