#ifndef QUORIN_TRACKING_FACEESTIMATION_H
#define QUORIN_TRACKING_FACEESTIMATION_H

#include "image/DetectionWindow.h"

class CascadeDetector;
class IN_IMAGE;

// The cascade's own score as a likelihood: (score + 20) / 40, so the dead
// score of a window outside the image maps to 0. Holds the detector, doesn't
// own it; copies share it.
class FaceEstimation {
public:
    void setDetector(CascadeDetector* cascade) { detector = cascade; }
    // Raises qv_operation_error "Face estimator doesn't have a detector yet"
    // without a detector.
    float getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const;

    CascadeDetector* detector = nullptr;
};

#endif
