#include <gtest/gtest.h>

#include <cmath>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"
#include "core/Errors.h"
#include "image/IntegralImage.h"
#include "postfilter/ILabsPostFilter.h"

namespace {

ScoredWindow hit(float score, int category, DetectionWindow w = {0, 24, 0, 24})
{
    ScoredWindow s;
    s.score = score;
    s.category = category;
    s.window = w;
    for (int i = 0; i < 15; ++i)
        s.categoryScores[i] = score - i;
    return s;
}

struct Frame {
    std::vector<uint8_t> pixels = pftest::halfRampFrame();
    IN_IMAGE image;
    Frame() { image.Init(24, 24, 24, pixels.data()); }
};

bool same(const ScoredWindow& a, const ScoredWindow& b)
{
    for (int i = 0; i < 15; ++i)
        if (a.categoryScores[i] != b.categoryScores[i])
            return false;
    return a.score == b.score && a.category == b.category && a.window.left == b.window.left
           && a.window.right == b.window.right && a.window.top == b.window.top && a.window.bottom == b.window.bottom;
}

std::vector<ScoredWindow> run(const PostFilter& f, const std::vector<ScoredWindow>& in)
{
    Frame frame;
    std::vector<ScoredWindow> out;
    f.filter(frame.image, in, &out);
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
        EXPECT_TRUE(same(out[i], in[i])) << i;
}

TEST(ILabsFastPass, JustBelowSixGoesToTheModel)
{
    ILabsPostFilter f; // no model: a judged hit has no category to go to
    EXPECT_THROW(run(f, {hit(std::nextafter(6.0f, 0.0f), 0)}), qv_invalid_argument);
}

TEST(ILabsFastPass, EmptyInputAddsNothingAndKeepsWhatIsThere)
{
    ILabsPostFilter f;
    Frame frame;
    std::vector<ScoredWindow> out = {hit(1.0f, 2)};
    f.filter(frame.image, {}, &out);
    ASSERT_EQ(out.size(), 1u);
    f.filter(frame.image, {hit(8.0f, 1)}, &out);
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[1].score, 8.0f);
}

TEST(ILabsJudgement, CascadeScoreIsTheFirstFeatureAndZeroRejects)
{
    ScopedModel model("pf_ilabs_score", pftest::ilabsThresholdModel(0, {2.0f}));
    ILabsPostFilter f("pf_ilabs_score");
    std::vector<ScoredWindow> out = run(f, {hit(3.0f, 0), hit(2.0f, 0), hit(1.0f, 0), hit(2.5f, 9)});
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[0].score, 3.0f);
    EXPECT_EQ(out[1].score, 2.5f);
}

TEST(ILabsJudgement, EachCategoryHasItsOwnModelUpToFourteen)
{
    // Category c passes a hit of score 5 when 5 > c.
    std::vector<float> biases;
    for (int c = 0; c < 15; ++c)
        biases.push_back(float(c));
    ScopedModel model("pf_ilabs_cats", pftest::ilabsThresholdModel(0, biases));
    ILabsPostFilter f("pf_ilabs_cats");
    std::vector<ScoredWindow> out = run(f, {hit(5.0f, 3), hit(5.0f, 5), hit(5.0f, 14), hit(5.0f, 4)});
    ASSERT_EQ(out.size(), 2u);
    EXPECT_EQ(out[0].category, 3);
    EXPECT_EQ(out[1].category, 4);
    EXPECT_THROW(run(f, {hit(5.0f, 15)}), qv_invalid_argument);
}

TEST(ILabsJudgement, HistogramIsTakenOnThePatchRowByRow)
{
    // The right half of the frame is flat: its top-right cell counts 25
    // pixels of code 0, its bottom-left cell (ramp) none.
    ScopedModel topRight("pf_ilabs_tr", pftest::ilabsThresholdModel(pftest::binIndex(0, 3, 0), {24.5f}));
    ScopedModel topRightAll("pf_ilabs_tr25", pftest::ilabsThresholdModel(pftest::binIndex(0, 3, 0), {25.0f}));
    ScopedModel bottomLeft("pf_ilabs_bl", pftest::ilabsThresholdModel(pftest::binIndex(3, 0, 0), {0.0f}));
    EXPECT_EQ(run(ILabsPostFilter("pf_ilabs_tr"), {hit(1.0f, 0)}).size(), 1u);
    EXPECT_EQ(run(ILabsPostFilter("pf_ilabs_tr25"), {hit(1.0f, 0)}).size(), 0u);
    EXPECT_EQ(run(ILabsPostFilter("pf_ilabs_bl"), {hit(1.0f, 0)}).size(), 0u);
}

TEST(ILabsJudgement, WindowIsScaledToThePatch)
{
    // A 48 x 48 frame, each pixel of the half-ramp frame doubled: the whole
    // frame's window shrinks back to the 24 x 24 pattern.
    std::vector<uint8_t> small = pftest::halfRampFrame();
    std::vector<uint8_t> big(48 * 48);
    for (int y = 0; y < 48; ++y)
        for (int x = 0; x < 48; ++x)
            big[y * 48 + x] = small[(y / 2) * 24 + x / 2];
    IN_IMAGE image;
    image.Init(48, 48, 48, big.data());
    ScopedModel topRight("pf_ilabs_tr2", pftest::ilabsThresholdModel(pftest::binIndex(0, 3, 0), {24.5f}));
    ILabsPostFilter f("pf_ilabs_tr2");
    std::vector<ScoredWindow> out;
    f.filter(image, {hit(1.0f, 0, {0, 48, 0, 48})}, &out);
    EXPECT_EQ(out.size(), 1u);
}

TEST(ILabsConfiguration, NameAndJsonRoundTrip)
{
    ScopedModel model("pf_ilabs_json", pftest::ilabsThresholdModel(0, {0.0f}));
    ILabsPostFilter f;
    EXPECT_EQ(f.name(), "ILABS_POSTFILTER");
    f.fromJson("{}");
    EXPECT_EQ(f.getClassifier().categoryCount(), 0);
    f.fromJson("{ \"model\" : \"pf_ilabs_json\" }");
    EXPECT_EQ(f.getClassifier().categoryCount(), 15);
    EXPECT_EQ(f.toJson(), "{\"model\":\"pf_ilabs_json\"}");
    EXPECT_EQ(f.getDescriptor().getLength() + 1, pftest::kFeatureLength);
}

TEST(ILabsConfiguration, ModelOfAnotherFeatureLengthFailsAtJudgement)
{
    // A well-formed model for 3 features cannot judge the 945 of a patch.
    std::vector<postfilterwriters::IlabsCategory> cats(15);
    for (auto& c : cats)
        c.linear = {1, 1, 1};
    ScopedModel model("pf_ilabs_short", postfilterwriters::ilabsModelPayload(cats));
    ILabsPostFilter f("pf_ilabs_short");
    try {
        run(f, {hit(1.0f, 0)});
        FAIL() << "no exception";
    } catch (const qv_data_error& e) {
        EXPECT_STREQ(e.what(), "Incorrect PostFilter's feature length");
    }
}

TEST(ILabsFeature, ToolMirrorGivesTheSameFeatureAndScore)
{
    // The model tools compute features in Python; they must agree bit for bit.
    const int width = 97, height = 83;
    if (!pftest::featureMirrorAvailable())
        GTEST_SKIP() << "no system Python with numpy";
    std::vector<uint8_t> pixels = pftest::noisyFrame(width, height);
    const std::string framePath = ::testing::TempDir() + "pf_mirror_frame.raw";
    pftest::writeFile(framePath, pixels);
    IN_IMAGE image;
    image.Init(width, height, width, pixels.data());

    std::mt19937 rng(5);
    std::vector<postfilterwriters::IlabsCategory> cats;
    for (int c = 0; c < 15; ++c) {
        postfilterwriters::IlabsCategory cat;
        std::uniform_real_distribution<float> u(-0.05f, 0.05f);
        for (int i = 0; i < pftest::kFeatureLength; ++i)
            cat.linear.push_back(u(rng));
        for (int r = 0; r < 3; ++r) {
            cat.quadraticWeights.push_back(u(rng));
            cat.leftRows.emplace_back();
            cat.rightRows.emplace_back();
            for (int i = 0; i < pftest::kFeatureLength; ++i) {
                cat.leftRows.back().push_back(u(rng));
                cat.rightRows.back().push_back(u(rng));
            }
        }
        cat.bias = u(rng) * 10;
        cats.push_back(cat);
    }
    const std::vector<uint8_t> payload = postfilterwriters::ilabsModelPayload(cats);
    const std::string modelPath = ::testing::TempDir() + "pf_mirror_model.bin";
    pftest::writeFile(modelPath, payload);
    ScopedModel model("pf_ilabs_mirror", payload);
    ILabsPostFilter filter("pf_ilabs_mirror");

    // Whole-pixel, fractional and clipped windows, categories spread out.
    const std::vector<ScoredWindow> hits = {hit(1.25f, 0, {0, 24, 0, 24}), hit(-3.5f, 7, {10, 60, 5, 55}),
                                            hit(5.999f, 14, {33, 70, 20, 57}), hit(0.1f, 3, {80, 120, 60, 100}),
                                            hit(2.0f, 9, {-7, 30, -4, 33})};
    std::string args = "--frame " + framePath + " --width 97 --height 83";
    for (const ScoredWindow& h : hits) {
        std::ostringstream spec;
        spec.precision(9);
        spec << " --hit=" << h.window.left << "," << h.window.right << "," << h.window.top << ","
             << h.window.bottom << "," << h.score << "," << h.category;
        args += spec.str();
    }
    std::vector<std::string> features = pftest::runFeatureMirror(args);
    std::vector<std::string> scores = pftest::runFeatureMirror(args + " --model " + modelPath);
    ASSERT_EQ(features.size(), hits.size());
    ASSERT_EQ(scores.size(), hits.size());
    for (std::size_t i = 0; i < hits.size(); ++i) {
        const std::vector<float> expected = filter.feature(image, hits[i]);
        EXPECT_EQ(pftest::parseFloats(features[i]), expected) << "hit " << i;
        const float score = filter.getClassifier().categoryScore(hits[i].category, expected.data(),
                                                              static_cast<int>(expected.size()));
        std::vector<float> mirrored = pftest::parseFloats(scores[i]);
        ASSERT_EQ(mirrored.size(), 2u) << scores[i];
        EXPECT_EQ(mirrored[0], score) << "hit " << i;
        EXPECT_EQ(mirrored[1] == 1.0f, score > 0.0f);
    }
}
