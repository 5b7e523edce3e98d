#include "api/FaceDetectionApi.h"

#include <exception>
#include <new>

#include "api/FaceDetectionPipeline.h"
#include "core/ApiError.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"

namespace {

const char* const kNotInitialized = "QVFace Detection API not initialized properly";

// Runs `op`, replacing any standard exception (ApiError included) by `message`.
template <typename Op>
auto translated(const char* message, Op op) -> decltype(op()) {
    try {
        return op();
    } catch (const std::exception&) {
        throw ApiError(message);
    }
}

}  // namespace

FaceDetectionApi::FaceDetectionApi() : pipeline_(new (std::nothrow) FaceDetectionPipeline()) {}

FaceDetectionApi::~FaceDetectionApi() {
    delete pipeline_;
    pipeline_ = nullptr;
}

void FaceDetectionApi::init(const FaceModelPathsHandle& handle) {
    if (pipeline_ == nullptr) throw ApiError(kNotInitialized);
    translated("QVFace Detection API initialization error", [&] {
        FaceModelPaths paths;
        paths.fromJson(handle.toJson());
        pipeline_->init(paths);
    });
}

void FaceDetectionApi::release() {
    if (pipeline_ == nullptr) throw ApiError(kNotInitialized);
    pipeline_->release();
}

void FaceDetectionApi::setTrackingMode(QVFaceTrackingMode mode) {
    if (pipeline_ == nullptr) throw ApiError(kNotInitialized);
    translated("QVFace Detection API set mode error", [&] { pipeline_->setTrackingMode(mode); });
}

void FaceDetectionApi::setSearchStep(float stepX, float stepY) {
    if (pipeline_ == nullptr) throw ApiError(kNotInitialized);
    translated("QVFace Detection API set search step error", [&] { pipeline_->setSearchStep(stepX, stepY); });
}

void FaceDetectionApi::setFaceSizeRange(int minSize, int maxSize) {
    if (pipeline_ == nullptr) throw ApiError(kNotInitialized);
    translated("QVFace Detection API set face size range error",
               [&] { pipeline_->setFaceSizeRange(minSize, maxSize); });
}

std::vector<QVFace> FaceDetectionApi::detect(const DetectionRequest& request) {
    if (pipeline_ == nullptr) throw ApiError(kNotInitialized);
    return translated("QVFace Detection API detect error", [&] {
        std::vector<FaceRecord> records = pipeline_->detect(request);
        std::vector<QVFace> faces(records.size(), QVFace());
        for (std::size_t i = 0; i < records.size(); ++i) faces[i].fromJson(records[i].toJson());
        return faces;
    });
}
