// libFuzzer target: arbitrary bytes as the cascade model, read through the
// model reader by the detector's loader, then one search of a small frame
// with the built-in post filter behind it.
#include <string>
#include <vector>

#include "FuzzSupport.h"
#include "quorin/FaceData.h"
#include "quorin/FaceDetector.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const fuzz::ServedModel model("fzcb", std::vector<uint8_t>(data, data + size));
    static const char* const kConfig =
        "{\"detector\":{\"model\":\"fzcb\",\"imageMaxSize\":96,\"faceMinSize\":24,\"faceMaxSize\":96},"
        "\"postfilter\":{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"mdpb\"}}}";
    const int width = 80, height = 60;
    static const std::vector<unsigned char> frame = fuzz::testFrame(width, height);
    FaceDetector detector;
    std::vector<FaceData> faces;
    fuzz::refusalIsFine([&] {
        detector.init(kConfig);
        detector.detect(frame.data(), width, height, faces);
    });
    return 0;
}
