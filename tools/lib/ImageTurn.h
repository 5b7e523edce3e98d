#ifndef QUORIN_TOOLS_IMAGETURN_H
#define QUORIN_TOOLS_IMAGETURN_H

// Turns a gray image in the plane about a point, for the roll material of the
// trainers: turned faces keep their box (the engine reports the axis-aligned
// square of a turned face, centred as the upright one).

#include <algorithm>
#include <cmath>
#include <cstdint>

// `out` (same size as `in`) gets `in` turned by `degrees` about (cx, cy),
// clockwise on screen (y down), so an eye line gains that roll; bilinear, the
// border pixels repeated outside.
inline void turnAbout(const uint8_t* in, int width, int height, double cx, double cy, double degrees, uint8_t* out)
{
    const double a = degrees * 3.14159265358979323846 / 180.0, c = std::cos(a), s = std::sin(a);
    for (int y = 0; y < height; ++y)
        for (int x = 0; x < width; ++x) {
            const double dx = x - cx, dy = y - cy;
            const double sx = std::clamp(c * dx + s * dy + cx, 0.0, width - 1.0);
            const double sy = std::clamp(-s * dx + c * dy + cy, 0.0, height - 1.0);
            const int x0 = static_cast<int>(sx), y0 = static_cast<int>(sy);
            const int x1 = std::min(x0 + 1, width - 1), y1 = std::min(y0 + 1, height - 1);
            const double fx = sx - x0, fy = sy - y0;
            auto at = [&](int xx, int yy) { return static_cast<double>(in[static_cast<size_t>(yy) * width + xx]); };
            const double v = (1 - fy) * ((1 - fx) * at(x0, y0) + fx * at(x1, y0)) + fy * ((1 - fx) * at(x0, y1) + fx * at(x1, y1));
            out[static_cast<size_t>(y) * width + x] = static_cast<uint8_t>(std::lround(std::clamp(v, 0.0, 255.0)));
        }
}

// Where the point (x, y) goes under the same turn.
inline void turnPoint(double cx, double cy, double degrees, double& x, double& y)
{
    const double a = degrees * 3.14159265358979323846 / 180.0, c = std::cos(a), s = std::sin(a);
    const double dx = x - cx, dy = y - cy;
    x = c * dx - s * dy + cx;
    y = s * dx + c * dy + cy;
}

#endif
