#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <tuple>
#include <vector>

#include "image/Image.h"
#include "image/IntegralImage.h"
#include "support/TrackSupport.h"

namespace {

// Random pixels in rows of `stride` bytes; the padding is bright.
struct Pixels {
    int w, h, stride;
    std::vector<unsigned char> v;
    Pixels(int width, int height, int s, unsigned seed) : w(width), h(height), stride(s), v(size_t(s) * height, 255)
    {
        std::mt19937 rng(seed);
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x)
                v[size_t(y) * s + x] = static_cast<unsigned char>(rng() & 0xFF);
    }
    uint64_t boxSum(int l, int t, int r, int b, bool squared = false) const
    {
        uint64_t s = 0;
        for (int y = t; y < b; ++y)
            for (int x = l; x < r; ++x) {
                const uint64_t p = v[size_t(y) * stride + x];
                s += squared ? p * p : p;
            }
        return s;
    }
};

} // namespace

TEST(IntegralImageBuild, EntriesAreSumsAboveAndLeftWithAZeroBorder)
{
    // One image reinitialised at other sizes reallocates and refills; the
    // padding of a stride wider than the width is left out.
    IN_IMAGE in;
    for (auto const& [w, h, stride] : {std::tuple{4, 4, 4}, std::tuple{40, 30, 40}, std::tuple{13, 7, 16}}) {
        SCOPED_TRACE(w);
        Pixels px(w, h, stride, unsigned(w));
        ASSERT_TRUE(in.Init(w, h, stride, px.v.data()));
        EXPECT_EQ(in.stride, w + 1);
        EXPECT_EQ(in.rows, h + 1);
        for (int y = 0; y <= h; ++y)
            for (int x = 0; x <= w; ++x) {
                ASSERT_EQ(in.valueAt(x, y), px.boxSum(0, 0, x, y)) << x << "," << y;
                ASSERT_EQ(in.squaredValueAt(x, y), px.boxSum(0, 0, x, y, true)) << x << "," << y;
            }
        const DetectionWindow inner = makeWindow(1, 2, w - 1, h);
        EXPECT_FLOAT_EQ(in.ComputeAvg(inner), float(double(px.boxSum(1, 2, w - 1, h)) / ((w - 2) * (h - 2))));
    }
}

TEST(IntegralImageStatistics, NormIsInverseDeviationOfTheIntegerVarianceCappedAtOne)
{
    // Pixels alternate `even` and `odd`; a uniform image gets one brighter pixel.
    const struct {
        int side;
        unsigned char even, odd;
        DetectionWindow window;
        float norm;
    } cases[] = {
        {8, 0, 200, makeWindow(0, 0, 8, 8), 0.01f},          // deviation 100
        {4, 0, 3, makeWindow(0, 0, 4, 4), 1 / std::sqrt(2.0f)}, // variance 2.25 read as 2
        {8, 90, 90, makeWindow(0, 0, 8, 8), 1.0f},           // variance 63/4096
        {8, 90, 90, makeWindow(2, 2, 6, 6), 1.0f},           // uniform
        {4, 5, 5, makeWindow(2, 2, 2, 2), 1.0f},             // no area
    };
    for (auto const& c : cases) {
        std::vector<unsigned char> px(size_t(c.side) * c.side);
        for (size_t i = 0; i < px.size(); ++i)
            px[i] = (i % 2) ? c.odd : c.even;
        px[0] = static_cast<unsigned char>(px[0] + (c.even == c.odd));
        IN_IMAGE in;
        ASSERT_TRUE(in.Init(c.side, c.side, c.side, px.data()));
        EXPECT_FLOAT_EQ(in.ComputeNorm(c.window), c.norm) << c.side << " " << int(c.odd);
    }
}

TEST(IntegralImageSampling, InterpolationIsLinearAndReadsNoNeighbourPastTheLastEntry)
{
    Pixels px(6, 5, 6, 6);
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(px.w, px.h, px.stride, px.v.data()));
    auto v = [&](int x, int y) { return double(in.valueAt(x, y)); };
    EXPECT_DOUBLE_EQ(in.interpolate(3, 2.25), v(3, 2) * 0.75 + v(3, 3) * 0.25);
    EXPECT_DOUBLE_EQ(in.interpolate(1.5, 1.5), (v(1, 1) + v(2, 1) + v(1, 2) + v(2, 2)) / 4);
    EXPECT_DOUBLE_EQ(in.interpolate(6.0004, 5.0002), v(6, 5));
}

TEST(IntegralImageCrop, OwnSizeCopiesSmallerSizesAverageAndOnlyTheImagePartIsRead)
{
    Pixels px(9, 7, 9, 8);
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(px.w, px.h, px.stride, px.v.data()));
    IMAGE copy;
    const DetectionWindow all = makeWindow(0, 0, 9, 7);
    in.CropScaleToImage(&copy, &all);
    ASSERT_EQ(copy.width, 9);
    ASSERT_EQ(copy.height, 7);
    for (int y = 0; y < 7; ++y)
        EXPECT_TRUE(std::equal(px.v.begin() + y * 9, px.v.begin() + y * 9 + 9, copy.data + y * copy.stride)) << y;

    // Left half 10, right half 30 and 50 on alternate rows; the lower right
    // quarter only of a window that reaches beyond the image.
    std::vector<unsigned char> halves(8 * 8);
    for (int i = 0; i < 64; ++i)
        halves[i] = static_cast<unsigned char>(i % 8 < 4 ? 10 : 30 + (i / 8 % 2) * 20);
    ASSERT_TRUE(in.Init(8, 8, 8, halves.data()));
    IMAGE small(2, 2, 2, nullptr), sized;
    const DetectionWindow square = makeWindow(0, 0, 8, 8), beyond = makeWindow(4, 4, 50, 50);
    const DetectionWindow outside = makeWindow(20, 20, 30, 30);
    in.CropScaleToImage(&small, &square);
    EXPECT_EQ(std::vector<int>({small.data[0], small.data[1], small.data[small.stride + 1]}),
              std::vector<int>({10, 40, 40}));
    in.CropScaleToImage(&small, &beyond);
    EXPECT_EQ(std::vector<int>({small.data[0], small.data[small.stride + 1]}), std::vector<int>({40, 40}));
    in.CropScaleToImage(&sized, &beyond);
    EXPECT_EQ(sized.width, 4);
    // Nothing of the window in the image: a blank target, no read outside.
    in.CropScaleToImage(&small, &outside);
    EXPECT_EQ(small.data[0], 0);
}
