#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"
#include "core/Errors.h"
#include "image/IntegralImage.h"
#include "postfilter/LbpSvmPostFilter.h"

using pftest::binIndex;
using pftest::svmThresholdModel;

namespace {

ScoredWindow hit(float score, int category)
{
    ScoredWindow s;
    s.score = score;
    s.category = category;
    s.window = {0, 24, 0, 24};
    s.categoryScores[2] = 0.5f;
    return s;
}

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
ScopedModel serve(const char* name, const postfilterwriters::SvmModelSpec& primary,
                  const postfilterwriters::SvmModelSpec& secondary)
{
    return ScopedModel(name, postfilterwriters::svmModelPayload(primary, secondary));
}

} // namespace

TEST(LbpSvmJudgement, EveryHitIsJudgedEvenAHighScore)
{
    // Passes when the cascade score is above 50: a score of 9 is rejected.
    ScopedModel m = serve("pf_svm_score", svmThresholdModel(0, 50.0f), svmThresholdModel(0, 50.0f));
    LbpSvmPostFilter f("pf_svm_score");
    std::vector<ScoredWindow> out = run(f, {hit(9.0f, 0), hit(60.0f, 0), hit(51.0f, 4)});
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[0].score, 60.0f);
    EXPECT_EQ(out[1].score, 51.0f);
    EXPECT_EQ(out[1].categoryScores[2], 0.5f);
}

TEST(LbpSvmJudgement, OnlyCategoryZeroGoesToThePrimaryModel)
{
    // The primary passes everything, the secondary nothing.
    ScopedModel m = serve("pf_svm_route", svmThresholdModel(0, -1000.0f), svmThresholdModel(0, 1000.0f));
    LbpSvmPostFilter f("pf_svm_route");
    std::vector<ScoredWindow> out = run(f, {hit(1.0f, 0), hit(1.0f, 3), hit(1.0f, -1), hit(2.0f, 0)});
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[0].score, 1.0f);
    EXPECT_EQ(out[1].score, 2.0f);
}

TEST(LbpSvmJudgement, OnlyLabelOnePasses)
{
    // Class 0 always wins, but its label is 2.
    ScopedModel m = serve("pf_svm_label", svmThresholdModel(0, -1000.0f, 2, 1), svmThresholdModel(0, -1000.0f, 2, 1));
    EXPECT_TRUE(run(LbpSvmPostFilter("pf_svm_label"), {hit(1.0f, 0), hit(1.0f, 1)}).empty());
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

TEST(LbpSvmJudgement, WithoutAModelAJudgedHitIsRefused)
{
    LbpSvmPostFilter f;
    EXPECT_THROW(run(f, {hit(10.0f, 0)}), qv_unsupported_error);
    EXPECT_TRUE(run(f, {}).empty());
}

TEST(LbpSvmConfiguration, NameJsonAndModelOfAnotherLength)
{
    postfilterwriters::SvmModelSpec shortModel = svmThresholdModel(0, 0.0f);
    shortModel.featureLength = 10;
    for (auto& sv : shortModel.supportVectors)
        sv.resize(10);
    ScopedModel m = serve("pf_svm_short", shortModel, shortModel);
    LbpSvmPostFilter f;
    EXPECT_EQ(f.name(), "LBP_SVM_POSTFILTER");
    f.fromJson("{\"model\":\"pf_svm_short\"}");
    EXPECT_EQ(f.toJson(), "{\"model\":\"pf_svm_short\"}");
    EXPECT_THROW(run(f, {hit(1.0f, 1)}), qv_data_error);
}

TEST(LbpSvmFeature, ToolMirrorGivesTheSameTransposedFeature)
{
    if (!pftest::featureMirrorAvailable())
        GTEST_SKIP() << "no system Python with numpy";
    const int width = 64, height = 50;
    std::vector<uint8_t> pixels = pftest::noisyFrame(width, height, 23);
    const std::string framePath = ::testing::TempDir() + "pf_mirror_svm_frame.raw";
    pftest::writeFile(framePath, pixels);
    IN_IMAGE image;
    image.Init(width, height, width, pixels.data());
    LbpSvmPostFilter filter;
    ScoredWindow h = hit(-1.75f, 2);
    h.window = {5, 49, 3, 47};
    std::vector<std::string> lines = pftest::runFeatureMirror("--frame " + framePath +
                                                              " --width 64 --height 50 --transpose --hit=5,49,3,47,-1.75");
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(pftest::parseFloats(lines[0]), filter.feature(image, h));
}
