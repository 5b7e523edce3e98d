#ifndef QUORIN_POSTFILTER_LBPDESCRIPTOR_H
#define QUORIN_POSTFILTER_LBPDESCRIPTOR_H

#include <array>
#include <cstdint>

// Cell-wise histogram of uniform local binary patterns over a small float image.
// The post filters judge a hit by this histogram (4 by 4 cells on a 24 by 24 patch).
class LbpDescriptor {
public:
    static constexpr int LBP_HISTOGRAM_BIN = 59;
    // Uniform patterns (at most two bit changes around the circle) numbered 0..57
    // in ascending pattern value; every other pattern maps to 58.
    static const std::array<uint8_t, 256> LBP_LUT;

    // No cells: length 0, getFeature writes nothing.
    LbpDescriptor();
    // Requires cellsX, cellsY >= 0 and a histogram length that fits an int;
    // otherwise throws qv_invalid_argument and leaves the descriptor as it was.
    LbpDescriptor(int cellsX, int cellsY);
    void init(int cellsX, int cellsY);

    // Number of histogram values getFeature writes: cellsX * cellsY * 59.
    int getLength() const { return length; }

    // image: height rows of width floats; histogram: room for getLength() floats.
    // Ensures: histogram holds the unnormalised counts of pattern codes per cell;
    // border pixels and pixels in the remainder of the cell division count nowhere.
    // Throws qv_invalid_argument on null buffers, negative sizes, or an image with
    // interior pixels that is narrower or lower than its cell grid.
    void getFeature(const float* image, int width, int height, float* histogram) const;

private:
    int cellsX;
    int cellsY;
    int length;
};

#endif
