#include <gtest/gtest.h>

#include <numeric>
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
    // Gray data given as three channels is borrowed, not averaged; zero width divides by nothing.
    EXPECT_EQ(IMAGE(4, 3, 4, 3, pixels.data()).data, pixels.data());
    EXPECT_EQ(IMAGE(0, 3, 6, 3, pixels.data()).width, 0);
    IMAGEC color;
    try {
        color.Realloc(-5, 3);
        FAIL() << "no throw";
    } catch (const char* text) {
        EXPECT_STREQ(text, "memory allocation failure");
    }
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

TEST(ImageResize, NearestNeighbourCopiesAtEqualSizesAndEmptyImagesGiveNothing)
{
    std::vector<unsigned char> px(4 * 4);
    std::iota(px.begin(), px.end(), 0);
    IMAGE src(4, 4, 4, px.data()), same(4, 4, 4, nullptr), half(2, 2, 2, nullptr), none;
    EXPECT_EQ(resizeImage(src, same), 120.0f); // the sum of the pixels
    EXPECT_EQ(std::vector<unsigned char>(same.data, same.data + 16), px);
    resizeImage(src, half);
    EXPECT_EQ(std::vector<int>({half.data[0], half.data[1], half.data[half.stride]}), std::vector<int>({0, 2, 8}));
    EXPECT_EQ(resizeImage(src, none), 0.0f);
    EXPECT_EQ(resizeImage(none, half), 0.0f);
}

TEST(ImagePreProc, UniformPixelsGiveZerosReadThroughTheStride)
{
    // 77 in rows of 13 bytes, the padding bright: any padding read shows.
    std::vector<unsigned char> flat(13 * 10, 255);
    for (int i = 0; i < 100; ++i)
        flat[size_t(i / 10) * 13 + i % 10] = 77;
    std::vector<float> out(100, 5.0f);
    IMAGE(10, 10, 13, flat.data()).PreProc4SVM(out.data());
    EXPECT_EQ(out, std::vector<float>(100, 0.0f));
}
