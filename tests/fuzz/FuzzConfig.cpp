// libFuzzer target: arbitrary configuration texts for the two engines the
// session builds, with the built-in models. The first byte picks the engine
// ('L' the face part locator, anything else the face detector); an engine that
// accepts its text is then run once on a small frame.
#include <string>
#include <vector>

#include "FuzzSupport.h"
#include "quorin/Rect2.h"
#include "faceparts/FacePartLocator.h"
#include "quorin/FaceData.h"
#include "quorin/FaceDetector.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    fuzz::Input in(data, size);
    const bool locator = in.byte() == 'L';
    const std::vector<uint8_t> bytes = in.rest();
    const std::string text(bytes.begin(), bytes.end());
    const int width = 64, height = 48;
    static const std::vector<unsigned char> frame = fuzz::testFrame(width, height);
    std::vector<FaceData> faces;
    if (locator) {
        FacePartLocator parts;
        fuzz::refusalIsFine([&] {
            parts.init(text);
            FaceData face;
            face.setFaceRect(Rect2<int32_t>(8, 4, 48, 44));
            faces.push_back(face);
            parts.locateParts(frame.data(), width, height, faces);
        });
    } else {
        FaceDetector detector;
        fuzz::refusalIsFine([&] {
            detector.init(text);
            detector.detect(frame.data(), width, height, faces);
        });
    }
    return 0;
}
