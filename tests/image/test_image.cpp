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
