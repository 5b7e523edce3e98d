#ifndef QUORIN_API_FACEDETECTIONPIPELINE_H
#define QUORIN_API_FACEDETECTIONPIPELINE_H

#include <vector>

#include "api/DetectionRequest.h"
#include "core/FaceRecord.h"
#include "engine/FaceTrackingMode.h"

class FaceDetector;
class FacePartLocator;
class FaceModelPaths;
class FaceModelPathsHandle;

// The configuration of a handle after one trip through its text form, so that
// the record given to a pipeline is always a fresh one.
FaceModelPaths pathsOf(const FaceModelPathsHandle& handle);

// Owns the detector and the part locator and runs them on one frame, in that
// order. Empty (both null) after construction, release and a failed init.
class FaceDetectionPipeline {
public:
    FaceDetectionPipeline() = default;
    ~FaceDetectionPipeline();
    FaceDetectionPipeline(const FaceDetectionPipeline&) = delete;
    FaceDetectionPipeline& operator=(const FaceDetectionPipeline&) = delete;

    // Builds both engines from the "faceRects" and "faceParts" entries of the
    // configuration's detection text, releasing any earlier ones first. On
    // failure the pipeline is left empty and ApiError
    // "QVFace Detection API initialization error" is raised.
    void init(const FaceModelPaths& paths);
    void release();

    // Forwarded to the detector; without one they raise qv_operation_error.
    void setTrackingMode(QVFaceTrackingMode mode);
    void setSearchStep(float stepX, float stepY);
    void setFaceSizeRange(int minSize, int maxSize);

    // Faces of one frame with landmarks and the request's dataSet/filePath.
    // The locator is not run on a frame without faces.
    std::vector<FaceRecord> detect(const DetectionRequest& request);
    // The same faces as the engines leave them, in `faces` (cleared first),
    // without dataSet and filePath: the frame path of the entry points.
    void detectFaces(const unsigned char* pixels, int width, int height, std::vector<FaceData>& faces);

    bool ready() const { return staged_ || (detector_ != nullptr && locator_ != nullptr); }

private:
    bool staged_ = false;  // initialised on an installed PipelineStages
    FaceDetector* detector_ = nullptr;
    FacePartLocator* locator_ = nullptr;
};

#endif
