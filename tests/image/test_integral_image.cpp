#include <gtest/gtest.h>

#include <cmath>
#include <random>
#include <vector>

#include "support/TrackSupport.h"
#include "image/Image.h"
#include "image/IntegralImage.h"

namespace {

struct Pixels {
    int w, h, stride;
    std::vector<unsigned char> v;
    Pixels(int width, int height, int s, unsigned seed) : w(width), h(height), stride(s), v(size_t(s) * height, 0)
    {
        std::mt19937 rng(seed);
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x)
                v[size_t(y) * s + x] = static_cast<unsigned char>(rng() & 0xFF);
    }
    unsigned at(int x, int y) const { return v[size_t(y) * stride + x]; }
    uint64_t boxSum(int l, int t, int r, int b, bool squared = false) const
    {
        uint64_t s = 0;
        for (int y = t; y < b; ++y)
            for (int x = l; x < r; ++x)
                s += squared ? uint64_t(at(x, y)) * at(x, y) : at(x, y);
        return s;
    }
};

} // namespace

TEST(IntegralImageBuild, EntriesAreSumsAboveAndLeftWithAZeroBorder)
{
    Pixels px(13, 7, 16, 1); // stride wider than the width: padding ignored
    for (int i = 0; i < 16 * 7; ++i)
        if (i % 16 >= 13)
            px.v[i] = 255;
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(px.w, px.h, px.stride, px.v.data()));
    EXPECT_EQ(in.stride, 14);
    EXPECT_EQ(in.rows, 8);
    for (int y = 0; y <= px.h; ++y)
        for (int x = 0; x <= px.w; ++x) {
            ASSERT_EQ(in.valueAt(x, y), px.boxSum(0, 0, x, y)) << x << "," << y;
            ASSERT_EQ(in.squaredValueAt(x, y), px.boxSum(0, 0, x, y, true)) << x << "," << y;
        }
    I_IMAGE plain;
    IMAGE img(px.w, px.h, px.stride, px.v.data());
    ASSERT_TRUE(plain.Init(&img));
    EXPECT_EQ(plain.valueAt(13, 7), in.valueAt(13, 7));
}

TEST(IntegralImageBuild, ReinitAtAnotherSizeReallocatesAndRefills)
{
    IN_IMAGE in(4, 4);
    Pixels small(4, 4, 4, 2), big(40, 30, 40, 3);
    ASSERT_TRUE(in.Init(small.w, small.h, small.stride, small.v.data()));
    ASSERT_TRUE(in.Init(big.w, big.h, big.stride, big.v.data()));
    EXPECT_EQ(in.valueAt(40, 30), big.boxSum(0, 0, 40, 30));
    ASSERT_TRUE(in.Init(small.w, small.h, small.stride, small.v.data()));
    EXPECT_EQ(in.stride, 5);
    EXPECT_EQ(in.valueAt(4, 4), small.boxSum(0, 0, 4, 4));
}

TEST(IntegralImageBuild, RejectsInconsistentFramesAndImpossibleSizes)
{
    IN_IMAGE in;
    Pixels px(8, 8, 8, 4);
    EXPECT_FALSE(in.Init(8, 8, 4, px.v.data())); // stride below width
    EXPECT_FALSE(in.Init(8, 8, 8, nullptr));
    EXPECT_FALSE(in.Init(-1, 8, 8, px.v.data()));
    I_IMAGE plain;
    EXPECT_FALSE(plain.Init(8, 8, 4, px.v.data()));
    EXPECT_FALSE(plain.Realloc(-3, 2));
    try {
        IN_IMAGE huge(1 << 20, 1 << 20);
        FAIL() << "no throw";
    } catch (const char* text) {
        EXPECT_STREQ(text, "memory allocation failure");
    }
}

TEST(IntegralImageStatistics, AverageOfAnyWindowMatchesThePixels)
{
    Pixels px(20, 15, 20, 5);
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(px.w, px.h, px.stride, px.v.data()));
    for (auto w : {makeWindow(0, 0, 20, 15), makeWindow(3, 4, 9, 14), makeWindow(19, 14, 20, 15)}) {
        const double expected = double(px.boxSum(w.left, w.top, w.right, w.bottom)) / (w.width() * w.height());
        EXPECT_FLOAT_EQ(in.ComputeAvg(w), float(expected));
        EXPECT_FLOAT_EQ(in.ComputeAvg(w.left, w.top, w.right, w.bottom), float(expected));
    }
}

TEST(IntegralImageStatistics, NormIsInverseDeviationOfTheIntegerVarianceCappedAtOne)
{
    auto norm = [](int side, unsigned char even, unsigned char odd, DetectionWindow const& w) {
        std::vector<unsigned char> px(size_t(side) * side);
        for (size_t i = 0; i < px.size(); ++i)
            px[i] = (i % 2) ? odd : even;
        px[0] = static_cast<unsigned char>(px[0] + (even == odd)); // a uniform image gets one brighter pixel
        IN_IMAGE in;
        EXPECT_TRUE(in.Init(side, side, side, px.data()));
        return in.ComputeNorm(w);
    };
    EXPECT_FLOAT_EQ(norm(8, 0, 200, makeWindow(0, 0, 8, 8)), 0.01f);            // deviation 100
    EXPECT_FLOAT_EQ(norm(4, 0, 3, makeWindow(0, 0, 4, 4)), 1 / std::sqrt(2.0f)); // variance 2.25 read as 2
    EXPECT_EQ(norm(8, 90, 90, makeWindow(0, 0, 8, 8)), 1.0f);                    // variance 63/4096
    EXPECT_EQ(norm(8, 90, 90, makeWindow(2, 2, 6, 6)), 1.0f);                    // uniform
    EXPECT_EQ(norm(4, 5, 5, makeWindow(2, 2, 2, 2)), 1.0f);                      // no area
}

TEST(IntegralImageSampling, InterpolateIsExactOnCornersAndLinearBetween)
{
    Pixels px(6, 5, 6, 6);
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(px.w, px.h, px.stride, px.v.data()));
    EXPECT_DOUBLE_EQ(in.interpolate(3, 2), in.valueAt(3, 2));
    EXPECT_DOUBLE_EQ(in.interpolate(3.5, 2), (in.valueAt(3, 2) + double(in.valueAt(4, 2))) / 2);
    EXPECT_DOUBLE_EQ(in.interpolate(3, 2.25), in.valueAt(3, 2) * 0.75 + in.valueAt(3, 3) * 0.25);
    const double bilinear = (in.valueAt(1, 1) + double(in.valueAt(2, 1)) + in.valueAt(1, 2) + in.valueAt(2, 2)) / 4;
    EXPECT_DOUBLE_EQ(in.interpolate(1.5, 1.5), bilinear);
    // On the last row and column there is no neighbour to read.
    EXPECT_DOUBLE_EQ(in.interpolate(6, 5), in.valueAt(6, 5));
    EXPECT_DOUBLE_EQ(in.interpolate(6.0004, 5.0002), in.valueAt(6, 5));
}

TEST(IntegralImageSampling, ResampleAtScaleOneCopiesTheRegion)
{
    Pixels px(30, 20, 30, 7);
    IN_IMAGE src;
    ASSERT_TRUE(src.Init(px.w, px.h, px.stride, px.v.data()));
    I_IMAGE part(10, 8);
    part.resampleFrom(&src, 5, 4, 1.0f);
    for (int y = 0; y < part.rows; ++y)
        for (int x = 0; x < part.stride; ++x)
            ASSERT_EQ(part.valueAt(x, y), src.valueAt(5 + x, 4 + y));
    I_IMAGE halved(10, 8);
    halved.resampleFrom(&src, 0, 0, 2.0f);
    EXPECT_EQ(halved.valueAt(3, 2), src.valueAt(6, 4));
    // Samples beyond the source are held at its edge.
    halved.resampleFrom(&src, 25, 15, 2.0f);
    EXPECT_EQ(halved.valueAt(10, 8), src.valueAt(30, 20));
}

TEST(IntegralImageCrop, WholeImageAtOwnSizeReproducesThePixels)
{
    Pixels px(9, 7, 9, 8);
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(px.w, px.h, px.stride, px.v.data()));
    IMAGE target;
    const DetectionWindow all = makeWindow(0, 0, 9, 7);
    in.CropScaleToImage(&target, &all);
    ASSERT_EQ(target.width, 9);
    ASSERT_EQ(target.height, 7);
    EXPECT_EQ(target.stride, 12);
    for (int y = 0; y < 7; ++y)
        for (int x = 0; x < 9; ++x)
            ASSERT_EQ(target.data[y * target.stride + x], px.at(x, y)) << x << "," << y;
}

TEST(IntegralImageCrop, DownscalingAveragesBoxes)
{
    std::vector<unsigned char> px(8 * 8);
    for (int y = 0; y < 8; ++y)
        for (int x = 0; x < 8; ++x)
            px[y * 8 + x] = static_cast<unsigned char>(x < 4 ? 10 : 30 + (y % 2) * 20);
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(8, 8, 8, px.data()));
    IMAGE target(2, 2, 2, nullptr);
    const DetectionWindow all = makeWindow(0, 0, 8, 8);
    in.CropScaleToImage(&target, &all);
    EXPECT_EQ(target.width, 2); // keeps its size
    EXPECT_EQ(target.data[0], 10);
    EXPECT_EQ(target.data[1], 40);
    EXPECT_EQ(target.data[target.stride + 1], 40);
}

TEST(IntegralImageCrop, WindowBeyondTheImageUsesTheClippedPart)
{
    std::vector<unsigned char> px(10 * 10, 0);
    for (int y = 5; y < 10; ++y)
        for (int x = 5; x < 10; ++x)
            px[y * 10 + x] = 100;
    IN_IMAGE in;
    ASSERT_TRUE(in.Init(10, 10, 10, px.data()));
    IMAGE target(4, 4, 4, nullptr);
    const DetectionWindow beyond = makeWindow(5, 5, 50, 50);
    in.CropScaleToImage(&target, &beyond);
    for (int y = 0; y < 4; ++y)
        for (int x = 0; x < 4; ++x)
            EXPECT_EQ(target.data[y * target.stride + x], 100);

    IMAGE sized;
    in.CropScaleToImage(&sized, &beyond);
    EXPECT_EQ(sized.width, 5);
    EXPECT_EQ(sized.stride, 8);

    // Nothing of the window in the image: a blank target, no read outside.
    const DetectionWindow outside = makeWindow(20, 20, 30, 30);
    in.CropScaleToImage(&target, &outside);
    EXPECT_EQ(target.data[0], 0);
}
