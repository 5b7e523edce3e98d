#include "api/FaceDetectionApi.h"

#include <new>

#include "api/ApiErrors.h"
#include "api/FaceDetectionPipeline.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"

FaceDetectionApi::FaceDetectionApi() : pipeline_(new (std::nothrow) FaceDetectionPipeline()) {}

FaceDetectionApi::~FaceDetectionApi() {
    delete pipeline_;
    pipeline_ = nullptr;
}

void FaceDetectionApi::init(const FaceModelPathsHandle& handle) {
    if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
    translatedToApiError(kApiInitError, [&] { pipeline_->init(pathsOf(handle)); });
}

void FaceDetectionApi::release() {
    if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
    pipeline_->release();
}

void FaceDetectionApi::setTrackingMode(QVFaceTrackingMode mode) {
    if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
    translatedToApiError(kApiSetModeError, [&] { pipeline_->setTrackingMode(mode); });
}

void FaceDetectionApi::setSearchStep(float stepX, float stepY) {
    if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
    translatedToApiError(kApiSetSearchStepError, [&] { pipeline_->setSearchStep(stepX, stepY); });
}

void FaceDetectionApi::setFaceSizeRange(int minSize, int maxSize) {
    if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
    translatedToApiError(kApiSetFaceSizeRangeError, [&] { pipeline_->setFaceSizeRange(minSize, maxSize); });
}

std::vector<QVFace> FaceDetectionApi::detect(const DetectionRequest& request) {
    if (pipeline_ == nullptr) throw ApiError(kApiNotInitialized);
    return translatedToApiError(kApiDetectError, [&] {
        std::vector<FaceRecord> records = pipeline_->detect(request);
        std::vector<QVFace> faces(records.size(), QVFace());
        for (std::size_t i = 0; i < records.size(); ++i) faces[i].fromJson(records[i].toJson());
        return faces;
    });
}
