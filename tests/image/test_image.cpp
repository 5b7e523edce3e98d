#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <numeric>
#include <random>
#include <vector>

#include "image/ColorImage.h"
#include "image/Image.h"

TEST(ImageAllocation, MemoryIsReusedWhenItFitsAndBadRequestsAreRefused)
{
    IMAGE img;
    ASSERT_TRUE(img.Realloc(10, 5));
    EXPECT_EQ(img.stride, 12); // rows rounded up to four bytes
    unsigned char* first = img.data;
    ASSERT_TRUE(img.Realloc(7, 6)); // 8 * 6 = 48 fits in 60
    EXPECT_EQ(img.data, first);
    EXPECT_FALSE(img.Realloc(-1, 4));
    EXPECT_FALSE(img.Realloc(1 << 20, 1 << 20));
    // Growing a borrowing image takes its own memory and leaves the caller's alone.
    std::vector<unsigned char> pixels(12, 7);
    IMAGE borrowing(4, 3, 4, pixels.data());
    ASSERT_TRUE(borrowing.Realloc(8, 8));
    EXPECT_NE(borrowing.data, pixels.data());
    EXPECT_EQ(pixels[0], 7);
    IMAGEC color;
    try {
        color.Realloc(-5, 3);
        FAIL() << "no throw";
    } catch (const char* text) {
        EXPECT_STREQ(text, "memory allocation failure");
    }
}

TEST(ImageChannels, InterleavedDataIsAveragedAndGrayDataBorrowed)
{
    const int w = 5, h = 2;
    std::vector<unsigned char> rgb(size_t(w) * 3 * h);
    for (size_t i = 0; i < rgb.size(); ++i)
        rgb[i] = static_cast<unsigned char>(i * 7);
    IMAGE gray(w, h, 3 * w, 3, rgb.data());
    for (int y = 0; y < h; ++y)
        for (int x = 0; x < w; ++x) {
            const unsigned char* p = &rgb[size_t(y) * 3 * w + 3 * x];
            EXPECT_EQ(gray.data[y * gray.stride + x], (p[0] + p[1] + p[2]) / 3) << x << "," << y;
        }
    // Four bytes per pixel, mean of the first three (alpha ignored).
    std::vector<unsigned char> rgba(size_t(w) * 4 * h, 0);
    std::memcpy(rgba.data(), "\x1e\x3c\x5a\xff", 4); // 30, 60, 90, 255
    EXPECT_EQ(IMAGE(w, h, 4 * w, 3, rgba.data()).data[0], 60);
    EXPECT_EQ(IMAGE(w, h, w, 3, rgb.data()).data, rgb.data());
    // Null data or no channels allocates; zero width divides by nothing.
    EXPECT_GT(IMAGE(6, 3, 18, 3, nullptr).capacity, 0);
    EXPECT_NE(IMAGE(6, 3, 6, 0, rgb.data()).data, rgb.data());
    EXPECT_EQ(IMAGE(0, 3, 6, 3, rgb.data()).width, 0);
}

TEST(ImageFillBox, WritesFromTheFirstByteAndNeverPastTheEnd)
{
    IMAGE img(8, 4, 8, nullptr);
    img.ZeroImage();
    img.FillBox(5, 7, 2, 3, 9); // whatever the position, from the first byte on
    EXPECT_EQ(std::vector<int>({img.data[0], img.data[2], img.data[3], img.data[2 * 8 + 5]}),
              std::vector<int>({9, 9, 0, 0}));
    img.FillBox(0, 1000, 0, 0, 4); // cut at the image's end
    EXPECT_EQ(img.data[31], 4);
    img.FillBox(0, 3, 3, 2, 1); // top below bottom: nothing
    EXPECT_EQ(img.data[0], 4);
}

TEST(ImageResize, NearestNeighbourPicksTruncatedSourcePositionsAndSumsThePixels)
{
    std::vector<unsigned char> px(4 * 4);
    std::iota(px.begin(), px.end(), 0);
    IMAGE src(4, 4, 4, px.data());
    IMAGE same(4, 4, 4, nullptr), half(2, 2, 2, nullptr), big(8, 8, 8, nullptr), none;
    EXPECT_EQ(resizeImage(src, same), 120.0f);
    EXPECT_EQ(std::vector<unsigned char>(same.data, same.data + 16), px);
    resizeImage(src, half);
    const unsigned char* row1 = half.data + half.stride;
    EXPECT_EQ(std::vector<int>({half.data[0], half.data[1], row1[0], row1[1]}), std::vector<int>({0, 2, 8, 10}));
    resizeImage(src, big);
    EXPECT_EQ(big.data[big.stride * 7 + 7], 15);
    EXPECT_EQ(big.data[big.stride * 3 + 2], 5);
    EXPECT_EQ(resizeImage(src, none), 0.0f);
    EXPECT_EQ(resizeImage(none, half), 0.0f);
}

TEST(ImagePreProc, ResultHasZeroMeanAndUnitDeviationOrIsZeroWhenUniform)
{
    std::mt19937 rng(11);
    for (int size : {24, 13}) {
        // Rows read through a stride of size + 3, whose padding is bright.
        const int stride = size + 3;
        std::vector<unsigned char> flat(size_t(stride) * size, 255), noisy(flat.size(), 255);
        for (int i = 0; i < size * size; ++i) {
            flat[size_t(i / size) * stride + i % size] = 77;
            noisy[size_t(i / size) * stride + i % size] = static_cast<unsigned char>(rng());
        }
        std::vector<float> out(size_t(size) * size, 5.0f);
        IMAGE(size, size, stride, flat.data()).PreProc4SVM(out.data());
        EXPECT_EQ(out, std::vector<float>(out.size(), 0.0f)) << size;
        IMAGE(size, size, stride, noisy.data()).PreProc4SVM(out.data());
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
