// FaceDetectionPipeline and FaceDetectionApi: building the engines from the
// configuration, the per-frame run, the text bridge to QVFace, and the
// translation of failures into ApiError.

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "support/ScriptedStages.h"
#include "api/FaceDetectionApi.h"
#include "api/FaceDetectionPipeline.h"
#include "core/ApiError.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"

namespace {

using qtest::makeFace;

const char* const kDetection = R"({"faceRects":{"detector":{"model":"mdcb"},"postfilter":{}},"faceParts":{}})";

FaceModelPaths pathsWithDetection(const std::string& detection) {
    FaceModelPaths paths;
    paths.setDetection(detection);
    return paths;
}

template <typename F>
std::string messageOf(F f) {
    try {
        f();
    } catch (const ApiError& e) {
        return e.what();
    }
    return "<no ApiError>";
}

// Throws from inside the detector to see how the layers above translate it.
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

TEST(FaceDetectionPipeline, InitNeedsAnObjectWithBothEntries) {
    const char* const bad[] = {"", "[1]", "\"x\"", R"({"faceRects":{}})", R"({"faceParts":{}})",
                               R"({"faceRects":"x","faceParts":{}})", R"({"faceRects":{},"faceParts":{)"};
    // With the engines themselves ...
    FaceDetectionPipeline pipeline;
    for (const char* text : bad) {
        EXPECT_EQ(messageOf([&] { pipeline.init(pathsWithDetection(text)); }),
                  "QVFace Detection API initialization error")
            << text;
        EXPECT_FALSE(pipeline.ready()) << text;
    }
    // ... and with stand-ins, which see the two texts.
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    EXPECT_NO_THROW(pipeline.init(pathsWithDetection(kDetection)));
    EXPECT_TRUE(pipeline.ready());
    for (const char* text : bad) {
        EXPECT_EQ(messageOf([&] { pipeline.init(pathsWithDetection(text)); }),
                  "QVFace Detection API initialization error")
            << text;
        EXPECT_FALSE(pipeline.ready()) << "a failed init leaves the pipeline empty: " << text;
    }
    pipeline.init(pathsWithDetection(kDetection));
    pipeline.release();
    EXPECT_FALSE(pipeline.ready());
}

TEST(FaceDetectionPipeline, CopiesTheRequestsNamesIntoEveryFace) {
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionPipeline pipeline;
    pipeline.init(pathsWithDetection(kDetection));
    stages.script.push_back({makeFace(0, 0, 10, 10, 1.0f), makeFace(5, 5, 15, 15, 2.0f)});
    unsigned char pixels[16 * 16] = {};
    DetectionRequest request;
    request.pixels = pixels;
    request.width = 16;
    request.height = 16;
    request.dataSet = "set";
    request.filePath = "a/b.pgm";
    std::vector<FaceRecord> records = pipeline.detect(request);
    ASSERT_EQ(records.size(), 2u);
    for (const FaceRecord& r : records) {
        EXPECT_EQ(r.dataSet(), "set");
        EXPECT_EQ(r.filePath(), "a/b.pgm");
    }
    EXPECT_EQ(records[1].faceScore(), 2.0f);
    EXPECT_EQ(stages.locateCalls, 1);
    EXPECT_TRUE(pipeline.detect(request).empty());
    EXPECT_EQ(stages.locateCalls, 1) << "no locator run on a frame without faces";
}

TEST(FaceDetectionPipeline, WithoutEnginesEveryCallFailsCleanly) {
    FaceDetectionPipeline pipeline;
    DetectionRequest request;
    EXPECT_THROW(pipeline.detect(request), std::exception);
    EXPECT_THROW(pipeline.setSearchStep(0.1f, 0.1f), std::exception);
    EXPECT_THROW(pipeline.setTrackingMode(QV_TRACKING_KF), std::exception);
    EXPECT_THROW(pipeline.setFaceSizeRange(32, 64), std::exception);
}

TEST(FaceDetectionApi, HandsOutFacesThatWentThroughTheTextForm) {
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionApi api;
    api.init(FaceModelPathsHandle(nullptr));
    FaceData face = makeFace(3, 4, 50, 60, 0.1234567f);
    face.setLandmark("nose", Point2<float>(12.345678f, 1e-7f));
    stages.script.push_back({face});
    unsigned char pixels[64 * 64] = {};
    DetectionRequest request;
    request.pixels = pixels;
    request.width = 64;
    request.height = 64;
    std::vector<QVFace> faces = api.detect(request);
    ASSERT_EQ(faces.size(), 1u);
    EXPECT_EQ(faces[0].faceScore(), 0.123457f);
    EXPECT_EQ(faces[0].landmark("nose").x, 12.3457f);
    EXPECT_EQ(faces[0].landmark("nose").y, 1e-7f);
    EXPECT_EQ(faces[0].faceRect().right, 50);
    EXPECT_EQ(faces[0].dataSet(), "");
    EXPECT_EQ(faces[0].filePath(), "");
}

TEST(FaceDetectionApi, FailuresBelowBecomeItsOwnMessages) {
    ThrowingStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionApi api;
    api.init(FaceModelPathsHandle(nullptr));
    DetectionRequest request;
    unsigned char pixels[4] = {};
    request.pixels = pixels;
    request.width = request.height = 2;
    stages.what = ThrowingStages::What::ApiErr;
    EXPECT_EQ(messageOf([&] { api.detect(request); }), "QVFace Detection API detect error");
    stages.what = ThrowingStages::What::Std;
    EXPECT_EQ(messageOf([&] { api.detect(request); }), "QVFace Detection API detect error");
    EXPECT_EQ(messageOf([&] { api.setFaceSizeRange(1, 2); }), "QVFace Detection API set face size range error");
    stages.what = ThrowingStages::What::NonStd;
    EXPECT_THROW(api.detect(request), int) << "what doesn't derive from std::exception passes unchanged";
}

TEST(FaceDetectionApi, WithoutEnginesEachOperationSaysWhichFailed) {
    FaceDetectionApi api;  // never initialised: the pipeline has no engines
    DetectionRequest request;
    EXPECT_EQ(messageOf([&] { api.detect(request); }), "QVFace Detection API detect error");
    EXPECT_EQ(messageOf([&] { api.setTrackingMode(QV_TRACKING_KF); }), "QVFace Detection API set mode error");
    EXPECT_EQ(messageOf([&] { api.setSearchStep(0.1f, 0.1f); }), "QVFace Detection API set search step error");
    EXPECT_EQ(messageOf([&] { api.setFaceSizeRange(32, 64); }), "QVFace Detection API set face size range error");
    EXPECT_NO_THROW(api.release());
}

}  // namespace
