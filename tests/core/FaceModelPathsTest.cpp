#include <gtest/gtest.h>

#include <boost/algorithm/string/trim.hpp>

#include "core/ApiError.h"
#include "core/Descramble.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "core/Json.h"
#include "core/ScrambledTexts.h"
#include "support/SourceTree.h"

extern const std::string g_defaultConfigurationText;

namespace {

std::string stringItem(const std::map<std::string, std::string>& items, const char* key) {
    std::string value;
    EXPECT_TRUE(jsonObjectItemToNamedValue(items, key, value)) << key;
    return value;
}

void expectLoadFailure(const char* path) {
    try {
        FaceModelPaths paths(path);
        ADD_FAILURE() << "loaded " << (path ? path : "(default)");
    } catch (const ApiError& e) {
        EXPECT_EQ(std::string(e.what()), descrambleText(scrambled::kConfigurationLoadFailed));
    }
}

std::string writeConfig(const std::string& name, const std::string& text) {
    const std::string file = sourcetree::scratchDir("face_model_paths") + "/" + name;
    sourcetree::writeText(file, text);
    return file;
}

}  // namespace

TEST(DefaultConfiguration, IsTheJsonSourceStoredIllegibly) {
    std::string source = sourcetree::readText(sourcetree::path("models/config/default.json"));
    ASSERT_FALSE(source.empty());
    EXPECT_EQ(g_defaultConfigurationText.size(), source.size());
    EXPECT_EQ(g_defaultConfigurationText.find("detection"), std::string::npos);
    EXPECT_EQ(g_defaultConfigurationText.find("mdcb"), std::string::npos);

    FaceModelPaths fromSource;
    boost::algorithm::trim(source);
    fromSource.fromJson(source);
    FaceModelPaths builtIn(nullptr);
    EXPECT_EQ(builtIn.toJson(), fromSource.toJson());
}

TEST(DefaultConfiguration, CarriesWhatTheDetectorAndLocatorRead) {
    FaceModelPaths paths(nullptr);
    const auto detection = parseJsonObject(paths.detection());
    const auto faceRects = parseJsonObject(detection.at("faceRects"));
    const auto faceParts = parseJsonObject(detection.at("faceParts"));
    const auto detector = parseJsonObject(faceRects.at("detector"));
    const auto postfilter = parseJsonObject(faceRects.at("postfilter"));

    int imageMaxSize = 0, faceMinSize = 0, faceMaxSize = 0;
    ASSERT_TRUE(jsonObjectItemToNamedValue(detector, "imageMaxSize", imageMaxSize));
    ASSERT_TRUE(jsonObjectItemToNamedValue(detector, "faceMinSize", faceMinSize));
    ASSERT_TRUE(jsonObjectItemToNamedValue(detector, "faceMaxSize", faceMaxSize));
    EXPECT_GE(imageMaxSize, 640) << "work frames of the high mode are 640 on the long side";
    EXPECT_GE(faceMinSize, 24);
    EXPECT_LE(faceMinSize, faceMaxSize);

    EXPECT_EQ(stringItem(postfilter, "name"), "ILABS_POSTFILTER");
    const auto postfilterParam = parseJsonObject(postfilter.at("param"));

    EXPECT_EQ(stringItem(detector, "model"), "mdcb");
    EXPECT_EQ(stringItem(postfilterParam, "model"), "mdpb");
    EXPECT_EQ(stringItem(faceParts, "neuralNetModelPath"), "mdnb");
}

TEST(FaceModelPathsText, ReadsAllFourFieldsAndWritesNonEmptyOnesCompactly) {
    FaceModelPaths paths;
    paths.setAttribute("{\"old\":1}");
    paths.fromJson("{ \"recognition\" :  {\"r\": 1} ,\"detection\":{\"d\" : [1, 2]},\"other\":3}");
    EXPECT_EQ(paths.detection(), "{\"d\" : [1, 2]}");
    EXPECT_EQ(paths.recognition(), "{\"r\": 1}");
    EXPECT_EQ(paths.representation(), "");
    EXPECT_EQ(paths.attribute(), "");  // overwritten although absent
    EXPECT_EQ(paths.toJson(), "{\"detection\":{\"d\" : [1, 2]},\"recognition\":{\"r\": 1}}");

    // A malformed text leaves the fields alone.
    EXPECT_THROW(paths.fromJson(""), JsonError);
    EXPECT_THROW(paths.fromJson("{\"detection\":{}"), JsonError);
    EXPECT_EQ(paths.detection(), "{\"d\" : [1, 2]}");
    paths.fromJson("{}");
    EXPECT_EQ(paths.toJson(), "{}");
}

TEST(FaceModelPathsFile, TrimsLineFeedsAndBlanksButNotCarriageReturn) {
    const std::string body = "{\"detection\":{\"faceRects\":{}}}";
    FaceModelPaths padded(writeConfig("padded.json", "\n\t " + body + " \n\n\v\f").c_str());
    EXPECT_EQ(padded.detection(), "{\"faceRects\":{}}");
    expectLoadFailure(writeConfig("crlf.json", body + "\r\n").c_str());
}

TEST(FaceModelPathsFile, EveryFailureIsOneApiError) {
    expectLoadFailure(writeConfig("empty.json", "").c_str());
    expectLoadFailure(writeConfig("array.json", "[1]").c_str());
    expectLoadFailure(writeConfig("cut.json", "{\"detection\":{").c_str());
    expectLoadFailure("/nonexistent/dir/config.json");
    expectLoadFailure(sourcetree::scratchDir("face_model_paths_dir").c_str());  // a directory
}

TEST(FaceModelPathsHandle, LoadsTheDefaultAndCopiesDeeply) {
    FaceModelPathsHandle handle(nullptr);
    FaceModelPaths direct(nullptr);
    EXPECT_EQ(handle.toJson(), direct.toJson());

    FaceModelPathsHandle copy(handle);
    copy.fromJson("{\"attribute\":{}}");
    EXPECT_EQ(copy.toJson(), "{\"attribute\":{}}");
    EXPECT_EQ(handle.toJson(), direct.toJson());
    handle = copy;
    EXPECT_EQ(handle.toJson(), "{\"attribute\":{}}");

    EXPECT_THROW(FaceModelPathsHandle(writeConfig("bad.json", "{").c_str()), ApiError);
}
