#ifndef QUORIN_API_FACEDETECTIONAPI_H
#define QUORIN_API_FACEDETECTIONAPI_H

#include <vector>

#include "api/DetectionRequest.h"
#include "core/QVFace.h"
#include "detector/FaceTrackingMode.h"
#include "quorin/export.h"

class FaceDetectionPipeline;
class FaceModelPathsHandle;

// The public face of the detection pipeline. Every operation checks that the
// pipeline exists ("QVFace Detection API not initialized properly") and turns
// any standard exception from below into an ApiError with its own fixed text.
class QUORIN_EXPORT FaceDetectionApi {
public:
    FaceDetectionApi();
    ~FaceDetectionApi();
    FaceDetectionApi(const FaceDetectionApi&) = delete;
    FaceDetectionApi& operator=(const FaceDetectionApi&) = delete;

    // Builds the detector and locator from the handle's configuration, after
    // one trip through its text form. "QVFace Detection API initialization error".
    void init(const FaceModelPathsHandle& handle);
    // Drops the engines; the pipeline object stays. Catches nothing.
    void release();
    void setTrackingMode(QVFaceTrackingMode mode);      // "... set mode error"
    void setSearchStep(float stepX, float stepY);       // "... set search step error"
    void setFaceSizeRange(int minSize, int maxSize);    // "... set face size range error"
    // Faces of one frame; each handle is read from its record's text, so floats
    // carry six significant digits. "QVFace Detection API detect error".
    std::vector<QVFace> detect(const DetectionRequest& request);

private:
    FaceDetectionPipeline* pipeline_;
};

#endif
