#ifndef QUORIN_IMAGE_DETECTIONWINDOW_H
#define QUORIN_IMAGE_DETECTIONWINDOW_H

#include <cstdint>

// Integer rectangle of the detector. `right` and `bottom` lie one past the last
// pixel: they are corner indices into an integral image, so width = right - left
// and height = bottom - top.
struct DetectionWindow {
    int32_t left = 0;
    int32_t right = 0;
    int32_t top = 0;
    int32_t bottom = 0;

    int32_t width() const { return right - left; }
    int32_t height() const { return bottom - top; }

    // Intersection over union with `other`, in [0, 1]. Windows that only touch,
    // or don't meet, give 0; a window with itself gives 1.
    float Overlap(DetectionWindow const& other) const;
};

#endif
