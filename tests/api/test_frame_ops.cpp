// Frame turning and shrinking of the entry points.

#include <gtest/gtest.h>

#include <utility>
#include <vector>

#include "api/FrameOps.h"
#include "support/ScriptedStages.h"

namespace {

using Frame = std::vector<unsigned char>;

TEST(RotateFrame, TurnsMovePixelsWhereTheHostExpectsThem) {
    const int W = 7, H = 5, n = W * H;
    const Frame src = qtest::patternFrame(W, H);
    for (int rotation : {90, 180, 270}) {
        Frame dst(n, 0xEE);
        int w = W, h = H;
        ASSERT_TRUE(rotateFrame(dst.data(), src.data(), w, h, rotation));
        EXPECT_EQ(std::make_pair(w, h), rotation == 180 ? std::make_pair(W, H) : std::make_pair(H, W));
        for (int y = 0; y < H; ++y)
            for (int x = 0; x < W; ++x) {
                const unsigned char pixel = src[y * W + x];
                if (rotation == 90) {
                    EXPECT_EQ(dst[x * H + (H - 1 - y)], pixel);  // clockwise
                } else if (rotation == 180) {
                    EXPECT_EQ(dst[n - 1 - (y * W + x)], pixel);
                } else if (y > 0 || x < W - 1) {
                    // 270 lands one index below a clean counter-clockwise turn
                    // and reads one pixel early from the second source row on.
                    EXPECT_EQ(dst[(W - 1 - x) * H + y - 1], y == 0 ? pixel : src[y * W + x - 1]) << x << "," << y;
                }
            }
        if (rotation == 270) {
            EXPECT_EQ(dst[n - 1], 0xEE) << "the last byte is never written";
        }
    }
}

TEST(RotateFrame, OnlyWholeQuartersOfSmallFramesAreTurned) {
    const int W = 5, H = 3;
    const Frame src = qtest::patternFrame(W, H);
    auto turned = [&](int rotation) {
        Frame dst(W * H);
        int w = W, h = H;
        EXPECT_TRUE(rotateFrame(dst.data(), src.data(), w, h, rotation)) << rotation;
        return dst;
    };
    EXPECT_EQ(turned(450), turned(90));
    EXPECT_EQ(turned(360), src);
    // Other remainders, frames above 320 x 320 pixels, empty sizes and
    // products beyond 32 bits touch nothing.
    const std::vector<std::vector<int>> refused = {{W, H, 45}, {W, H, -90}, {320, 321, 180}, {0, 10, 90},
                                                   {10, -1, 90}, {-4, -4, 0}, {65536, 65537, 90}};
    Frame big = qtest::patternFrame(320, 321), out(320 * 321, 0x11);
    for (const auto& r : refused) {
        int w = r[0], h = r[1];
        EXPECT_FALSE(rotateFrame(out.data(), big.data(), w, h, r[2])) << r[0] << "x" << r[1] << " " << r[2];
        EXPECT_EQ(std::make_pair(w, h), std::make_pair(r[0], r[1]));
    }
    EXPECT_EQ(out, Frame(320 * 321, 0x11));
    int w = 320, h = 320;
    EXPECT_TRUE(rotateFrame(out.data(), big.data(), w, h, 180)) << "exactly the bound is turned";
}

TEST(ResizeNearest, PicksTheFlooredSourcePixelAndNothingMore) {
    for (auto s : {std::vector<int>{1280, 960, 640, 480}, std::vector<int>{97, 61, 40, 13},
                   std::vector<int>{33, 1000, 1, 19}, std::vector<int>{50, 50, 50, 50}}) {
        const int W = s[0], H = s[1], w = s[2], h = s[3];
        const Frame src = qtest::patternFrame(W, H);
        Frame dst(static_cast<size_t>(w) * h + 1, 0xAB);
        ASSERT_TRUE(resizeNearest(src.data(), W, H, dst.data(), w, h));
        for (int y = 0; y < h; ++y)
            for (int x = 0; x < w; ++x)
                ASSERT_EQ(dst[static_cast<size_t>(y) * w + x], src[(int64_t{y} * H / h) * W + int64_t{x} * W / w])
                    << W << "x" << H << " at " << x << "," << y;
        EXPECT_EQ(dst.back(), 0xAB);
    }
    Frame src = qtest::patternFrame(10, 10), dst(400, 0);
    for (auto wh : {std::make_pair(0, 5), std::make_pair(5, 0), std::make_pair(11, 5), std::make_pair(5, 20)})
        EXPECT_FALSE(resizeNearest(src.data(), 10, 10, dst.data(), wh.first, wh.second));
    EXPECT_EQ(dst, Frame(400, 0));
}

}  // namespace
