#include "tracking/FaceEstimation.h"

#include "core/Errors.h"
#include "detector/CascadeDetector.h"

float FaceEstimation::getLikelihood(const IN_IMAGE& image, const DetectionWindow& window) const
{
    if (detector == nullptr) throw qv_operation_error("Face estimator doesn't have a detector yet");
    return (detector->getScore(image, window) + 20.0f) / 40.0f;
}
