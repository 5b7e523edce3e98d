#include <gtest/gtest.h>

#include <cmath>
#include <random>
#include <string>
#include <vector>

#include "core/Errors.h"
#include "image/IntegralImage.h"
#include "postfilter/ILabsPostFilter.h"
#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"

using pftest::hit;
using pftest::ilabsThresholdModel;

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

} // namespace

TEST(ILabsFastPass, HighScoresPassWholeAndInOrderWithoutAModel)
{
    ILabsPostFilter f;
    std::vector<ScoredWindow> in = {hit(6.0f, 14, {3, 20, 2, 19}), hit(9.5f, 0), hit(6.25f, 7)};
    std::vector<ScoredWindow> out = run(f, in);
    ASSERT_EQ(out.size(), 3u);
    for (std::size_t i = 0; i < in.size(); ++i)
        EXPECT_TRUE(pftest::sameHit(out[i], in[i])) << i;
    // Just below 6 goes to the model, and there is none.
    EXPECT_THROW(run(f, {hit(std::nextafter(6.0f, 0.0f), 0)}), qv_invalid_argument);
    EXPECT_TRUE(run(f, {}).empty());
}

TEST(ILabsJudgement, CascadeScoreIsTheFirstFeatureAndEachCategoryHasItsModel)
{
    // Category c passes a hit when its score is above c; 0 above is a rejection.
    std::vector<float> biases;
    for (int c = 0; c < 15; ++c)
        biases.push_back(float(c));
    ScopedModel model("pf_ilabs_cats", ilabsThresholdModel(0, biases));
    ILabsPostFilter f("pf_ilabs_cats");
    std::vector<ScoredWindow> out =
        run(f, {hit(5.0f, 3), hit(5.0f, 5), hit(5.0f, 14), hit(5.0f, 4), hit(2.5f, 2), hit(2.0f, 2)});
    ASSERT_EQ(out.size(), 3u);
    EXPECT_EQ(out[0].category, 3);
    EXPECT_EQ(out[1].category, 4);
    EXPECT_EQ(out[2].score, 2.5f);
    EXPECT_THROW(run(f, {hit(5.0f, 15)}), qv_invalid_argument);
}

TEST(ILabsJudgement, HistogramIsTakenOnTheScaledPatchRowByRow)
{
    // The right half of the frame is flat: its top-right cell counts exactly
    // 25 pixels of code 0, its bottom-left cell (ramp) none.
    ScopedModel tr("pf_ilabs_tr", ilabsThresholdModel(pftest::binIndex(0, 3, 0), {24.5f}));
    ScopedModel tr25("pf_ilabs_tr25", ilabsThresholdModel(pftest::binIndex(0, 3, 0), {25.0f}));
    ScopedModel bl("pf_ilabs_bl", ilabsThresholdModel(pftest::binIndex(3, 0, 0), {0.0f}));
    EXPECT_EQ(run(ILabsPostFilter("pf_ilabs_tr"), {hit(1.0f, 0)}).size(), 1u);
    EXPECT_EQ(run(ILabsPostFilter("pf_ilabs_tr25"), {hit(1.0f, 0)}).size(), 0u);
    EXPECT_EQ(run(ILabsPostFilter("pf_ilabs_bl"), {hit(1.0f, 0)}).size(), 0u);

    // The same pattern at twice the size shrinks back to the patch.
    std::vector<uint8_t> small = pftest::halfRampFrame(), big(48 * 48);
    for (int y = 0; y < 48; ++y)
        for (int x = 0; x < 48; ++x)
            big[y * 48 + x] = small[(y / 2) * 24 + x / 2];
    IN_IMAGE image;
    image.Init(48, 48, 48, big.data());
    std::vector<ScoredWindow> out;
    ILabsPostFilter("pf_ilabs_tr").filter(image, {hit(1.0f, 0, {0, 48, 0, 48})}, &out);
    EXPECT_EQ(out.size(), 1u);
}

TEST(ILabsConfiguration, JsonAndModelOfAnotherFeatureLength)
{
    ScopedModel model("pf_ilabs_json", ilabsThresholdModel(0, {0.0f}));
    ILabsPostFilter f;
    f.fromJson("{}");
    EXPECT_EQ(f.getClassifier().categoryCount(), 0);
    f.fromJson("{ \"model\" : \"pf_ilabs_json\" }");
    EXPECT_EQ(f.getClassifier().categoryCount(), 15);
    EXPECT_EQ(f.toJson(), "{\"model\":\"pf_ilabs_json\"}");

    // A well-formed model for 3 features cannot judge the 945 of a patch.
    std::vector<postfilterwriters::IlabsCategory> cats(15);
    for (auto& c : cats)
        c.linear = {1, 1, 1};
    ScopedModel shortModel("pf_ilabs_short", postfilterwriters::ilabsModelPayload(cats));
    EXPECT_THROW(run(ILabsPostFilter("pf_ilabs_short"), {hit(1.0f, 0)}), qv_data_error);
}

TEST(ILabsFeature, ToolMirrorGivesTheSameFeatureAndScore)
{
    // The model tools compute features in Python; they must agree bit for bit.
    if (!pftest::featureMirrorAvailable())
        GTEST_SKIP() << "no system Python with numpy";
    const int width = 97, height = 83;
    std::vector<uint8_t> pixels = pftest::noisyFrame(width, height);
    const std::string framePath = ::testing::TempDir() + "pf_mirror_frame.raw";
    pftest::writeFile(framePath, pixels);
    IN_IMAGE image;
    image.Init(width, height, width, pixels.data());

    std::mt19937 rng(5);
    std::uniform_real_distribution<float> u(-0.05f, 0.05f);
    auto randomRow = [&] {
        std::vector<float> row(pftest::kFeatureLength);
        for (float& v : row)
            v = u(rng);
        return row;
    };
    std::vector<postfilterwriters::IlabsCategory> cats(15);
    for (auto& cat : cats) {
        cat.linear = randomRow();
        for (int r = 0; r < 3; ++r) {
            cat.quadraticWeights.push_back(u(rng));
            cat.leftRows.push_back(randomRow());
            cat.rightRows.push_back(randomRow());
        }
        cat.bias = u(rng) * 10;
    }
    const std::vector<uint8_t> payload = postfilterwriters::ilabsModelPayload(cats);
    const std::string modelPath = ::testing::TempDir() + "pf_mirror_model.bin";
    pftest::writeFile(modelPath, payload);
    ScopedModel model("pf_ilabs_mirror", payload);
    ILabsPostFilter filter("pf_ilabs_mirror");

    // Whole-pixel, fractional and clipped windows, categories spread out.
    const std::vector<ScoredWindow> hits = {hit(1.25f, 0), hit(-3.5f, 7, {10, 60, 5, 55}),
                                            hit(5.999f, 14, {33, 70, 20, 57}), hit(0.1f, 3, {80, 120, 60, 100}),
                                            hit(2.0f, 9, {-7, 30, -4, 33})};
    const std::string args = "--frame " + framePath + " --width 97 --height 83" + pftest::hitArguments(hits);
    std::vector<std::string> features = pftest::runFeatureMirror(args);
    std::vector<std::string> scores = pftest::runFeatureMirror(args + " --model " + modelPath);
    ASSERT_EQ(features.size(), hits.size());
    ASSERT_EQ(scores.size(), hits.size());
    for (std::size_t i = 0; i < hits.size(); ++i) {
        const std::vector<float> expected = filter.feature(image, hits[i]);
        EXPECT_EQ(pftest::parseFloats(features[i]), expected) << "hit " << i;
        const float score =
            filter.getClassifier().categoryScore(hits[i].category, expected.data(), static_cast<int>(expected.size()));
        EXPECT_EQ(pftest::parseFloats(scores[i]), (std::vector<float>{score, score > 0.0f ? 1.0f : 0.0f}));
    }
}
