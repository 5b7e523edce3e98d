#ifndef QUORIN_MULTIFRAMEOPTIMIZER_H
#define QUORIN_MULTIFRAMEOPTIMIZER_H

#include <cstdint>

#include "quorin/export.h"

// Remembers one position and its last motion, to predict the next position.
// A plain value; nothing here throws. The detection path doesn't use it.
class QUORIN_EXPORT MultiframeOptimizer {
public:
    // ensures: not valid, position and size -1, motion 0.
    MultiframeOptimizer() = default;

    // ensures: the stored position and size (-1 each before the first update).
    void lastPosition(int& x, int& y, int& size) const;
    // ensures: the stored position moved by the last motion; the stored size.
    void predictedPosition(int& x, int& y, int& size) const;
    // ensures: the motion is the step from the stored position when both the
    // stored and the new position are valid, else 0; then all four arguments
    // are stored.
    void updatePosition(bool valid, int x, int y, int size);

private:
    bool valid = false;
    int32_t x = -1;
    int32_t y = -1;
    int32_t size = -1;
    int32_t dx = 0;
    int32_t dy = 0;
};

#endif
