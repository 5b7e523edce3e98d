// FaceDetectionPipeline and FaceDetectionApi: a bad configuration, failures
// of the engines below and a frame above the detector's bound all end in the
// API's own messages.

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "api/FaceDetectionApi.h"
#include "api/FaceDetectionPipeline.h"
#include "core/ApiError.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "support/ExpectThrow.h"
#include "support/ScriptedStages.h"

namespace {

const char* const kDetection = R"({"faceRects":{"detector":{"model":"mdcb"},"postfilter":{}},"faceParts":{}})";

FaceModelPaths pathsWithDetection(const std::string& detection) {
    FaceModelPaths paths;
    paths.setDetection(detection);
    return paths;
}

DetectionRequest requestFor(const std::vector<unsigned char>& pixels, int side) {
    DetectionRequest request;
    request.pixels = pixels.data();
    request.width = request.height = side;
    return request;
}

TEST(FaceDetectionPipeline, InitNeedsAnObjectWithBothEntriesAndFailsToEmpty) {
    const char* const bad[] = {"", "[1]", "\"x\"", R"({"faceRects":{}})", R"({"faceParts":{}})",
                               R"({"faceRects":"x","faceParts":{}})", R"({"faceRects":{},"faceParts":{)"};
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionPipeline pipeline;
    for (const char* text : bad) {  // from a ready pipeline
        SCOPED_TRACE(text);
        pipeline.init(pathsWithDetection(kDetection));
        ASSERT_TRUE(pipeline.ready());
        expectThrowWith<ApiError>([&] { pipeline.init(pathsWithDetection(text)); },
                                  "QVFace Detection API initialization error");
        EXPECT_FALSE(pipeline.ready());
    }
}

// Throws from inside the stages to see how the layers above translate it.
class ThrowingStages : public qtest::ScriptedStages {
public:
    enum class What { ApiErr, Std, NonStd } what = What::Std;
    void detect(const unsigned char*, int, int, std::vector<FaceData>&) override {
        if (what == What::ApiErr) throw ApiError("inner");
        if (what == What::Std) throw std::runtime_error("inner");
        throw 42;
    }
    void setFaceSizeRange(int, int) override { throw std::runtime_error("inner"); }
};

TEST(FaceDetectionApi, FailuresBelowBecomeItsOwnMessages) {
    const std::string detectError = "QVFace Detection API detect error";
    {
        FaceDetectionApi idle;  // never initialised: the pipeline has no engines
        expectThrowWith<ApiError>([&] { idle.detect(DetectionRequest{}); }, detectError);
        expectThrowWith<ApiError>([&] { idle.setTrackingMode(QV_TRACKING_KF); }, "QVFace Detection API set mode error");
        expectThrowWith<ApiError>([&] { idle.setSearchStep(0.1f, 0.1f); },
                                  "QVFace Detection API set search step error");
        expectThrowWith<ApiError>([&] { idle.setFaceSizeRange(32, 64); },
                                  "QVFace Detection API set face size range error");
        EXPECT_NO_THROW(idle.release());
    }
    ThrowingStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionApi api;
    api.init(FaceModelPathsHandle(nullptr));
    std::vector<unsigned char> pixels(4);
    for (auto what : {ThrowingStages::What::ApiErr, ThrowingStages::What::Std}) {  // an inner ApiError is replaced too
        stages.what = what;
        expectThrowWith<ApiError>([&] { api.detect(requestFor(pixels, 2)); }, detectError);
    }
    expectThrowWith<ApiError>([&] { api.setFaceSizeRange(1, 2); }, "QVFace Detection API set face size range error");
    stages.what = ThrowingStages::What::NonStd;
    EXPECT_THROW(api.detect(requestFor(pixels, 2)), int) << "what isn't a std::exception passes unchanged";
}

TEST(FaceDetectionApi, OversizedFrameFromTheRealDetectorBecomesItsDetectError) {
    // Real engines, with a bound below the frame: the work frame of the
    // thorough mode keeps a 320-pixel frame as it is.
    const char* const small =
        R"({"faceRects":{"detector":{"model":"mdcb","imageMaxSize":200,"faceMinSize":24,"faceMaxSize":200},)"
        R"("postfilter":{"name":"ILABS_POSTFILTER","param":{"model":"mdpb"}}},"faceParts":{"neuralNetModelPath":"mdnb"}})";
    std::vector<unsigned char> pixels(320 * 320, 128);
    FaceDetectionApi api;
    FaceModelPathsHandle handle;
    handle.fromJson(pathsWithDetection(small).toJson());
    api.init(handle);
    expectThrowWith<ApiError>([&] { api.detect(requestFor(pixels, 320)); }, "QVFace Detection API detect error");
    EXPECT_NO_THROW(api.detect(requestFor(pixels, 200))) << "the session survives the refused frame";
}

}  // namespace
