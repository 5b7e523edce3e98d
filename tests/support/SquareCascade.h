#ifndef QUORIN_TESTS_SQUARECASCADE_H
#define QUORIN_TESTS_SQUARECASCADE_H

// Test cascades and frames for the detector: a cascade that accepts a bright
// square on dark ground when the square fills the window's inner two thirds
// (within a pixel), and frames that carry such squares.

#include <cstdint>
#include <string>
#include <vector>

#include "CascadeWriter.h"
#include "image/Image.h"

constexpr unsigned char kDark = 20;
constexpr unsigned char kBright = 220;

// Gray frame with its own pixels.
struct TestFrame {
    int width;
    int height;
    std::vector<unsigned char> pixels;

    TestFrame(int w, int h, unsigned char value = kDark) : width(w), height(h), pixels(size_t(w) * h, value) {}

    void fill(int left, int top, int right, int bottom, unsigned char value)
    {
        for (int y = top; y < bottom; ++y)
            for (int x = left; x < right; ++x)
                if (x >= 0 && y >= 0 && x < width && y < height)
                    pixels[size_t(y) * width + x] = value;
    }

    // The square that the square cascade accepts in the window of `size`
    // pixels at (x, y): the window's inner part from 4/24 to 20/24, rounded
    // as the detector rounds scaled rectangles.
    void squareForWindow(int x, int y, int size)
    {
        const float f = size / 24.0f;
        const int a = static_cast<int>(0.5f + 4.0f * f);
        const int b = static_cast<int>(0.5f + 20.0f * f);
        fill(x + a, y + a, x + b, y + b, kBright);
    }

    IMAGE image() { return IMAGE(width, height, width, pixels.data()); }
};

// Edge test of one side: the mean of a 2-pixel strip just inside the square
// edge minus the mean of the 3-pixel strip outside it, times the inverse deviation.
inline CascadeModelFeature squareEdge(int side)
{
    // side: 0 left, 1 right, 2 top, 3 bottom; strips span rows/columns 8..16.
    CascadeModelRect inner, outer;
    switch (side) {
    case 0: inner = {1.0f / 16, 4, 8, 6, 16}; outer = {-1.0f / 24, 0, 8, 3, 16}; break;
    case 1: inner = {1.0f / 16, 18, 8, 20, 16}; outer = {-1.0f / 24, 21, 8, 24, 16}; break;
    case 2: inner = {1.0f / 16, 8, 4, 16, 6}; outer = {-1.0f / 24, 8, 0, 16, 3}; break;
    default: inner = {1.0f / 16, 8, 18, 16, 20}; outer = {-1.0f / 24, 8, 21, 16, 24}; break;
    }
    return CascadeWriter::haar({inner, outer});
}

// Darkness test of one side: the mean of a 3 x 3 corner, which the square
// never reaches, minus the mean of the outer strip of that side. Near 0 only
// when the strip is as dark as the corner, so the square must not reach into it.
inline CascadeModelFeature squareOuterDark(int side)
{
    CascadeModelRect corner, outer;
    switch (side) {
    case 0: corner = {1.0f / 9, 0, 0, 3, 3}; outer = {-1.0f / 24, 0, 8, 3, 16}; break;
    case 1: corner = {1.0f / 9, 21, 0, 24, 3}; outer = {-1.0f / 24, 21, 8, 24, 16}; break;
    case 2: corner = {1.0f / 9, 0, 0, 3, 3}; outer = {-1.0f / 24, 8, 0, 16, 3}; break;
    default: corner = {1.0f / 9, 0, 21, 3, 24}; outer = {-1.0f / 24, 8, 21, 16, 24}; break;
    }
    return CascadeWriter::haar({corner, outer});
}

// A stage that every window passes, adding nothing.
inline CascadeModelStage passStage()
{
    return CascadeWriter::stump(CascadeWriter::deviation(), 0.0f, 0.0f, 0.0f, -1e30f);
}

// `fillers` pass-all stages, then the four edge tests (left, right, top,
// bottom), each rejecting a window whose edge contrast is below 1.5 deviations
// (an exact fit gives 2),
// then the four darkness tests, which pin the square to one position and
// scale. An accepted window scores 0 plus `bonus` from a last stage.
inline CascadeModel squareCascade(int fillers = 0, float bonus = 0.0f)
{
    CascadeModel model;
    for (int i = 0; i < fillers; ++i)
        model.common.push_back(passStage());
    for (int side = 0; side < 4; ++side)
        model.common.push_back(CascadeWriter::stump(squareEdge(side), 1.5f, 0.0f, -1.0f, -0.5f));
    for (int side = 0; side < 4; ++side)
        model.common.push_back(CascadeWriter::stump(squareOuterDark(side), -0.3f, 0.0f, -1.0f, -0.5f));
    model.common.push_back(CascadeWriter::stump(CascadeWriter::deviation(), -1.0f, bonus, bonus, -1e30f));
    CascadeWriter::completeBranches(model);
    return model;
}

inline std::string detectorConfig(std::string const& model, int imageMaxSize = 1024, int faceMinSize = 24,
                                  int faceMaxSize = 0)
{
    return "{\"model\":\"" + model + "\",\"imageMaxSize\":" + std::to_string(imageMaxSize) +
           ",\"faceMinSize\":" + std::to_string(faceMinSize) + ",\"faceMaxSize\":" + std::to_string(faceMaxSize) +
           "}";
}

#endif
