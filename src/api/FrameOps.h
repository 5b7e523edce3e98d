#ifndef QUORIN_API_FRAMEOPS_H
#define QUORIN_API_FRAMEOPS_H

#include <cstdint>

// Frame handling of the entry points. Internal to the library.

// Largest frame, in pixels, that rotateFrame turns: the size of the work
// buffer it writes into when no resize happens (320 * 320).
constexpr int32_t kRotateFrameLimit = 102400;

// Turns a width x height frame clockwise by `rotation` (taken modulo 360 with
// the sign of C's remainder) from source into destination; both must hold
// width*height bytes. 0 copies, 90 and 270 swap width and height. The 270 turn
// is deliberately displaced by one index: its first source row gives only
// width-1 pixels, destination[n-1] is not written and source[n-1] not read.
// Returns false, touching nothing, for frames above kRotateFrameLimit pixels,
// for non-positive sizes and for remainders other than 0, 90, 180, 270.
bool rotateFrame(unsigned char* destination, const unsigned char* source, int32_t& width, int32_t& height,
                 int32_t rotation);

// Turns a point (x, y) as the scaled results are turned back: 180 -> (-x,-y),
// 270 -> (-y, x), 90 -> (y, -x); other remainders leave it. Wraps instead of
// overflowing.
void rotatePoint(int32_t* point, int32_t rotation);

// Nearest-neighbour shrink from width x height to w x h with integer steps and
// error terms, no division per pixel. Requires 1 <= w <= width and
// 1 <= h <= height (returns false otherwise, touching nothing); destination
// holds w*h bytes.
bool resizeNearest(const unsigned char* source, int32_t width, int32_t height, unsigned char* destination,
                   int32_t w, int32_t h);

// Float to int toward zero, saturating at the int range; NaN gives 0.
int32_t truncateToInt(float value);

#endif
