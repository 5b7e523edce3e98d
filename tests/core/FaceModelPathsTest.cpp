#include <gtest/gtest.h>

#include <boost/algorithm/string/trim.hpp>

#include "core/ApiError.h"
#include "core/Descramble.h"
#include "core/FaceModelPaths.h"
#include "core/FaceModelPathsHandle.h"
#include "core/Json.h"
#include "core/ScrambledTexts.h"
#include "support/ExpectThrow.h"
#include "support/SourceTree.h"

extern const std::string g_defaultConfigurationText;

namespace {

std::string writeConfig(const std::string& name, const std::string& text) {
    const std::string file = sourcetree::scratchDir("face_model_paths") + "/" + name;
    sourcetree::writeText(file, text);
    return file;
}

}  // namespace

TEST(DefaultConfiguration, IsTheJsonSourceStoredIllegibly) {
    std::string source = sourcetree::readText(sourcetree::path("models/config/default.json"));
    EXPECT_EQ(g_defaultConfigurationText.size(), source.size());
    EXPECT_EQ(g_defaultConfigurationText.find("detection"), std::string::npos);
    FaceModelPaths fromSource;
    boost::algorithm::trim(source);
    fromSource.fromJson(source);
    EXPECT_EQ(FaceModelPaths(nullptr).toJson(), fromSource.toJson());
    // The handle loads the same and its copies are deep.
    FaceModelPathsHandle handle(nullptr), copy(handle);
    copy.fromJson("{}");
    EXPECT_EQ(handle.toJson(), fromSource.toJson());
}

TEST(FaceModelPathsFile, TrimsBlanksButNotCarriageReturnAndEveryFailureIsOneApiError) {
    const std::string body = "{\"detection\":{\"faceRects\":{}}}";
    EXPECT_EQ(FaceModelPaths(writeConfig("padded.json", "\n\t " + body + " \n\n\v\f").c_str()).detection(),
              "{\"faceRects\":{}}");
    const std::vector<std::string> failing = {
        writeConfig("crlf.json", body + "\r\n"), writeConfig("empty.json", ""), writeConfig("array.json", "[1]"),
        writeConfig("cut.json", "{\"detection\":{"), "/nonexistent/dir/config.json",
        sourcetree::scratchDir("face_model_paths_dir")};  // a directory
    for (const std::string& path : failing)
        expectThrowWith<ApiError>([&] { FaceModelPaths paths(path.c_str()); },
                                  descrambleText(scrambled::kConfigurationLoadFailed), path);
}
