#ifndef QUORIN_FACEDETECTIONAPI_H
#define QUORIN_FACEDETECTIONAPI_H

#include <vector>

#include "quorin/ApiError.h"
#include "quorin/DetectionRequest.h"
#include "quorin/FaceModelPathsHandle.h"
#include "quorin/QVFace.h"
#include "quorin/QVFaceTrackingMode.h"
#include "quorin/export.h"

class FaceDetectionPipeline;

// The detection pipeline (FaceDetector, then the landmark locator) behind one
// guarded handle. Every operation first checks that the pipeline object exists
// and otherwise throws ApiError "QVFace Detection API not initialized
// properly" (only after an exhausted heap at construction). Each operation
// turns a std::exception from below into an ApiError with its own fixed text,
// listed with it; what isn't a std::exception passes unchanged. One thread at a
// time.
class QUORIN_EXPORT FaceDetectionApi {
public:
    // ensures: an empty pipeline; init must run before anything else.
    FaceDetectionApi();
    ~FaceDetectionApi();
    FaceDetectionApi(const FaceDetectionApi&) = delete;
    FaceDetectionApi& operator=(const FaceDetectionApi&) = delete;

    // requires: a configuration whose "detection" entry holds "faceRects" and
    // "faceParts" (FaceModelPathsHandle(nullptr) gives the built-in one).
    // ensures: a ready pipeline, tracking off; a repeated init replaces it.
    // throws: ApiError "QVFace Detection API initialization error"; the
    // pipeline is then empty.
    void init(const FaceModelPathsHandle& handle);
    // ensures: the detector and locator are gone; the pipeline object stays.
    // Catches nothing.
    void release();
    // requires: a successful init. ensures: the known faces are discarded and
    // `mode` selects the tracker.
    // throws: ApiError "QVFace Detection API set mode error".
    void setTrackingMode(QVFaceTrackingMode mode);
    // requires: a successful init; steps as fractions of the window side.
    // throws: ApiError "QVFace Detection API set search step error".
    void setSearchStep(float stepX, float stepY);
    // requires: a successful init; smallest and largest face side in pixels.
    // throws: ApiError "QVFace Detection API set face size range error".
    void setFaceSizeRange(int minSize, int maxSize);
    // requires: a successful init and request.pixels holding width * height
    // bytes. ensures: one handle per face, with rectangle, score and the five
    // landmarks, in the detector's order; floats carry six significant digits.
    // throws: ApiError "QVFace Detection API detect error" (for example a frame
    // larger than the configured imageMaxSize).
    std::vector<QVFace> detect(const DetectionRequest& request);

private:
    FaceDetectionPipeline* pipeline_;
};

#endif
