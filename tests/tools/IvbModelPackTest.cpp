// tools/pack_ivb_models puts the three built-in payloads into one IVB stream.
// Served as a model, the stream gives each payload back through IVB mode, byte
// for byte, and engines built from those payloads find what the built-in
// models find on a real photo.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>

#include "StbImageDecoder.h"
#include "container/ModelReader.h"
#include "core/ModelRegistry.h"
#include "quorin/FaceDetector.h"
#include "quorin/quorinapi.h"
#include "support/DevData.h"
#include "support/ScopedModel.h"
#include "support/SourceTree.h"

namespace {

const std::vector<std::string> kNames = {"mdcb", "mdnb", "mdpb"};

// Every 17-int block quorin_detect gives for the frame in mode 2.
std::vector<int> blocks(std::vector<unsigned char> frame, int w, int h) {
    quorin_init();
    std::vector<int> out(17 * 100);
    const int n = quorin_detect(frame.data(), w, h, out.data(), 100, 0);
    quorin_release();
    out.resize(static_cast<std::size_t>(17 * std::max(n, 0)));
    return out;
}

std::vector<std::string> detectorFaces(const std::string& cascade, const std::string& postFilter,
                                       const std::vector<unsigned char>& gray, int w, int h) {
    FaceDetector detector;
    detector.init(R"({"detector":{"model":")" + cascade +
                  R"(","imageMaxSize":1024,"faceMinSize":32,"faceMaxSize":1024},)"
                  R"("postfilter":{"name":"ILABS_POSTFILTER","param":{"model":")" + postFilter + R"("}}})");
    std::vector<FaceData> faces;
    detector.detect(gray.data(), w, h, faces);
    std::vector<std::string> out;
    for (const FaceData& face : faces) out.push_back(face.toJson());
    return out;
}

TEST(IvbModelPack, PayloadsComeBackThroughIvbModeAndFindTheSameFaces) {
    const std::string out = sourcetree::scratchDir("pack_ivb_models") + "/models.ivb";
    std::string command = std::string("'") + QUORIN_PACK_IVB_MODELS + "' '" + out + "'";
    for (const std::string& name : kNames) command += " '" + sourcetree::path("models/" + name + ".bin") + "'";
    ASSERT_EQ(std::system(command.c_str()), 0) << command;
    const ScopedModel stream = ScopedModel::raw("mdivb", sourcetree::readBytes(out));

    // Each object, by name and in order, is a basic object of raw bytes
    // holding the built-in payload as the library has it.
    ModelReader walk("mdivb", ModelReader::IVB);
    std::vector<std::vector<uint8_t>> payloads;
    for (const std::string& name : kNames) {
        ModelReader raw(name, ModelReader::RAW);
        std::vector<uint8_t> builtIn(raw.rawSize());
        raw.read(builtIn.data(), 1, raw.rawSize());
        ASSERT_EQ(builtIn, sourcetree::readBytes(sourcetree::path("models/" + name + ".bin"))) << name;
        const std::vector<uint8_t> named = ModelReader("mdivb::" + name, ModelReader::IVB).readObject();
        ASSERT_EQ(named.size(), builtIn.size() + 16) << name;
        EXPECT_EQ(named[8], 1) << name;  // a basic object
        EXPECT_EQ(named[9], 1) << name;  // of raw bytes
        payloads.emplace_back(named.begin() + 16, named.end());
        EXPECT_EQ(payloads.back(), builtIn) << name;
        EXPECT_EQ(walk.readObject(), named) << name;
    }
    EXPECT_TRUE(walk.readObject().empty());

    const std::string photo = devdata::photo("tracking_faces.jpg");
    if (!devdata::exists(photo)) GTEST_SKIP() << "photo tracking_faces.jpg: " << devdata::missingNote();
    int w = 0, h = 0, channels = 0;
    unsigned char* pixels = stbi_load(photo.c_str(), &w, &h, &channels, 1);
    ASSERT_NE(pixels, nullptr) << photo;
    const std::vector<unsigned char> gray(pixels, pixels + static_cast<std::size_t>(w) * h);
    stbi_image_free(pixels);

    // A FaceDetector configured with the payloads under names of their own.
    const std::vector<std::string> builtInFaces = detectorFaces("mdcb", "mdpb", gray, w, h);
    ASSERT_GE(builtInFaces.size(), 3u) << "the photo shows three faces";
    {
        ScopedModel cascade("ivb_cascade", payloads[0]), postFilter("ivb_postfilter", payloads[2]);
        EXPECT_EQ(detectorFaces("ivb_cascade", "ivb_postfilter", gray, w, h), builtInFaces);
    }
    // The whole engine, landmark net included, with the payloads served in
    // place of the built-in ranges: the same 17-int blocks.
    const std::vector<int> builtInBlocks = blocks(gray, w, h);
    ASSERT_EQ(builtInBlocks.size(), 17 * builtInFaces.size());
    std::vector<ScopedModel> served;
    served.reserve(kNames.size());
    for (std::size_t i = 0; i < kNames.size(); ++i) {
        served.emplace_back(kNames[i], payloads[i]);
        const uint8_t* begin = nullptr;
        const uint8_t* end = nullptr;
        ASSERT_TRUE(ModelRegistry::instance().findModel(kNames[i], begin, end));
        ASSERT_EQ(begin, served[i].packed().data()) << kNames[i] << " is served from the IVB payload";
    }
    EXPECT_EQ(blocks(gray, w, h), builtInBlocks);
}

}  // namespace
