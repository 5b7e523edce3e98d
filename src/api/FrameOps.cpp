#include "api/FrameOps.h"

#include <cmath>
#include <cstring>
#include <limits>
#include <utility>

bool rotateFrame(unsigned char* destination, const unsigned char* source, int32_t& width, int32_t& height,
                 int32_t rotation) {
    if (width <= 0 || height <= 0) return false;
    const int64_t n64 = static_cast<int64_t>(width) * height;
    if (n64 > kRotateFrameLimit) return false;
    const int32_t n = static_cast<int32_t>(n64);
    const int32_t remainder = rotation % 360;
    switch (remainder) {
        case 0:
            std::memcpy(destination, source, static_cast<std::size_t>(n));
            return true;
        case 90: {
            int32_t s = 0;
            for (int32_t c = height - 1; c >= 0; --c)
                for (int32_t i = c; i <= n - 1; i += height) destination[i] = source[s++];
            std::swap(width, height);
            return true;
        }
        case 180:
            for (int32_t i = 0; i < n; ++i) destination[n - 1 - i] = source[i];
            return true;
        case 270: {
            // One index short of a clean counter-clockwise turn, on purpose:
            // the reported coordinates depend on this displacement.
            int32_t s = 0;
            for (int32_t c = 0; c <= height - 1; ++c)
                for (int32_t i = n - 1 - height + c; i >= 0; i -= height) destination[i] = source[s++];
            std::swap(width, height);
            return true;
        }
        default:
            return false;
    }
}

namespace {
int32_t negate(int32_t v) { return static_cast<int32_t>(0u - static_cast<uint32_t>(v)); }
}  // namespace

void rotatePoint(int32_t* point, int32_t rotation) {
    const int32_t x = point[0];
    const int32_t y = point[1];
    switch (rotation % 360) {
        case 180: point[0] = negate(x); point[1] = negate(y); break;
        case 270: point[0] = negate(y); point[1] = x; break;
        case 90: point[0] = y; point[1] = negate(x); break;
        default: break;
    }
}

bool resizeNearest(const unsigned char* source, int32_t width, int32_t height, unsigned char* destination,
                   int32_t w, int32_t h) {
    if (w < 1 || h < 1 || w > width || h > height) return false;
    // Offsets instead of pointers: the walk steps one row past the end after
    // its last row, which a pointer may not do.
    const std::size_t rowStep = static_cast<std::size_t>(height / h) * static_cast<std::size_t>(width);
    const int32_t rowRemainder = height % h;
    const int32_t colStep = width / w;
    const int32_t colRemainder = width % w;
    std::size_t p = 0;
    std::size_t previous = static_cast<std::size_t>(-1);
    int32_t rowError = 0;
    unsigned char* out = destination;
    for (int32_t row = 0; row < h; ++row, out += w) {
        if (p == previous) {
            std::memcpy(out, out - w, static_cast<std::size_t>(w));
        } else {
            std::size_t q = p;
            int32_t colError = 0;
            for (int32_t col = 0; col < w; ++col) {
                colError += colRemainder;
                out[col] = source[q];
                q += static_cast<std::size_t>(colStep);
                if (colError >= w) {
                    colError -= w;
                    q += 1;
                }
            }
        }
        previous = p;
        rowError += rowRemainder;
        p += rowStep;
        if (rowError >= h) {
            rowError -= h;
            p += static_cast<std::size_t>(width);
        }
    }
    return true;
}

int32_t truncateToInt(float value) {
    if (std::isnan(value)) return 0;
    if (value >= 2147483648.0f) return std::numeric_limits<int32_t>::max();
    if (value <= -2147483648.0f) return std::numeric_limits<int32_t>::min();
    return static_cast<int32_t>(value);
}
