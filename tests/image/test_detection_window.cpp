#include <gtest/gtest.h>

#include "support/TrackSupport.h"
#include "image/DetectionWindow.h"
#include "image/ScoredWindow.h"

TEST(DetectionWindowOverlap, IsIntersectionOverUnion)
{
    const DetectionWindow a = makeWindow(0, 0, 10, 10);
    EXPECT_FLOAT_EQ(a.Overlap(a), 1.0f);
    EXPECT_FLOAT_EQ(a.Overlap(makeWindow(5, 0, 15, 10)), 50.0f / 150.0f);
    EXPECT_FLOAT_EQ(makeWindow(5, 0, 15, 10).Overlap(a), 50.0f / 150.0f);
    // Contained window: intersection is the small one.
    EXPECT_FLOAT_EQ(a.Overlap(makeWindow(2, 2, 4, 4)), 4.0f / 100.0f);
}

TEST(DetectionWindowOverlap, TouchingOrApartWindowsGiveZero)
{
    const DetectionWindow a = makeWindow(0, 0, 10, 10);
    EXPECT_EQ(a.Overlap(makeWindow(10, 0, 20, 10)), 0.0f);
    EXPECT_EQ(a.Overlap(makeWindow(0, 10, 10, 20)), 0.0f);
    EXPECT_EQ(a.Overlap(makeWindow(30, 30, 40, 40)), 0.0f);
    EXPECT_EQ(a.Overlap(makeWindow(3, 3, 3, 3)), 0.0f);
}

TEST(ScoredWindowDefaults, StartsDeadWithClearedCategories)
{
    ScoredWindow w;
    EXPECT_EQ(w.score, -20.0f);
    for (float c : w.categoryScores)
        EXPECT_EQ(c, 0.0f);
}
