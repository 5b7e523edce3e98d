#include "detector/MultiframeOptimizer.h"

void MultiframeOptimizer::lastPosition(int& outX, int& outY, int& outSize) const
{
    outX = x;
    outY = y;
    outSize = size;
}

void MultiframeOptimizer::predictedPosition(int& outX, int& outY, int& outSize) const
{
    // Wrapping, not undefined, on absurd positions.
    outX = static_cast<int32_t>(static_cast<uint32_t>(x) + static_cast<uint32_t>(dx));
    outY = static_cast<int32_t>(static_cast<uint32_t>(y) + static_cast<uint32_t>(dy));
    outSize = size;
}

void MultiframeOptimizer::updatePosition(bool newValid, int newX, int newY, int newSize)
{
    if (newValid && valid) {
        dx = static_cast<int32_t>(static_cast<uint32_t>(newX) - static_cast<uint32_t>(x));
        dy = static_cast<int32_t>(static_cast<uint32_t>(newY) - static_cast<uint32_t>(y));
    } else {
        dx = 0;
        dy = 0;
    }
    valid = newValid;
    x = newX;
    y = newY;
    size = newSize;
}
