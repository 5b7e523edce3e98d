// FaceDetectionPipeline and FaceDetectionApi: building the engines from the
// configuration, the per-frame run, the text bridge to QVFace, and the
// translation of failures into ApiError.

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

#include "api/FaceDetectionApi.h"
#include "api/FaceDetectionPipeline.h"
#include "core/ApiError.h"
#include "core/Errors.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "support/ScriptedStages.h"

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

DetectionRequest requestFor(const std::vector<unsigned char>& pixels, int side) {
    DetectionRequest request;
    request.pixels = pixels.data();
    request.width = request.height = side;
    return request;
}

TEST(FaceDetectionPipeline, InitNeedsAnObjectWithBothEntriesAndFailsToEmpty) {
    const char* const bad[] = {"", "[1]", "\"x\"", R"({"faceRects":{}})", R"({"faceParts":{}})",
                               R"({"faceRects":"x","faceParts":{}})", R"({"faceRects":{},"faceParts":{)"};
    FaceDetectionPipeline pipeline;
    auto expectRefused = [&](const char* text) {
        EXPECT_EQ(messageOf([&] { pipeline.init(pathsWithDetection(text)); }),
                  "QVFace Detection API initialization error")
            << text;
        EXPECT_FALSE(pipeline.ready()) << text;
    };
    for (const char* text : bad) expectRefused(text);  // with the engines themselves
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    for (const char* text : bad) {  // with stand-ins, from a ready pipeline
        pipeline.init(pathsWithDetection(kDetection));
        EXPECT_TRUE(pipeline.ready());
        expectRefused(text);
    }
}

TEST(FaceDetectionPipeline, FacesCarryTheRequestsNamesAndSkipTheLocatorWhenNone) {
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionPipeline pipeline;
    pipeline.init(pathsWithDetection(kDetection));
    stages.script.push_back({makeFace(0, 0, 10, 10, 1.0f), makeFace(5, 5, 15, 15, 2.0f)});
    std::vector<unsigned char> pixels(16 * 16);
    DetectionRequest request = requestFor(pixels, 16);
    request.dataSet = "set";
    request.filePath = "a/b.pgm";
    std::vector<FaceRecord> records = pipeline.detect(request);
    ASSERT_EQ(records.size(), 2u);
    for (const FaceRecord& r : records) EXPECT_EQ(r.dataSet() + "|" + r.filePath(), "set|a/b.pgm");
    EXPECT_EQ(records[1].faceScore(), 2.0f);
    EXPECT_TRUE(pipeline.detect(request).empty());
    EXPECT_EQ(stages.locateCalls, 1);
}

TEST(FaceDetectionApi, HandsOutFacesThatWentThroughTheTextForm) {
    qtest::ScriptedStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionApi api;
    api.init(FaceModelPathsHandle(nullptr));
    FaceData face = makeFace(3, 4, 50, 60, 0.1234567f);
    face.setLandmark("nose", Point2<float>(12.345678f, 1e-7f));
    stages.script.push_back({face});
    std::vector<unsigned char> pixels(64 * 64);
    std::vector<QVFace> faces = api.detect(requestFor(pixels, 64));
    ASSERT_EQ(faces.size(), 1u);
    EXPECT_EQ(faces[0].faceScore(), 0.123457f);
    EXPECT_EQ(faces[0].landmark("nose").x, 12.3457f);
    EXPECT_EQ(faces[0].landmark("nose").y, 1e-7f);
    EXPECT_EQ(faces[0].faceRect().right, 50);
    EXPECT_EQ(faces[0].dataSet() + faces[0].filePath(), "");
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
    std::vector<unsigned char> pixels(4);
    {
        FaceDetectionApi api;  // never initialised: the pipeline has no engines
        DetectionRequest request;
        EXPECT_EQ(messageOf([&] { api.detect(request); }), "QVFace Detection API detect error");
        EXPECT_EQ(messageOf([&] { api.setTrackingMode(QV_TRACKING_KF); }), "QVFace Detection API set mode error");
        EXPECT_EQ(messageOf([&] { api.setSearchStep(0.1f, 0.1f); }), "QVFace Detection API set search step error");
        EXPECT_EQ(messageOf([&] { api.setFaceSizeRange(32, 64); }),
                  "QVFace Detection API set face size range error");
        EXPECT_NO_THROW(api.release());
    }
    ThrowingStages stages;
    qtest::ScopedStages guard(stages);
    FaceDetectionApi api;
    api.init(FaceModelPathsHandle(nullptr));
    stages.what = ThrowingStages::What::ApiErr;  // an inner ApiError is replaced too
    EXPECT_EQ(messageOf([&] { api.detect(requestFor(pixels, 2)); }), "QVFace Detection API detect error");
    stages.what = ThrowingStages::What::Std;
    EXPECT_EQ(messageOf([&] { api.detect(requestFor(pixels, 2)); }), "QVFace Detection API detect error");
    EXPECT_EQ(messageOf([&] { api.setFaceSizeRange(1, 2); }), "QVFace Detection API set face size range error");
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
    FaceDetectionPipeline pipeline;
    pipeline.init(pathsWithDetection(small));
    ASSERT_TRUE(pipeline.ready());
    try {
        pipeline.detect(requestFor(pixels, 320));
        FAIL() << "a frame above imageMaxSize was searched";
    } catch (const qv_data_error& e) {
        EXPECT_STREQ(e.what(), "Image is larger than the maximum supported size");
    }
    EXPECT_NO_THROW(pipeline.detect(requestFor(pixels, 200)));

    FaceDetectionApi api;
    FaceModelPathsHandle handle;
    handle.fromJson(pathsWithDetection(small).toJson());
    api.init(handle);
    EXPECT_EQ(messageOf([&] { api.detect(requestFor(pixels, 320)); }), "QVFace Detection API detect error");
    EXPECT_NO_THROW(api.detect(requestFor(pixels, 200))) << "the session survives the refused frame";
}

}  // namespace
