// Writes the seed corpora of the fuzz targets, one folder per target under
// OUT_DIR, from the built-in model payloads in MODELS_DIR (models/ of the
// source tree), the default configuration, the hand-written IVB layouts of the
// golden tests and small builders; with PHOTO, also a real frame for the C API.
//   fuzz_seeds MODELS_DIR OUT_DIR [PHOTO]
// Nothing here is committed: the corpora are made fresh for each campaign.
#include <cstdio>
#include <fstream>
#include <iterator>
#include <map>
#include <stdexcept>
#include <string>
#include <sys/stat.h>
#include <vector>

#include "NetWriter.h"
#include "StbImageDecoder.h"
#include "core/Json.h"
#include "quorin/FaceData.h"
#include "quorin/JvwFile.h"
#include "quorin/Point2.h"
#include "quorin/Rect2.h"
#include "support/IvbGolden.h"
#include "support/PostFilterModels.h"
#include "support/SquareCascade.h"

namespace {

typedef std::vector<uint8_t> Bytes;

std::string outDir;

void put(const std::string& target, const std::string& name, const Bytes& bytes) {
    const std::string dir = outDir + "/" + target;
    ::mkdir(dir.c_str(), 0755);
    std::ofstream(dir + "/" + name, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

Bytes text(const std::string& s, const std::string& prefix = "") {
    const std::string all = prefix + s;
    return Bytes(all.begin(), all.end());
}

Bytes prefixed(uint8_t first, Bytes rest) {
    rest.insert(rest.begin(), first);
    return rest;
}

Bytes readFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) throw std::runtime_error("cannot read " + path);
    return Bytes(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

uint32_t le32(const Bytes& b, size_t at) {
    return uint32_t(b.at(at)) | uint32_t(b.at(at + 1)) << 8 | uint32_t(b.at(at + 2)) << 16 |
           uint32_t(b.at(at + 3)) << 24;
}

// The C API target's layout: width-1, height-1 (16 bits each), mode, entry,
// rotation, maxFaces, then pixels.
Bytes apiInput(int width, int height, uint8_t mode, uint8_t entry, uint8_t rotation, const Bytes& pixels) {
    Bytes b = {uint8_t((width - 1) & 0xFF), uint8_t((width - 1) >> 8), uint8_t((height - 1) & 0xFF),
               uint8_t((height - 1) >> 8), mode, entry, rotation, 10};
    b.insert(b.end(), pixels.begin(), pixels.end());
    return b;
}

void writeApiSeeds(const char* photo) {
    put("quorin_api", "flat", apiInput(64, 48, 0, 0, 0, {0x80}));
    put("quorin_api", "stripes", apiInput(120, 90, 1, 2, 1, {0, 255, 0, 255, 30}));
    if (photo == nullptr) return;
    int w = 0, h = 0, n = 0;
    unsigned char* gray = stbi_load(photo, &w, &h, &n, 1);
    if (gray == nullptr) throw std::runtime_error(std::string("cannot decode ") + photo);
    // Nearest-neighbour to a long side of 200: small enough for a fast run,
    // large enough that the faces of a development photo are still found.
    const double f = 200.0 / std::max(w, h);
    const int sw = std::max(1, int(w * f)), sh = std::max(1, int(h * f));
    Bytes pixels(size_t(sw) * sh);
    for (int y = 0; y < sh; ++y)
        for (int x = 0; x < sw; ++x) pixels[size_t(y) * sw + x] = gray[size_t(int(y / f)) * w + int(x / f)];
    stbi_image_free(gray);
    for (uint8_t entry = 0; entry < 8; ++entry)
        put("quorin_api", "photo" + std::to_string(entry), apiInput(sw, sh, entry % 3, entry, entry, pixels));
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3 && argc != 4) {
        std::fprintf(stderr, "usage: fuzz_seeds MODELS_DIR OUT_DIR [PHOTO]\n");
        return 2;
    }
    const std::string models = argv[1];
    outDir = argv[2];
    try {
        put("ivb_unpacker", "floats", ivbgolden::compositeWithFloats());
        put("ivb_unpacker", "empty", ivbgolden::emptyComposite());
        put("ivb_unpacker", "property", ivbgolden::uint32Property());
        put("ivb_unpacker", "blob", ivbgolden::byteBlob());
        put("ivb_unpacker", "facemodel", ivbgolden::faceModel());
        put("ivb_unpacker", "quantizer", ivbgolden::vectorQuantizer());
        put("ivb_unpacker", "centroids", ivbgolden::nearestCentroids());
        put("ivb_unpacker", "pca", ivbgolden::pcaTransform());
        put("ivb_memory_reader", "one_object", ivbgolden::streamWithOneObject());
        put("ivb_memory_reader", "smallest", ivbgolden::smallestStream());

        // The default configuration and the two engine texts inside it.
        const Bytes configFile = readFile(models + "/config/default.json");
        std::string config(configFile.begin(), configFile.end());
        while (!config.empty() && isJsonWhiteSpace(config.back())) config.pop_back();
        const auto detection = parseJsonObject(parseJsonObject(config).at("detection"));
        const std::string rects = detection.at("faceRects"), parts = detection.at("faceParts");
        put("config", "detector", text(rects, "D"));
        put("config", "locator", text(parts, "L"));

        FaceData face;
        face.setFaceRect(Rect2<int32_t>(10, 20, 110, 120));
        face.setFaceScore(0.75f);
        face.setLandmark("leftEye", Point2<float>(35.5f, 55.25f));
        face.setPersonName("someone");
        const std::string faceText = face.toJson();
        put("json", "config", text(config, std::string(1, '\0')));
        put("json", "array", text("[1, -2.5e3,\"a\",{\"b\":[true,false]}, [ ]]", "\x01"));
        put("json", "landmarks", text("{\"nose\":{\"x\":1.5,\"y\":-2}}", "\x02"));
        for (char pick = 3; pick <= 5; ++pick) put("json", "face" + std::to_string(int(pick)), text(faceText, std::string(1, pick)));
        put("json", "paths", text(config, "\x06"));
        put("json", "gauss1d", text("{\"sigma\":1.5,\"size\":7}", "\x09"));
        put("json", "gauss2d", text("{\"sigmaX\":1.5,\"sigmaY\":2,\"sizeX\":5,\"sizeY\":5}", "\x0b"));
        put("json", "normalizer", text("{\"threshold\":0.2}", "\x0e"));

        const std::string jvw = outDir + "/seed.jvw";
        {
            JvwWriter writer(jvw);
            writer.writeFaces({face, FaceData()});
        }
        put("jvw", "two_faces", readFile(jvw));
        std::remove(jvw.c_str());

        put("cascade_model", "builtin", readFile(models + "/mdcb.bin"));
        put("cascade_model", "square", CascadeWriter::toBytes(squareCascade()));
        put("post_filter_model", "ilabs_builtin", prefixed(0, readFile(models + "/mdpb.bin")));
        put("post_filter_model", "ilabs_small", prefixed(0, pftest::ilabsThresholdModel(5, {0.5f})));
        const auto svm = pftest::svmThresholdModel(7, 0.25f);
        put("post_filter_model", "svm", prefixed(1, postfilterwriters::svmModelPayload(svm, svm)));

        // The net container, and the blob of its first item alone.
        const Bytes container = readFile(models + "/mdnb.bin");
        put("net_container", "builtin", prefixed(0, container));
        put("net_container", "builtin_fixed", prefixed(1, container));
        const uint32_t at = le32(container, 72), length = le32(container, 72 + 12);
        const Bytes blob(container.begin() + at, container.begin() + at + length);
        put("net_blob", "builtin", blob);
        const auto small = netwriter::denseNet({4, 3, 2}, {0, 1, 2}, {1, 1, 1}, 7);
        put("net_blob", "dense", netwriter::writeBlob(small));
        put("net_container", "dense", prefixed(1, netwriter::writeContainer({netwriter::writeBlob(small)})));

        writeApiSeeds(argc == 4 ? argv[3] : nullptr);
    } catch (const std::exception& e) {
        std::fprintf(stderr, "fuzz_seeds: %s\n", e.what());
        return 1;
    }
    return 0;
}
