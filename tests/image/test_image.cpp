#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <numeric>
#include <random>
#include <vector>

#include "image/ColorImage.h"
#include "image/Image.h"

namespace {

std::vector<unsigned char> randomPixels(size_t n, unsigned seed)
{
    std::mt19937 rng(seed);
    std::vector<unsigned char> v(n);
    for (auto& p : v)
        p = static_cast<unsigned char>(rng() & 0xFF);
    return v;
}

} // namespace

TEST(ImageAllocation, StrideRoundsUpToFourAndMemoryIsReusedWhenItFits)
{
    IMAGE img;
    ASSERT_TRUE(img.Realloc(10, 5));
    EXPECT_EQ(img.stride, 12);
    EXPECT_EQ(img.capacity, 60);
    unsigned char* first = img.data;
    ASSERT_TRUE(img.Realloc(7, 6)); // 8 * 6 = 48 fits in 60
    EXPECT_EQ(img.data, first);
    EXPECT_EQ(img.capacity, 60);
    EXPECT_EQ(img.stride, 8);
    ASSERT_TRUE(img.Realloc(20, 20));
    EXPECT_EQ(img.capacity, 400);
}

TEST(ImageAllocation, RefusesBadRequestsAndLeavesBorrowedPixelsWithTheCaller)
{
    std::vector<unsigned char> pixels(12, 7);
    IMAGE img(4, 3, 4, pixels.data());
    EXPECT_EQ(img.capacity, 0);
    img.Release();
    EXPECT_EQ(img.data, pixels.data());
    EXPECT_EQ(img.width, 0);
    EXPECT_FALSE(img.Realloc(-1, 4));
    EXPECT_FALSE(img.Realloc(1 << 20, 1 << 20));
    EXPECT_EQ(img.capacity, 0);
    // Growing a borrowing image takes its own memory and leaves the caller's alone.
    ASSERT_TRUE(img.Realloc(8, 8));
    EXPECT_NE(img.data, pixels.data());
    EXPECT_EQ(pixels[0], 7);
}

TEST(ImageChannels, InterleavedDataIsAveragedAndGrayDataBorrowed)
{
    const int w = 5, h = 2;
    std::vector<unsigned char> rgb(size_t(w) * 3 * h);
    for (size_t i = 0; i < rgb.size(); ++i)
        rgb[i] = static_cast<unsigned char>(i * 7);
    IMAGE gray(w, h, 3 * w, 3, rgb.data());
    ASSERT_GT(gray.capacity, 0);
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            const unsigned char* p = &rgb[size_t(y) * 3 * w + 3 * x];
            EXPECT_EQ(gray.data[y * gray.stride + x], (p[0] + p[1] + p[2]) / 3) << x << "," << y;
        }

    // Four bytes per pixel, mean of the first three (alpha ignored).
    std::vector<unsigned char> rgba(size_t(w) * 4 * h, 0);
    for (int x = 0; x < w; ++x)
        std::memcpy(&rgba[4 * x], "\x1e\x3c\x5a\xff", 4); // 30, 60, 90, 255
    IMAGE fromRgba(w, h, 4 * w, 3, rgba.data());
    EXPECT_EQ(fromRgba.data[0], 60);

    IMAGE borrowed(w, h, w, 3, rgb.data());
    EXPECT_EQ(borrowed.capacity, 0);
    EXPECT_EQ(borrowed.data, rgb.data());
}

TEST(ImageChannels, NullDataOrNoChannelsAllocates)
{
    IMAGE a(6, 3, 18, 3, nullptr);
    EXPECT_GT(a.capacity, 0);
    EXPECT_EQ(a.stride, 8);
    std::vector<unsigned char> px(18);
    IMAGE b(6, 3, 6, 0, px.data());
    EXPECT_NE(b.data, px.data());
    IMAGE c(0, 3, 6, 3, px.data()); // zero width: no division by it
    EXPECT_EQ(c.width, 0);
}

TEST(ImageFillBox, WritesFromTheFirstByteWhateverThePosition)
{
    IMAGE img(8, 4, 8, nullptr);
    img.ZeroImage();
    img.FillBox(5, 7, 2, 3, 9);
    EXPECT_EQ(img.data[0], 9);
    EXPECT_EQ(img.data[2], 9);
    EXPECT_EQ(img.data[3], 0);
    EXPECT_EQ(img.data[2 * 8 + 5], 0);
    // A box longer than the image is cut at its end, not written past it.
    img.FillBox(0, 1000, 0, 0, 4);
    EXPECT_EQ(img.data[31], 4);
    img.FillBox(0, 3, 3, 2, 1); // top below bottom: nothing
    EXPECT_EQ(img.data[0], 4);
}

TEST(ImageResize, EqualSizesCopyAndTheSumCountsEveryPixel)
{
    auto px = randomPixels(12 * 9, 3);
    IMAGE src(12, 9, 12, px.data());
    IMAGE dst(12, 9, 12, nullptr);
    const float sum = resizeImage(src, dst);
    float expected = 0;
    for (int y = 0; y < 9; ++y)
        for (int x = 0; x < 12; ++x) {
            EXPECT_EQ(dst.data[y * dst.stride + x], px[y * 12 + x]);
            expected += px[y * 12 + x];
        }
    EXPECT_FLOAT_EQ(sum, expected);
}

TEST(ImageResize, NearestNeighbourPicksTruncatedSourcePositions)
{
    std::vector<unsigned char> px(4 * 4);
    std::iota(px.begin(), px.end(), 0);
    IMAGE src(4, 4, 4, px.data());
    IMAGE half(2, 2, 2, nullptr);
    resizeImage(src, half);
    EXPECT_EQ(half.data[0], 0);
    EXPECT_EQ(half.data[1], 2);
    EXPECT_EQ(half.data[half.stride], 8);
    EXPECT_EQ(half.data[half.stride + 1], 10);
    IMAGE big(8, 8, 8, nullptr);
    resizeImage(src, big);
    EXPECT_EQ(big.data[big.stride * 7 + 7], 15);
    EXPECT_EQ(big.data[big.stride * 3 + 2], 5);
    IMAGE none;
    EXPECT_EQ(resizeImage(src, none), 0.0f);
    IMAGE empty;
    EXPECT_EQ(resizeImage(empty, half), 0.0f);
}

TEST(ImagePreProc, ResultHasZeroMeanAndUnitDeviationOrIsZeroWhenUniform)
{
    for (int size : {24, 13}) {
        std::vector<unsigned char> flat(size_t(size) * size, 77);
        std::vector<float> out(flat.size(), 5.0f);
        IMAGE(size, size, size, flat.data()).PreProc4SVM(out.data());
        for (float v : out)
            ASSERT_EQ(v, 0.0f) << size;

        auto px = randomPixels(size_t(size) * size, 11);
        IMAGE(size, size, size, px.data()).PreProc4SVM(out.data());
        double sum = 0, sq = 0;
        for (float v : out) {
            sum += v;
            sq += double(v) * v;
        }
        const double n = out.size();
        EXPECT_NEAR(sum / n, 0.0, 1e-4);
        EXPECT_NEAR(std::sqrt(sq / n - (sum / n) * (sum / n)), 1.0, 1e-3);
    }
}

TEST(ImagePreProc, PlaneIsRemovedOnlyAt24By24)
{
    // A noisy horizontal ramp: at 24 x 24 the least-squares plane is taken
    // out, so what is left has no correlation with the column; elsewhere the
    // ramp stays.
    auto rampCorrelation = [](int size) {
        std::mt19937 rng(5);
        std::vector<unsigned char> px(size_t(size) * size);
        for (int y = 0; y < size; ++y)
            for (int x = 0; x < size; ++x)
                px[size_t(y) * size + x] = static_cast<unsigned char>(x * 8 + (rng() % 40));
        IMAGE img(size, size, size, px.data());
        std::vector<float> out(px.size());
        img.PreProc4SVM(out.data());
        double c = 0;
        for (int y = 0; y < size; ++y)
            for (int x = 0; x < size; ++x)
                c += out[size_t(y) * size + x] * (x - (size - 1) / 2.0);
        return c / (double(size) * size);
    };
    EXPECT_NEAR(rampCorrelation(24), 0.0, 1e-3);
    EXPECT_GT(rampCorrelation(20), 3.0);
}

TEST(ImagePreProc, RowsAreReadThroughTheStride)
{
    std::vector<unsigned char> padded(8 * 4, 255); // padding bytes are bright
    for (int y = 0; y < 4; ++y)
        for (int x = 0; x < 4; ++x)
            padded[y * 8 + x] = static_cast<unsigned char>(x + 4 * y);
    std::vector<unsigned char> tight(16);
    std::iota(tight.begin(), tight.end(), 0);
    IMAGE a(4, 4, 8, padded.data());
    IMAGE b(4, 4, 4, tight.data());
    std::vector<float> oa(16), ob(16);
    a.PreProc4SVM(oa.data());
    b.PreProc4SVM(ob.data());
    EXPECT_EQ(oa, ob);
}

TEST(ColorImage, StrideFollowsTheWidthHeldBeforeTheCall)
{
    IMAGEC img(10, 2, IMAGEC::COLORSPACE_RGB, 32, nullptr);
    // Built from no width: the first row length comes from width 0.
    EXPECT_EQ(img.stride, 0);
    EXPECT_EQ(img.width, 10);
    img.Realloc(4, 2);
    EXPECT_EQ(img.stride, (3 * 11 / 4) * 4);
    EXPECT_EQ(img.width, 4);
    EXPECT_EQ(img.colorspace, IMAGEC::COLORSPACE_RGB);
    std::vector<unsigned char> px(60);
    IMAGEC borrowed(4, 5, IMAGEC::COLORSPACE_BGR, 12, px.data());
    EXPECT_EQ(borrowed.data, px.data());
    EXPECT_EQ(borrowed.capacity, 0);
}

TEST(ColorImage, ImpossibleSizeThrowsTheAllocationText)
{
    IMAGEC img;
    try {
        img.Realloc(-5, 3);
        FAIL() << "no throw";
    } catch (const char* text) {
        EXPECT_STREQ(text, "memory allocation failure");
    }
}
