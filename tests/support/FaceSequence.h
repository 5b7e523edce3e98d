#ifndef QUORIN_TESTS_FACESEQUENCE_H
#define QUORIN_TESTS_FACESEQUENCE_H

// Frames for the trackers: a real face, cut from a development frame at its
// teacher box, moving over a textured background, and the built-in cascade to
// weigh particles with. The face comes from the data cache, so callers skip
// when faceCrop() is empty.

#include <cmath>
#include <cstdint>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "DevData.h"
#include "TrackSupport.h"
#include "detector/CascadeDetector.h"
#include "image/IntegralImage.h"

namespace facesequence {

struct Gray {
    int width = 0, height = 0;
    std::vector<uint8_t> pixels;
    uint8_t at(int x, int y) const { return pixels[size_t(y) * size_t(width) + size_t(x)]; }
};

// Binary PGM (P5, maxval 255) or an empty image.
inline Gray readPgm(const std::string& path)
{
    Gray g;
    std::ifstream in(path, std::ios::binary);
    std::string magic;
    int maxval = 0;
    if (!(in >> magic >> g.width >> g.height >> maxval) || magic != "P5" || maxval != 255) return Gray();
    in.get();
    g.pixels.resize(size_t(g.width) * size_t(g.height));
    if (!in.read(reinterpret_cast<char*>(g.pixels.data()), std::streamsize(g.pixels.size()))) return Gray();
    return g;
}

// The face of cap12_edit_f00000 at its teacher box (151, 115)-(259, 223),
// resampled to side x side; empty when the cache is absent.
inline Gray faceCrop(int side)
{
    const Gray frame = readPgm(devdata::root() + "/frames/cap12_edit/cap12_edit_f00000.pgm");
    if (frame.width < 260 || frame.height < 224) return Gray();
    Gray crop;
    crop.width = crop.height = side;
    crop.pixels.resize(size_t(side) * size_t(side));
    for (int y = 0; y < side; ++y)
        for (int x = 0; x < side; ++x)
            crop.pixels[size_t(y * side + x)] = frame.at(151 + x * 108 / side, 115 + y * 108 / side);
    return crop;
}

// A textured background of width x height.
inline std::vector<uint8_t> background(int width, int height)
{
    std::vector<uint8_t> px(size_t(width) * size_t(height));
    for (int r = 0; r < height; ++r)
        for (int c = 0; c < width; ++c) {
            const double v = 120.0 + 50.0 * std::sin(c * 0.21) * std::cos(r * 0.13) + ((c * 7 + r * 13) % 17) * 2.0;
            px[size_t(r * width + c)] = uint8_t(v);
        }
    return px;
}

// The background with the face pasted with its top-left corner at (x, y).
inline std::vector<uint8_t> frameWithFace(const Gray& face, int width, int height, int x, int y)
{
    static std::vector<uint8_t> cached;
    static int cachedWidth = 0, cachedHeight = 0;
    if (cachedWidth != width || cachedHeight != height) {
        cached = background(width, height);
        cachedWidth = width;
        cachedHeight = height;
    }
    std::vector<uint8_t> px = cached;
    for (int r = 0; r < face.height; ++r)
        for (int c = 0; c < face.width; ++c) {
            const int fx = x + c, fy = y + r;
            if (fx >= 0 && fy >= 0 && fx < width && fy < height) px[size_t(fy * width + fx)] = face.at(c, r);
        }
    return px;
}

// The built-in cascade for a 320 x 240 work frame.
inline std::unique_ptr<CascadeDetector> builtInCascade()
{
    return std::make_unique<CascadeDetector>(
        R"({"model":"mdcb","imageMaxSize":320,"faceMinSize":24,"faceMaxSize":240})");
}

// The true box of frame t on a Lissajous path. At a slowness of 1 the face
// moves up to about 6 pixels a frame; a slowness of k stretches the path's
// periods k times.
inline DetectionWindow truthAt(int t, int side, double slowness = 1.0)
{
    const double pi = 3.14159265358979;
    const int cx = int(160 + 90 * std::sin(2 * pi * t / (100.0 * slowness)));
    const int cy = int(120 + 50 * std::sin(2 * pi * t / (70.0 * slowness)));
    return makeWindow(cx - side / 2, cy - side / 2, cx - side / 2 + side, cy - side / 2 + side);
}

} // namespace facesequence

#endif
