#include <gtest/gtest.h>

#include <algorithm>
#include <numeric>
#include <vector>

#include "core/Errors.h"
#include "postfilter/LbpDescriptor.h"

namespace {

std::vector<float> histogram(const LbpDescriptor& d, const std::vector<float>& image, int width, int height)
{
    std::vector<float> h(d.getLength(), -1.0f);
    d.getFeature(image.data(), width, height, h.data());
    return h;
}

// The one bin hit by the center of a 3 x 3 image of 10 whose neighbour at
// (dx, dy) is `other`.
int centerCode(int dx, int dy, float other)
{
    std::vector<float> image(9, 10.0f);
    image[(1 + dy) * 3 + (1 + dx)] = other;
    std::vector<float> h = histogram(LbpDescriptor(1, 1), image, 3, 3);
    EXPECT_EQ(std::accumulate(h.begin(), h.end(), 0.0f), 1.0f);
    return static_cast<int>(std::max_element(h.begin(), h.end()) - h.begin());
}

} // namespace

TEST(LbpDescriptorPattern, NeighboursSetBitsClockwiseFromTopLeftOnlyWhenStrictlyBrighter)
{
    // (dx, dy) -> code of the bit 1, 2, 4 ... 128 through the table.
    const int dx[] = {-1, 0, 1, 1, 1, 0, -1, -1};
    const int dy[] = {-1, -1, -1, 0, 1, 1, 1, 0};
    const int code[] = {1, 2, 4, 7, 11, 16, 22, 29};
    for (int i = 0; i < 8; ++i) {
        EXPECT_EQ(centerCode(dx[i], dy[i], 20.0f), code[i]) << i;
        EXPECT_EQ(centerCode(dx[i], dy[i], 10.0f), 0) << "equal neighbour " << i;
    }
    EXPECT_EQ(centerCode(0, 0, 99.0f), 0);  // a local maximum
    EXPECT_EQ(centerCode(0, 0, 9.5f), 57);  // darker than all eight: 255
    // The 58 uniform patterns are numbered in ascending order; the rest share 58.
    const auto& lut = LbpDescriptor::LBP_LUT;
    EXPECT_EQ(std::vector<int>({lut[5], lut[6], lut[129], lut[254]}), std::vector<int>({58, 5, 30, 56}));
    EXPECT_EQ(std::count(lut.begin(), lut.end(), 58), 256 - 58);
}

TEST(LbpDescriptorCells, CellsRunAlongRowsThenDownAndBorderPixelsCountNowhere)
{
    // A flat 24 x 24 patch: each cell counts its interior pixels in bin 0, the
    // border cells losing the outer row or column.
    std::vector<float> h = histogram(LbpDescriptor(4, 4), std::vector<float>(24 * 24, 7.0f), 24, 24);
    const int side[4] = {5, 6, 6, 5};
    for (int cell = 0; cell < 16; ++cell) {
        EXPECT_EQ(h[cell * 59], float(side[cell / 4] * side[cell % 4])) << cell;
        EXPECT_EQ(std::accumulate(&h[cell * 59 + 1], &h[cell * 59 + 59], 0.0f), 0.0f);
    }
    // 2 x 1 cells on 8 x 4: a dark pixel at x 5 is in the second block of bins;
    // 1 x 2 cells on 4 x 8: the same pixel transposed, the same block.
    std::vector<float> wide(8 * 4, 50.0f), tall(4 * 8, 50.0f);
    wide[1 * 8 + 5] = 1.0f;
    tall[5 * 4 + 1] = 1.0f;
    EXPECT_EQ(histogram(LbpDescriptor(2, 1), wide, 8, 4)[59 + 57], 1.0f);
    EXPECT_EQ(histogram(LbpDescriptor(1, 2), tall, 4, 8)[59 + 57], 1.0f);
    // 26 x 26 in 4 x 4 cells of 6: column and row 24 would be a fifth cell.
    h = histogram(LbpDescriptor(4, 4), std::vector<float>(26 * 26, 1.0f), 26, 26);
    EXPECT_EQ(std::accumulate(h.begin(), h.end(), 0.0f), 23.0f * 23.0f);
    // Fewer than 3 rows: nothing counts, but every bin is cleared.
    h = histogram(LbpDescriptor(4, 4), std::vector<float>(24 * 2, 1.0f), 24, 2);
    EXPECT_EQ(h, std::vector<float>(h.size(), 0.0f));
}
