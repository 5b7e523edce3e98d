#ifndef QUORIN_DETECTOR_MULTIFRAMEOPTIMIZER_H
#define QUORIN_DETECTOR_MULTIFRAMEOPTIMIZER_H

#include <cstdint>

#include "quorin/export.h"

// Remembers one position and its last motion, to predict the next position.
class QUORIN_EXPORT MultiframeOptimizer {
public:
    MultiframeOptimizer() = default;

    // The stored position (-1 each before the first update).
    void lastPosition(int& x, int& y, int& size) const;
    // The stored position moved by the last motion.
    void predictedPosition(int& x, int& y, int& size) const;
    // The motion becomes the step from the stored position when both the old
    // and the new position are valid, else 0; then the new one is stored.
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
