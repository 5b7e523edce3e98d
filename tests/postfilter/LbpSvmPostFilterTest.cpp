#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/Errors.h"
#include "image/IntegralImage.h"
#include "postfilter/LbpSvmPostFilter.h"
#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"

using pftest::binIndex;
using pftest::hit;
using pftest::svmThresholdModel;

namespace {

std::vector<ScoredWindow> run(const PostFilter& f, const std::vector<ScoredWindow>& in)
{
    std::vector<uint8_t> pixels = pftest::halfRampFrame();
    IN_IMAGE image;
    image.Init(24, 24, 24, pixels.data());
    std::vector<ScoredWindow> out;
    f.filter(image, in, &out);
    return out;
}

// Serves a model file of two SVMs under `name`.
ScopedModel serve(const char* name, const postfilterwriters::SvmModelParams& primary,
                  const postfilterwriters::SvmModelParams& secondary)
{
    return ScopedModel(name, postfilterwriters::svmModelPayload(primary, secondary));
}

} // namespace

TEST(LbpSvmJudgement, EveryHitIsJudgedAndOnlyLabelOnePasses)
{
    // Passes when the cascade score is above 50: even a score of 9 is judged.
    ScopedModel m = serve("pf_svm_score", svmThresholdModel(0, 50.0f), svmThresholdModel(0, 50.0f));
    std::vector<ScoredWindow> in = {hit(9.0f, 0), hit(60.0f, 0), hit(51.0f, 4)};
    std::vector<ScoredWindow> out = run(LbpSvmPostFilter("pf_svm_score"), in);
    ASSERT_EQ(out.size(), 2u);
    EXPECT_TRUE(pftest::sameHit(out[0], in[1]));
    EXPECT_TRUE(pftest::sameHit(out[1], in[2]));
    // Class 0 always wins, but its label is 2.
    ScopedModel two = serve("pf_svm_label", svmThresholdModel(0, -1000.0f, 2, 1), svmThresholdModel(0, -1000.0f, 2, 1));
    EXPECT_TRUE(run(LbpSvmPostFilter("pf_svm_label"), {hit(1.0f, 0), hit(1.0f, 1)}).empty());
    LbpSvmPostFilter none;
    EXPECT_THROW(run(none, {hit(10.0f, 0)}), qv_unsupported_error);
}

TEST(LbpSvmJudgement, OnlyCategoryZeroGoesToThePrimaryModel)
{
    ScopedModel m = serve("pf_svm_route", svmThresholdModel(0, -1000.0f), svmThresholdModel(0, 1000.0f));
    std::vector<ScoredWindow> out =
        run(LbpSvmPostFilter("pf_svm_route"), {hit(1.0f, 0), hit(1.0f, 3), hit(1.0f, -1), hit(2.0f, 0)});
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[0].score, 1.0f);
    EXPECT_EQ(out[1].score, 2.0f);
}

TEST(LbpSvmJudgement, HistogramIsTakenOnTheTransposedPatch)
{
    // Transposed, the flat right half of the frame becomes the bottom half:
    // cell (3, 0) counts 25 pixels of code 0 and cell (0, 3) none.
    ScopedModel flat = serve("pf_svm_t30", svmThresholdModel(binIndex(3, 0, 0), 24.5f),
                             svmThresholdModel(binIndex(3, 0, 0), 24.5f));
    ScopedModel ramp = serve("pf_svm_t03", svmThresholdModel(binIndex(0, 3, 0), 0.0f),
                             svmThresholdModel(binIndex(0, 3, 0), 0.0f));
    EXPECT_EQ(run(LbpSvmPostFilter("pf_svm_t30"), {hit(1.0f, 0)}).size(), 1u);
    EXPECT_EQ(run(LbpSvmPostFilter("pf_svm_t03"), {hit(1.0f, 0)}).size(), 0u);
}

TEST(LbpSvmConfiguration, JsonAndModelOfAnotherLength)
{
    postfilterwriters::SvmModelParams shortModel = svmThresholdModel(0, 0.0f);
    shortModel.featureLength = 10;
    shortModel.supportVectors[0].resize(10);
    ScopedModel m = serve("pf_svm_short", shortModel, shortModel);
    LbpSvmPostFilter f;
    f.fromJson("{\"model\":\"pf_svm_short\"}");
    EXPECT_EQ(f.toJson(), "{\"model\":\"pf_svm_short\"}");
    EXPECT_THROW(run(f, {hit(1.0f, 1)}), qv_data_error);
}

TEST(LbpSvmFeature, ToolMirrorGivesTheSameTransposedFeature)
{
    if (!pftest::featureMirrorAvailable())
        GTEST_SKIP() << "no system Python with numpy";
    std::vector<uint8_t> pixels = pftest::noisyFrame(64, 50, 23);
    const std::string framePath = ::testing::TempDir() + "pf_mirror_svm_frame.raw";
    pftest::writeFile(framePath, pixels);
    IN_IMAGE image;
    image.Init(64, 50, 64, pixels.data());
    const ScoredWindow h = hit(-1.75f, 2, {5, 49, 3, 47});
    std::vector<std::string> lines = pftest::runFeatureMirror("--frame " + framePath + " --width 64 --height 50 --transpose" +
                                                              pftest::hitArguments({h}));
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(pftest::parseFloats(lines[0]), LbpSvmPostFilter().feature(image, h));
}
