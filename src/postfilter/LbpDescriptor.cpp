#include "postfilter/LbpDescriptor.h"

#include <algorithm>
#include <limits>

#include "core/Errors.h"

namespace {

constexpr bool isUniform(unsigned pattern)
{
    int changes = 0;
    for (int bit = 0; bit < 8; ++bit) {
        unsigned a = (pattern >> bit) & 1u;
        unsigned b = (pattern >> ((bit + 1) & 7)) & 1u;
        changes += a != b ? 1 : 0;
    }
    return changes <= 2;
}

constexpr std::array<uint8_t, 256> makeLut()
{
    std::array<uint8_t, 256> lut{};
    uint8_t next = 0;
    for (unsigned p = 0; p < 256; ++p)
        lut[p] = isUniform(p) ? next++ : uint8_t(LbpDescriptor::LBP_HISTOGRAM_BIN - 1);
    return lut;
}

} // namespace

const std::array<uint8_t, 256> LbpDescriptor::LBP_LUT = makeLut();

LbpDescriptor::LbpDescriptor() : cellsX(0), cellsY(0), length(0) {}

LbpDescriptor::LbpDescriptor(int cellsX, int cellsY) : LbpDescriptor()
{
    init(cellsX, cellsY);
}

void LbpDescriptor::init(int newCellsX, int newCellsY)
{
    if (newCellsX < 0 || newCellsY < 0)
        throw qv_invalid_argument("LBP cell counts must not be negative");
    long long total = static_cast<long long>(newCellsX) * newCellsY * LBP_HISTOGRAM_BIN;
    if (total > std::numeric_limits<int>::max())
        throw qv_invalid_argument("LBP cell grid too large");
    cellsX = newCellsX;
    cellsY = newCellsY;
    length = static_cast<int>(total);
}

void LbpDescriptor::getFeature(const float* image, int width, int height, float* histogram) const
{
    if (length == 0)
        return;
    if (histogram == nullptr)
        throw qv_invalid_argument("LBP histogram buffer is null");
    if (width < 0 || height < 0)
        throw qv_invalid_argument("LBP image size must not be negative");
    std::fill(histogram, histogram + length, 0.0f);
    if (width < 3 || height < 3)
        return; // no pixel has a complete neighbourhood
    if (image == nullptr)
        throw qv_invalid_argument("LBP image buffer is null");
    const int cellWidth = width / cellsX;
    const int cellHeight = height / cellsY;
    if (cellWidth == 0 || cellHeight == 0)
        throw qv_invalid_argument("LBP image is smaller than its cell grid");

    for (int y = 1; y < height - 1; ++y) {
        const int cellRow = y / cellHeight;
        if (cellRow >= cellsY)
            break; // the remainder rows below the last full cell
        const float* up = image + static_cast<long>(y - 1) * width;
        const float* mid = up + width;
        const float* down = mid + width;
        float* rowBins = histogram + static_cast<long>(cellRow) * cellsX * LBP_HISTOGRAM_BIN;
        for (int x = 1; x < width - 1; ++x) {
            const int cellColumn = x / cellWidth;
            if (cellColumn >= cellsX)
                break;
            const float c = mid[x];
            unsigned pattern = (c < up[x - 1] ? 1u : 0u) | (c < up[x] ? 2u : 0u)
                             | (c < up[x + 1] ? 4u : 0u) | (c < mid[x + 1] ? 8u : 0u)
                             | (c < down[x + 1] ? 16u : 0u) | (c < down[x] ? 32u : 0u)
                             | (c < down[x - 1] ? 64u : 0u) | (c < mid[x - 1] ? 128u : 0u);
            rowBins[cellColumn * LBP_HISTOGRAM_BIN + LBP_LUT[pattern]] += 1.0f;
        }
    }
}
