#include <gtest/gtest.h>

#include "image/DetectionWindow.h"
#include "support/TrackSupport.h"

TEST(DetectionWindowOverlap, IsIntersectionOverUnionAndZeroForWindowsThatOnlyTouch)
{
    const DetectionWindow a = makeWindow(0, 0, 10, 10);
    const std::pair<DetectionWindow, float> cases[] = {
        {a, 1.0f},
        {makeWindow(5, 0, 15, 10), 50.0f / 150.0f},
        {makeWindow(2, 2, 4, 4), 4.0f / 100.0f}, // contained: the intersection is the small one
        {makeWindow(10, 0, 20, 10), 0.0f},
        {makeWindow(0, 10, 10, 20), 0.0f},
        {makeWindow(30, 30, 40, 40), 0.0f},
        {makeWindow(3, 3, 3, 3), 0.0f},
    };
    for (auto const& [b, overlap] : cases) {
        EXPECT_FLOAT_EQ(a.Overlap(b), overlap) << b.left << "," << b.top << "," << b.right << "," << b.bottom;
        EXPECT_FLOAT_EQ(b.Overlap(a), overlap);
    }
}
