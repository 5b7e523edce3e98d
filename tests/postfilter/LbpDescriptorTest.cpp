#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>
#include <vector>

#include "core/Errors.h"
#include "postfilter/LbpDescriptor.h"

namespace {

// Histogram of a 3 x 3 image of `base` whose neighbour at (dx, dy) is `other`:
// one counted pixel, the center.
std::vector<float> centerHistogram(float base, int dx, int dy, float other)
{
    std::vector<float> image(9, base);
    image[(1 + dy) * 3 + (1 + dx)] = other;
    LbpDescriptor d(1, 1);
    std::vector<float> h(d.getLength(), -1.0f);
    d.getFeature(image.data(), 3, 3, h.data());
    return h;
}

int onlyBin(const std::vector<float>& h)
{
    EXPECT_FLOAT_EQ(std::accumulate(h.begin(), h.end(), 0.0f), 1.0f);
    return static_cast<int>(std::max_element(h.begin(), h.end()) - h.begin());
}

} // namespace

TEST(LbpPatternTable, NumbersUniformPatternsInAscendingOrder)
{
    const auto& lut = LbpDescriptor::LBP_LUT;
    EXPECT_EQ(lut[0], 0);
    EXPECT_EQ(lut[1], 1);
    EXPECT_EQ(lut[2], 2);
    EXPECT_EQ(lut[3], 3);
    EXPECT_EQ(lut[4], 4);
    EXPECT_EQ(lut[5], 58); // 00000101: four changes
    EXPECT_EQ(lut[6], 5);
    EXPECT_EQ(lut[7], 6);
    EXPECT_EQ(lut[8], 7);
    EXPECT_EQ(lut[17], 58);
    EXPECT_EQ(lut[129], 30); // 10000001: wraps around the circle, uniform
    EXPECT_EQ(lut[254], 56);
    EXPECT_EQ(lut[255], 57);
    EXPECT_EQ(std::count(lut.begin(), lut.end(), 58), 256 - 58);
}

TEST(LbpDescriptorShape, LengthIsCellsTimesBins)
{
    EXPECT_EQ(LbpDescriptor().getLength(), 0);
    EXPECT_EQ(LbpDescriptor(4, 4).getLength(), 944);
    EXPECT_EQ(LbpDescriptor(3, 2).getLength(), 354);
}

TEST(LbpDescriptorShape, RejectsNegativeOrOversizedGridAndKeepsOldOne)
{
    LbpDescriptor d(4, 4);
    EXPECT_THROW(d.init(-1, 4), qv_invalid_argument);
    EXPECT_THROW(d.init(1 << 20, 1 << 20), qv_invalid_argument);
    EXPECT_EQ(d.getLength(), 944);
}

TEST(LbpDescriptorPattern, EachNeighbourSetsItsOwnBitClockwiseFromTopLeft)
{
    // (dx, dy) -> bit value, then through the table.
    EXPECT_EQ(onlyBin(centerHistogram(10, -1, -1, 20)), LbpDescriptor::LBP_LUT[1]);
    EXPECT_EQ(onlyBin(centerHistogram(10, 0, -1, 20)), LbpDescriptor::LBP_LUT[2]);
    EXPECT_EQ(onlyBin(centerHistogram(10, 1, -1, 20)), LbpDescriptor::LBP_LUT[4]);
    EXPECT_EQ(onlyBin(centerHistogram(10, 1, 0, 20)), 7);   // 8
    EXPECT_EQ(onlyBin(centerHistogram(10, 1, 1, 20)), 11);  // 16
    EXPECT_EQ(onlyBin(centerHistogram(10, 0, 1, 20)), 16);  // 32
    EXPECT_EQ(onlyBin(centerHistogram(10, -1, 1, 20)), 22); // 64
    EXPECT_EQ(onlyBin(centerHistogram(10, -1, 0, 20)), 29); // 128
}

TEST(LbpDescriptorPattern, ComparisonIsStrict)
{
    // Equal neighbours set nothing: a flat image is code 0 everywhere.
    EXPECT_EQ(onlyBin(centerHistogram(10, 1, 0, 10)), 0);
    // A dark center below all eight: 255 -> 57.
    std::vector<float> image(9, 5.0f);
    image[4] = 4.5f;
    LbpDescriptor d(1, 1);
    std::vector<float> h(d.getLength());
    d.getFeature(image.data(), 3, 3, h.data());
    EXPECT_EQ(onlyBin(h), 57);
    // A bright center is a local maximum: code 0.
    EXPECT_EQ(onlyBin(centerHistogram(10, 0, 0, 99)), 0);
}

TEST(LbpDescriptorCells, FlatPatchCountsInteriorPixelsPerCellInBinZero)
{
    std::vector<float> image(24 * 24, 7.0f);
    LbpDescriptor d(4, 4);
    std::vector<float> h(d.getLength(), 3.0f);
    d.getFeature(image.data(), 24, 24, h.data());
    // Border cells lose the frame's outer row or column: 5 or 6 pixels a side.
    const int side[4] = {5, 6, 6, 5};
    for (int row = 0; row < 4; ++row)
        for (int col = 0; col < 4; ++col) {
            const float* cell = h.data() + (row * 4 + col) * 59;
            EXPECT_FLOAT_EQ(cell[0], float(side[row] * side[col])) << row << "," << col;
            EXPECT_FLOAT_EQ(std::accumulate(cell + 1, cell + 59, 0.0f), 0.0f);
        }
}

TEST(LbpDescriptorCells, CellIndexRunsAlongRowsThenDown)
{
    // 2 cells across, 1 down, on an 8 x 4 image: a dark pixel at x 5 lands in
    // the right cell, which is the second block of 59 bins.
    std::vector<float> image(8 * 4, 50.0f);
    image[1 * 8 + 5] = 1.0f;
    LbpDescriptor d(2, 1);
    std::vector<float> h(d.getLength());
    d.getFeature(image.data(), 8, 4, h.data());
    EXPECT_FLOAT_EQ(h[59 + 57], 1.0f);
    EXPECT_FLOAT_EQ(h[57], 0.0f);

    // 1 across, 2 down, on a 4 x 8 image: the same pixel transposed.
    std::vector<float> tall(4 * 8, 50.0f);
    tall[5 * 4 + 1] = 1.0f;
    LbpDescriptor t(1, 2);
    std::vector<float> ht(t.getLength());
    t.getFeature(tall.data(), 4, 8, ht.data());
    EXPECT_FLOAT_EQ(ht[59 + 57], 1.0f);
}

TEST(LbpDescriptorCells, RemainderOfTheCellDivisionCountsNowhere)
{
    // 26 wide, 4 cells: cells are 6 wide and column 24 falls into a fifth cell.
    std::vector<float> image(26 * 26, 1.0f);
    LbpDescriptor d(4, 4);
    std::vector<float> h(d.getLength());
    d.getFeature(image.data(), 26, 26, h.data());
    EXPECT_FLOAT_EQ(std::accumulate(h.begin(), h.end(), 0.0f), 23.0f * 23.0f);
}

TEST(LbpDescriptorCells, TooFewRowsGiveAnAllZeroHistogram)
{
    std::vector<float> image(24 * 2, 1.0f);
    LbpDescriptor d(4, 4);
    std::vector<float> h(d.getLength(), 9.0f);
    d.getFeature(image.data(), 24, 2, h.data());
    EXPECT_TRUE(std::all_of(h.begin(), h.end(), [](float v) { return v == 0.0f; }));
}

TEST(LbpDescriptorInput, RejectsBuffersAndSizesItCannotServe)
{
    LbpDescriptor d(4, 4);
    std::vector<float> h(d.getLength());
    std::vector<float> image(24 * 24, 0.0f);
    EXPECT_THROW(d.getFeature(image.data(), 24, 24, nullptr), qv_invalid_argument);
    EXPECT_THROW(d.getFeature(nullptr, 24, 24, h.data()), qv_invalid_argument);
    EXPECT_THROW(d.getFeature(image.data(), -24, 24, h.data()), qv_invalid_argument);
    // Interior pixels but fewer columns than cells: no cell to put them in.
    EXPECT_THROW(d.getFeature(image.data(), 3, 24, h.data()), qv_invalid_argument);
    // No cells: nothing to write, even without buffers.
    EXPECT_NO_THROW(LbpDescriptor().getFeature(nullptr, 24, 24, nullptr));
}
