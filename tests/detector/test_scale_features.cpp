#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <vector>

#include "detector/HaarFeature.h"
#include "detector/ScaleFeatures.h"
#include "detector/WindowFeature.h"
#include "image/IntegralImage.h"

namespace {

// A feature of `kind`; for HAAR, `count` random rectangles inside a
// size x size window with random weights (fractions included, so that the
// accumulation order shows in the last bit).
WindowFeature randomFeature(int kind, int count, int size, int stride, std::mt19937& rng)
{
    WindowFeature f;
    f.kind = kind;
    if (kind != WindowFeature::HAAR)
        return f;
    f.haar = new HaarFeature();
    f.haar->Init(count);
    std::uniform_real_distribution<float> weight(-9.0f, 9.0f);
    for (int i = 0; i < count; ++i) {
        HaarRect& r = f.haar->rects[i];
        r = HaarRect();
        r.left = static_cast<int>(rng() % (size - 1));
        r.top = static_cast<int>(rng() % (size - 1));
        r.right = r.left + 1 + static_cast<int>(rng() % (size - r.left - 1));
        r.bottom = r.top + 1 + static_cast<int>(rng() % (size - r.top - 1));
        r.weight = weight(rng) / 7.0f;
    }
    f.prepareOffsets(stride);
    return f;
}

bool sameBits(float a, float b)
{
    return std::memcmp(&a, &b, sizeof a) == 0;
}

TEST(ScaleFeatures, WalkGivesTheFeaturesOwnValuesBitForBit)
{
    // Rectangle counts around the straight-line cases 2 and 4, the
    // deviation feature, an empty one and a kind no model should carry.
    struct Case {
        int kind;
        int count;
    };
    const Case chain[] = {{1, 2}, {1, 4}, {1, 1}, {2, 0}, {1, 3}, {0, 0}, {1, 5}, {7, 0}, {1, 0}, {1, 2}};
    for (const int width : {40, 97, 320}) {
        SCOPED_TRACE(width);
        std::mt19937 rng(static_cast<unsigned>(width));
        std::vector<unsigned char> pixels(static_cast<size_t>(width) * 60);
        for (unsigned char& p : pixels)
            p = static_cast<unsigned char>(rng());
        IN_IMAGE image;
        ASSERT_TRUE(image.Init(width, 60, width, pixels.data()));

        // The chain as common stages, and again split into two branches.
        std::vector<WindowFeature> common;
        std::vector<std::vector<WindowFeature>> branches(2);
        for (const Case& c : chain)
            common.push_back(randomFeature(c.kind, c.count, 36, image.stride, rng));
        for (const Case& c : chain)
            branches[branches[0].size() < 4 ? 0 : 1].push_back(randomFeature(c.kind, c.count, 36, image.stride, rng));

        ScaleFeatures laidOut;
        ASSERT_TRUE(laidOut.build(common, branches, image.stride));
        EXPECT_EQ(laidOut.stride(), image.stride);
        for (const int x : {0, 1, width - 37})
            for (const int y : {0, 3, 60 - 37}) {
                const int offset = x + image.stride * y;
                const float deviation = 1.0f / 3.0f;
                ScaleFeatures::Cursor cursor = laidOut.common();
                for (size_t i = 0; i < common.size(); ++i, cursor.next())
                    EXPECT_TRUE(sameBits(cursor.value(image.data + offset, deviation),
                                         common[i].Eval(image, deviation, offset)))
                        << "common feature " << i << " at " << x << "," << y;
                for (size_t b = 0; b < branches.size(); ++b) {
                    ScaleFeatures::Cursor walk = laidOut.branch(static_cast<int>(b));
                    for (size_t j = 0; j < branches[b].size(); ++j, walk.next())
                        EXPECT_TRUE(sameBits(walk.value(image.data + offset, deviation),
                                             branches[b][j].Eval(image, deviation, offset)))
                            << "branch " << b << " feature " << j;
                }
            }
    }
}

TEST(ScaleFeatures, HaarFeatureWithoutRectanglesCountsZero)
{
    // A feature whose rectangles could not be allocated is laid out empty
    // rather than followed into a null array.
    std::vector<WindowFeature> common(1);
    common[0].kind = WindowFeature::HAAR;
    common[0].haar = new HaarFeature();
    common[0].haar->count = 3; // rects stays null
    ScaleFeatures laidOut;
    ASSERT_TRUE(laidOut.build(common, {}, 30));
    const uint32_t integral[4] = {1, 2, 3, 4};
    EXPECT_EQ(laidOut.common().value(integral, 0.5f), 0.0f);
}

} // namespace
