#include "api/FaceDetectionPipeline.h"

#include <exception>
#include <map>
#include <string>

#include "api/PipelineStages.h"
#include "core/ApiError.h"
#include "core/Errors.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "core/Json.h"
#include "engine/FaceDetector.h"
#include "faceparts/FacePartLocator.h"

namespace {

PipelineStages* g_stagesOverride = nullptr;

std::string valueOrEmpty(const std::map<std::string, std::string>& items, const char* key) {
    auto it = items.find(key);
    return it == items.end() ? std::string() : it->second;
}

// The setters of the original design reach through a null detector; here a
// pipeline without engines says so instead.
void requireEngine(const void* engine) {
    if (engine == nullptr) throw qv_operation_error("Face detection pipeline has no detector");
}

}  // namespace

void PipelineStages::init(const std::string& faceRects, const std::string& faceParts) {
    parseJsonObject(faceRects);
    parseJsonObject(faceParts);
}

void setPipelineStagesOverride(PipelineStages* stages) { g_stagesOverride = stages; }

FaceModelPaths pathsOf(const FaceModelPathsHandle& handle) {
    FaceModelPaths paths;
    paths.fromJson(handle.toJson());
    return paths;
}

FaceDetectionPipeline::~FaceDetectionPipeline() { release(); }

void FaceDetectionPipeline::init(const FaceModelPaths& paths) {
    try {
        release();
        std::map<std::string, std::string> detection = parseJsonObject(paths.detection());
        std::string faceRects = valueOrEmpty(detection, "faceRects");
        std::string faceParts = valueOrEmpty(detection, "faceParts");
        if (g_stagesOverride != nullptr) {
            g_stagesOverride->init(faceRects, faceParts);
            staged_ = true;
            return;
        }
        detector_ = new FaceDetector();
        detector_->init(faceRects);
        locator_ = new FacePartLocator();
        locator_->init(faceParts);
    } catch (const std::exception&) {
        release();
        throw ApiError("QVFace Detection API initialization error");
    }
}

void FaceDetectionPipeline::release() {
    staged_ = false;
    delete detector_;
    detector_ = nullptr;
    delete locator_;
    locator_ = nullptr;
}

void FaceDetectionPipeline::setTrackingMode(QVFaceTrackingMode mode) {
    if (g_stagesOverride != nullptr) return g_stagesOverride->setTrackingMode(mode);
    requireEngine(detector_);
    detector_->setTrackingMode(mode);
}

void FaceDetectionPipeline::setSearchStep(float stepX, float stepY) {
    if (g_stagesOverride != nullptr) return g_stagesOverride->setSearchStep(stepX, stepY);
    requireEngine(detector_);
    detector_->setSearchStep(stepX, stepY);
}

void FaceDetectionPipeline::setFaceSizeRange(int minSize, int maxSize) {
    if (g_stagesOverride != nullptr) return g_stagesOverride->setFaceSizeRange(minSize, maxSize);
    requireEngine(detector_);
    detector_->setFaceSizeRange(minSize, maxSize);
}

void FaceDetectionPipeline::detectFaces(const unsigned char* pixels, int width, int height,
                                        std::vector<FaceData>& faces) {
    faces.clear();
    PipelineStages* stages = g_stagesOverride;
    if (stages == nullptr) {
        requireEngine(detector_);
        requireEngine(locator_);
        detector_->detect(pixels, width, height, faces);
        if (!faces.empty()) locator_->locateParts(pixels, width, height, faces);
        return;
    }
    stages->detect(pixels, width, height, faces);
    if (!faces.empty()) stages->locateParts(pixels, width, height, faces);
}

std::vector<FaceRecord> FaceDetectionPipeline::detect(const DetectionRequest& request) {
    std::vector<FaceData> faces;
    detectFaces(request.pixels, request.width, request.height, faces);
    std::vector<FaceRecord> result;
    result.reserve(faces.size());
    for (FaceData& face : faces) {
        face.setDataSet(request.dataSet);
        face.setFilePath(request.filePath);
        result.emplace_back(face);
    }
    return result;
}
