// Frame turning, shrinking and point turning of the entry points.

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <vector>

#include "support/ScriptedStages.h"
#include "api/FrameOps.h"

namespace {

using Frame = std::vector<unsigned char>;

// Where source pixel (x, y) of a W x H frame lands after a clean clockwise
// quarter turn (the result is H wide).
size_t clockwiseIndex(int x, int y, int H) { return static_cast<size_t>(x) * H + (H - 1 - y); }
// ... and after a clean counter-clockwise quarter turn.
size_t counterClockwiseIndex(int x, int y, int W, int H) { return static_cast<size_t>(W - 1 - x) * H + y; }

TEST(RotateFrame, QuarterTurnClockwiseMovesEveryPixelAndSwapsSizes) {
    const int W = 7, H = 5;
    Frame src = qtest::patternFrame(W, H), dst(W * H, 0);
    int w = W, h = H;
    ASSERT_TRUE(rotateFrame(dst.data(), src.data(), w, h, 90));
    EXPECT_EQ(w, H);
    EXPECT_EQ(h, W);
    for (int y = 0; y < H; ++y)
        for (int x = 0; x < W; ++x) EXPECT_EQ(dst[clockwiseIndex(x, y, H)], src[y * W + x]) << x << "," << y;
}

TEST(RotateFrame, HalfTurnReversesAndKeepsSizes) {
    const int W = 6, H = 4;
    Frame src = qtest::patternFrame(W, H), dst(W * H, 0);
    int w = W, h = H;
    ASSERT_TRUE(rotateFrame(dst.data(), src.data(), w, h, 180));
    EXPECT_EQ(w, W);
    EXPECT_EQ(h, H);
    for (int i = 0; i < W * H; ++i) EXPECT_EQ(dst[W * H - 1 - i], src[i]);
}

TEST(RotateFrame, ThreeQuarterTurnIsDisplacedByOneIndex) {
    const int W = 6, H = 4, n = W * H;
    Frame src = qtest::patternFrame(W, H), dst(n, 0xEE);
    int w = W, h = H;
    ASSERT_TRUE(rotateFrame(dst.data(), src.data(), w, h, 270));
    EXPECT_EQ(w, H);
    EXPECT_EQ(h, W);
    // The first source row gives only W-1 pixels, later rows are read one
    // pixel early, and everything lands one index below a clean turn.
    for (int x = 0; x < W - 1; ++x) EXPECT_EQ(dst[counterClockwiseIndex(x, 0, W, H) - 1], src[x]);
    for (int y = 1; y < H; ++y)
        for (int x = 0; x < W; ++x)
            EXPECT_EQ(dst[counterClockwiseIndex(x, y, W, H) - 1], src[y * W + x - 1]) << x << "," << y;
    EXPECT_EQ(dst[n - 1], 0xEE) << "the last destination byte is never written";
}

TEST(RotateFrame, RemaindersSelectTheTurn) {
    const int W = 5, H = 3;
    Frame src = qtest::patternFrame(W, H);
    Frame a(W * H), b(W * H);
    int w1 = W, h1 = H, w2 = W, h2 = H;
    ASSERT_TRUE(rotateFrame(a.data(), src.data(), w1, h1, 90));
    ASSERT_TRUE(rotateFrame(b.data(), src.data(), w2, h2, 450));
    EXPECT_EQ(a, b);
    Frame c(W * H, 0);
    int w3 = W, h3 = H;
    ASSERT_TRUE(rotateFrame(c.data(), src.data(), w3, h3, 360));
    EXPECT_EQ(c, src);
    for (int rotation : {45, -90, -270, 91}) {
        Frame d(W * H, 0x11);
        int w = W, h = H;
        EXPECT_FALSE(rotateFrame(d.data(), src.data(), w, h, rotation)) << rotation;
        EXPECT_EQ(w, W);
        EXPECT_EQ(h, H);
        EXPECT_EQ(d, Frame(W * H, 0x11));
    }
}

TEST(RotateFrame, RefusesFramesAboveTheBufferBoundAndEmptySizes) {
    // Exactly 320 x 320 is turned; one row more is not, and nothing is written.
    Frame src = qtest::patternFrame(320, 321), dst(320 * 321, 0);
    int w = 320, h = 320;
    EXPECT_TRUE(rotateFrame(dst.data(), src.data(), w, h, 180));
    std::fill(dst.begin(), dst.end(), 0);
    w = 320;
    h = 321;
    EXPECT_FALSE(rotateFrame(dst.data(), src.data(), w, h, 180));
    EXPECT_EQ(dst, Frame(dst.size(), 0));
    for (auto size : {std::make_pair(0, 10), std::make_pair(10, 0), std::make_pair(-4, 10), std::make_pair(-4, -4)}) {
        w = size.first;
        h = size.second;
        EXPECT_FALSE(rotateFrame(dst.data(), src.data(), w, h, 90));
    }
    // A product that would overflow 32 bits is refused, not wrapped.
    w = 65536;
    h = 65537;
    EXPECT_FALSE(rotateFrame(dst.data(), src.data(), w, h, 90));
}

TEST(ResizeNearest, PicksTheFlooredSourcePixel) {
    for (auto sizes : {std::vector<int>{1280, 960, 640, 480}, std::vector<int>{97, 61, 40, 13},
                       std::vector<int>{33, 1000, 1, 19}, std::vector<int>{50, 50, 50, 50}}) {
        const int W = sizes[0], H = sizes[1], w = sizes[2], h = sizes[3];
        Frame src = qtest::patternFrame(W, H), dst(static_cast<size_t>(w) * h + 1, 0xAB);
        ASSERT_TRUE(resizeNearest(src.data(), W, H, dst.data(), w, h));
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x) {
                const int64_t sx = static_cast<int64_t>(x) * W / w, sy = static_cast<int64_t>(y) * H / h;
                ASSERT_EQ(dst[static_cast<size_t>(y) * w + x], src[sy * W + sx]) << W << "x" << H << " " << x << "," << y;
            }
        EXPECT_EQ(dst.back(), 0xAB) << "nothing beyond w*h is written";
    }
}

TEST(ResizeNearest, RefusesEmptyOrGrowingTargets) {
    Frame src = qtest::patternFrame(10, 10), dst(400, 0);
    EXPECT_FALSE(resizeNearest(src.data(), 10, 10, dst.data(), 0, 5));
    EXPECT_FALSE(resizeNearest(src.data(), 10, 10, dst.data(), 5, 0));
    EXPECT_FALSE(resizeNearest(src.data(), 10, 10, dst.data(), 11, 5));
    EXPECT_FALSE(resizeNearest(src.data(), 10, 10, dst.data(), 5, 20));
    EXPECT_EQ(dst, Frame(400, 0));
}

TEST(RotatePoint, TurnsBackEachQuarter) {
    struct Case { int rotation, x, y; };
    for (Case c : {Case{0, 3, -7}, Case{90, -7, -3}, Case{180, -3, 7}, Case{270, 7, 3}, Case{450, -7, -3},
                   Case{45, 3, -7}, Case{-90, 3, -7}}) {
        int p[2] = {3, -7};
        rotatePoint(p, c.rotation);
        EXPECT_EQ(p[0], c.x) << c.rotation;
        EXPECT_EQ(p[1], c.y) << c.rotation;
    }
    int extreme[2] = {INT_MIN, 5};
    rotatePoint(extreme, 180);  // wraps, never undefined
    EXPECT_EQ(extreme[0], INT_MIN);
}

TEST(TruncateToInt, CutsTowardZeroAndSaturates) {
    EXPECT_EQ(truncateToInt(2.9f), 2);
    EXPECT_EQ(truncateToInt(-2.9f), -2);
    EXPECT_EQ(truncateToInt(1e30f), INT_MAX);
    EXPECT_EQ(truncateToInt(-1e30f), INT_MIN);
    EXPECT_EQ(truncateToInt(std::nanf("")), 0);
    EXPECT_EQ(truncateToInt(INFINITY), INT_MAX);
}

}  // namespace
