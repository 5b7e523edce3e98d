#include <gtest/gtest.h>

#include <vector>

#include "detector/WindowFeature.h"

namespace {

struct Pool {
    WindowFeature* features = nullptr;
    int count = -1;
    Pool(int w, int h, int minW, int minH, float shift, float grow)
    {
        features = WindowFeature::generateFeaturePool(w, h, minW, minH, shift, grow, &count);
    }
    ~Pool() { WindowFeature::destroyFeaturePool(features); }
};

} // namespace

TEST(FeaturePoolCounts, FullPoolOfTheBaseWindowCountsEveryFamily)
{
    Pool pool(24, 24, 1, 1, 0.0f, 1.0f);
    ASSERT_NE(pool.features, nullptr);
    // Every size and position: per family the number of placements of its
    // cell grid, times its features per position.
    auto place = [](int span, int cells) {
        int n = 0;
        for (int a = 1; a * cells <= span; ++a)
            n += span - cells * a + 1;
        return n;
    };
    const int f1 = place(24, 2) * place(24, 1), f2 = place(24, 1) * place(24, 2);
    const int f3 = place(24, 3) * place(24, 1), f4 = place(24, 1) * place(24, 3);
    const int f5 = place(24, 2) * place(24, 2), f6 = place(24, 3) * place(24, 3);
    EXPECT_EQ(pool.count, 1 + f1 + f2 + 2 * f3 + 2 * f4 + 7 * f5 + 2 * f6);
}

TEST(FeaturePoolShapes, FirstIsTheDeviationFeatureAndTheRestStayInsideTheWindow)
{
    Pool pool(20, 16, 2, 2, 0.25f, 1.25f);
    ASSERT_GT(pool.count, 1);
    EXPECT_EQ(pool.features[0].kind, WindowFeature::DEVIATION);
    for (int i = 1; i < pool.count; ++i) {
        WindowFeature const& f = pool.features[i];
        ASSERT_EQ(f.kind, WindowFeature::HAAR);
        ASSERT_TRUE(f.haar->count == 2 || f.haar->count == 4);
        for (int r = 0; r < f.haar->count; ++r) {
            HaarRect const& rect = f.haar->rects[r];
            ASSERT_TRUE(0 <= rect.left && rect.left < rect.right && rect.right <= 20) << i;
            ASSERT_TRUE(0 <= rect.top && rect.top < rect.bottom && rect.bottom <= 16) << i;
        }
    }
}

TEST(FeaturePoolShapes, TwoByTwoFamilyCarriesItsSevenWeightings)
{
    // The smallest window that holds one 2 x 2 grid of 1-pixel cells and
    // nothing of the three-cell families.
    Pool pool(2, 2, 1, 1, 0.0f, 1.0f);
    // Family 1: 1 x 1 cells at two heights plus 1 x 2 cells once (3), family 2
    // likewise (3), family 5: one position, seven features.
    ASSERT_EQ(pool.count, 1 + 3 + 3 + 7);
    WindowFeature const* f5 = pool.features + pool.count - 7;
    auto weights = [](WindowFeature const& f) {
        std::vector<float> w;
        for (int r = 0; r < f.haar->count; ++r)
            w.push_back(f.haar->rects[r].weight);
        return w;
    };
    EXPECT_EQ(weights(f5[0]), (std::vector<float>{1, -1}));
    EXPECT_EQ(weights(f5[2]), (std::vector<float>{1, -0.25f})); // means of a 1-pixel cell and of all four
    EXPECT_EQ(weights(f5[3]), (std::vector<float>{4, -1}));
    EXPECT_EQ(weights(f5[6]), (std::vector<float>{1, -1, -1, 1}));
}

TEST(FeaturePoolLimits, DegenerateArgumentsNeitherLoopNorCrash)
{
    Pool none(0, 0, 1, 1, 0.5f, 1.2f);
    EXPECT_EQ(none.count, 1);
    Pool zeroMin(6, 6, 0, -3, 0.0f, 0.0f); // cells start at one pixel
    EXPECT_GT(zeroMin.count, 1);
    int count = -7;
    EXPECT_EQ(WindowFeature::generateFeaturePool(100000, 100000, 1, 1, 0.0f, 1.0f, &count), nullptr);
    EXPECT_EQ(count, -7);
    WindowFeature::destroyFeaturePool(nullptr);
}
