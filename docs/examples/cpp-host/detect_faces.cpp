// Detects faces in a binary PGM (P5, 8-bit) with the library's FaceDetector
// and prints one line per face: left top right bottom score.
//
//   detect_faces photo.pgm

#include <quorin/Errors.h>
#include <quorin/FaceData.h>
#include <quorin/FaceDetector.h>
#include <quorin/JsonError.h>

#include <cstdio>
#include <exception>
#include <fstream>
#include <string>
#include <vector>

namespace {

// The detector's configuration: the built-in cascade "mdcb" for frames with a
// long side up to 1024 pixels and faces from 32 pixels up, and the built-in
// post filter "mdpb" that removes the cascade's false hits.
const char* const kDetectorConfiguration = R"({
  "detector": {"model": "mdcb", "imageMaxSize": 1024, "faceMinSize": 32, "faceMaxSize": 1024},
  "postfilter": {"name": "ILABS_POSTFILTER", "param": {"model": "mdpb"}}
})";

struct GrayImage {
    int width = 0;
    int height = 0;
    std::vector<unsigned char> pixels;
};

// Reads "P5 <width> <height> 255" and the pixels; false on anything else.
bool readPgm(const char* path, GrayImage& image) {
    std::ifstream in(path, std::ios::binary);
    std::string magic;
    int maxValue = 0;
    if (!(in >> magic >> image.width >> image.height >> maxValue) || magic != "P5" || maxValue != 255)
        return false;
    if (image.width <= 0 || image.height <= 0 || image.width > 16384 || image.height > 16384) return false;
    in.get();  // the single white-space character before the pixels
    image.pixels.resize(static_cast<size_t>(image.width) * static_cast<size_t>(image.height));
    in.read(reinterpret_cast<char*>(image.pixels.data()), static_cast<std::streamsize>(image.pixels.size()));
    return static_cast<size_t>(in.gcount()) == image.pixels.size();
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::fprintf(stderr, "usage: %s photo.pgm\n", argv[0]);
        return 2;
    }
    GrayImage image;
    if (!readPgm(argv[1], image)) {
        std::fprintf(stderr, "%s: not a binary 8-bit PGM file\n", argv[1]);
        return 1;
    }
    try {
        FaceDetector detector;
        detector.init(kDetectorConfiguration);
        detector.setSearchStep(0.1f, 0.1f);  // a tenth of the window: thorough

        std::vector<FaceData> faces;
        detector.detect(image.pixels.data(), image.width, image.height, faces);
        std::printf("%zu faces\n", faces.size());
        for (const FaceData& face : faces) {
            const Rect2<int32_t>& r = face.faceRect();
            std::printf("face %d %d %d %d %.3f\n", r.left, r.top, r.right, r.bottom, face.faceScore());
        }
    } catch (const qv_data_error& e) {
        // For example a frame larger than imageMaxSize.
        std::fprintf(stderr, "unusable data: %s\n", e.what());
        return 3;
    } catch (const std::exception& e) {
        std::fprintf(stderr, "detector error: %s\n", e.what());
        return 3;
    }
    return 0;
}
