// FaceDetectionApi: a frame above the detector's bound ends in the API's own
// message, and the session goes on.

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "api/FaceDetectionApi.h"
#include "core/ApiError.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "support/ExpectThrow.h"

namespace {

DetectionRequest requestFor(const std::vector<unsigned char>& pixels, int side) {
    DetectionRequest request;
    request.pixels = pixels.data();
    request.width = request.height = side;
    return request;
}

TEST(FaceDetectionApi, OversizedFrameFromTheRealDetectorBecomesItsDetectError) {
    // Real engines, with a bound below the frame: the work frame of the
    // thorough mode keeps a 320-pixel frame as it is.
    const char* const small =
        R"({"faceRects":{"detector":{"model":"mdcb","imageMaxSize":200,"faceMinSize":24,"faceMaxSize":200},)"
        R"("postfilter":{"name":"ILABS_POSTFILTER","param":{"model":"mdpb"}}},"faceParts":{"neuralNetModelPath":"mdnb"}})";
    std::vector<unsigned char> pixels(320 * 320, 128);
    FaceModelPaths paths;
    paths.setDetection(small);
    FaceModelPathsHandle handle;
    handle.fromJson(paths.toJson());
    FaceDetectionApi api;
    api.init(handle);
    expectThrowWith<ApiError>([&] { api.detect(requestFor(pixels, 320)); }, "QVFace Detection API detect error");
    EXPECT_NO_THROW(api.detect(requestFor(pixels, 200))) << "the session survives the refused frame";
}

}  // namespace
