#ifndef QUORIN_IMAGE_IMAGE_H
#define QUORIN_IMAGE_IMAGE_H

#include <cstdint>

// 8-bit gray image. Owns its pixels when `capacity` is above 0, otherwise
// borrows them (the caller keeps them alive). Allocation failures are reported
// by a false result, never by an exception.
class IMAGE {
public:
    int32_t width = 0;
    int32_t stride = 0;   // bytes from one row to the next
    int32_t height = 0;
    int32_t capacity = 0; // bytes owned; 0 means borrowed (or none)
    unsigned char* data = nullptr;

    IMAGE() = default;
    // Borrows `data` as it stands; with null data allocates (stride ignored).
    IMAGE(int width, int height, int stride, unsigned char* data);
    // With null data or channels <= 0 allocates. Otherwise, when stride / width
    // is at least `channels` and above 1, the data is interleaved: the image
    // owns a gray copy, each pixel the integer mean of the first `channels`
    // bytes. Otherwise borrows `data` as gray.
    IMAGE(int width, int height, int stride, int channels, unsigned char* data);
    ~IMAGE();

    IMAGE(IMAGE const&) = delete;
    IMAGE& operator=(IMAGE const&) = delete;

    // Stride becomes width rounded up to a multiple of 4; new memory only when
    // stride * height exceeds capacity. Contents are not kept. False (and the
    // image released) on failure or on a negative or oversized request.
    bool Realloc(int width, int height);
    // Frees owned pixels and zeroes the sizes; a borrowed pointer stays in data.
    void Release();
    // Clears height * stride bytes.
    void ZeroImage();
    // Writes right - left + 1 bytes of `value` from the first byte of data,
    // once per row from top to bottom: the box's position plays no part.
    // Never writes beyond stride * height bytes.
    void FillBox(int left, int right, int top, int bottom, unsigned char value);
    // Writes width * height floats, row by row: histogram-equalised to -1..1,
    // plane removed when the image is 24 x 24, then zero mean, unit deviation.
    void PreProc4SVM(float* output) const;
};

// Nearest-neighbour scaling of `source` into `target` at target's own size.
// Returns the sum of all pixels written (float32); 0 for an empty target.
float resizeImage(IMAGE const& source, IMAGE& target);

#endif
