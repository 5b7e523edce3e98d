// The ILABS classifier (quadratic form per category, quantised model) and the
// post filter that feeds it LBP histograms of each hit.

#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/ILabsClassifier.h"
#include "postfilter/ILabsPostFilter.h"
#include "postfilter/LbpSvmPostFilter.h"
#include "support/ExpectThrow.h"
#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"

using postfilterwriters::IlabsCategory;
using pftest::hit;

namespace {

// D = 3, R = 2, exact at a scale of 1/2. For the feature (2, 3, 4), by hand:
//   a0 = 2,  score = -1.5 + 2 * 2 = 2.5,    b0 = 3,  score += 2 * 3  -> 8.5
//   a1 = 7,  score += 7 * -1       -> 1.5,  b1 = 9,  score += 7 * 9  -> 64.5
//   linear 2 - 6 + 2 = -2                   -> 62.5
IlabsCategory handCategory(float bias = 1.5f)
{
    IlabsCategory c;
    c.linear = {1.0f, -2.0f, 0.5f};
    c.quadraticWeights = {2.0f, -1.0f};
    c.leftRows = {{1, 0, 0}, {0, 1, 1}};
    c.rightRows = {{0, 1, 0}, {1, 1, 1}};
    c.bias = bias;
    c.scale = 0.5f;
    return c;
}

std::unique_ptr<ILabsClassifier::CategoryModel> asModel(const IlabsCategory& c)
{
    return std::make_unique<ILabsClassifier::CategoryModel>(c.linear, c.quadraticWeights, c.leftRows,
                                                            c.rightRows, c.bias);
}

const float kFeature[3] = {2.0f, 3.0f, 4.0f};

} // namespace

TEST(ILabsClassifier, ScoresTheQuadraticFormAndPassesStrictlyAboveZero)
{
    auto m = asModel(handCategory());
    EXPECT_EQ(m->getScore(kFeature, 3), 62.5f);
    expectThrowWith<qv_data_error>([&] { m->getScore(kFeature, 4); }, "Incorrect PostFilter's feature length");
    EXPECT_THROW(m->getScore(kFeature, 2), qv_data_error);

    ILabsClassifier c;
    EXPECT_THROW(c.classify(0, kFeature, 3), qv_invalid_argument); // no model
    std::vector<std::unique_ptr<ILabsClassifier::CategoryModel>> models;
    models.push_back(asModel(handCategory(64.0f)));  // 62.5 + 1.5 - 64 = 0
    models.push_back(asModel(handCategory(63.75f))); // 0.25
    c.setCategories(std::move(models));
    EXPECT_FALSE(c.classify(0, kFeature, 3));
    EXPECT_TRUE(c.classify(1, kFeature, 3));
    for (int category : {2, -1})
        EXPECT_THROW(c.classify(category, kFeature, 3), qv_invalid_argument) << category;
}

// Cut models are left to FuzzPostFilterModel and its replayed regressions.
TEST(ILabsClassifierLoad, RejectsCountsOutOfRange)
{
    // A category whose blocks claim `counts` but store `stored` values; "" for
    // a load that must pass, null for any data error.
    struct Case {
        std::vector<long long> counts;
        std::vector<std::size_t> stored;
        const char* message;
    };
    const Case cases[] = {
        {{3, 1, 3, 3}, {3, 1, 3, 3}, ""},
        {{-1}, {0}, nullptr},
        {{0x7fffffff}, {4}, "PostFilter model count exceeds its data"},
        {{20}, {3}, "PostFilter model count exceeds its data"}, // 40 bytes of a 30-byte model
        {{3, 1, 4, 3}, {3, 1, 4, 3}, "PostFilter model matrix does not match its vectors"}, // R x D is 3
        {{3, 1, 3, 2}, {3, 1, 3, 2}, "PostFilter model matrix does not match its vectors"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.counts[0]);
        postfilterwriters::ByteWriter w;
        w.int32(0);
        for (std::size_t i = 0; i < c.counts.size(); ++i) {
            postfilterwriters::QuantisedBlock b;
            b.values.assign(c.stored[i], 1);
            postfilterwriters::writeBlock(w, b, c.counts[i]);
        }
        w.float32(0.0f);
        w.int32(0);
        ScopedModel model("pf_ilabs_bad", w.bytes());
        ModelReader reader("pf_ilabs_bad", ModelReader::RAW);
        if (c.message == nullptr)
            EXPECT_THROW(ILabsClassifier::CategoryModel m(reader), qv_data_error);
        else if (*c.message == '\0')
            EXPECT_NO_THROW(ILabsClassifier::CategoryModel m(reader));
        else
            expectThrowWith<qv_data_error>([&] { ILabsClassifier::CategoryModel m(reader); }, c.message);
    }
}

TEST(ILabsPostFilter, HighScoresPassWholeAndTheRestMeetTheirCategorysModel)
{
    // From 6 on, hits pass whole and in order without a model; just below 6
    // they go to the model, and there is none.
    std::vector<ScoredWindow> in = {hit(6.0f, 14, {3, 20, 2, 19}), hit(9.5f, 0), hit(6.25f, 7)};
    std::vector<ScoredWindow> out = pftest::filterOnHalfRamp(ILabsPostFilter(), in);
    ASSERT_EQ(out.size(), 3u);
    for (std::size_t i = 0; i < in.size(); ++i)
        EXPECT_TRUE(pftest::sameHit(out[i], in[i])) << i;
    EXPECT_THROW(pftest::filterOnHalfRamp(ILabsPostFilter(), {hit(std::nextafter(6.0f, 0.0f), 0)}), qv_invalid_argument);
    // The cascade score is the first feature: category c passes a hit when
    // its score is above c; 0 above is a rejection.
    std::vector<float> biases;
    for (int c = 0; c < 15; ++c)
        biases.push_back(float(c));
    ScopedModel model("pf_ilabs_cats", pftest::ilabsThresholdModel(0, biases));
    ILabsPostFilter f("pf_ilabs_cats");
    out = pftest::filterOnHalfRamp(
        f, {hit(5.0f, 3), hit(5.0f, 5), hit(5.0f, 14), hit(5.0f, 4), hit(2.5f, 2), hit(2.0f, 2)});
    ASSERT_EQ(out.size(), 3u);
    EXPECT_EQ(out[0].category, 3);
    EXPECT_EQ(out[1].category, 4);
    EXPECT_EQ(out[2].score, 2.5f);
    EXPECT_THROW(pftest::filterOnHalfRamp(f, {hit(5.0f, 15)}), qv_invalid_argument);
}

TEST(ILabsFeature, ToolMirrorGivesTheSameFeature)
{
    // The model tools compute features in Python; they must agree bit for bit,
    // for the ILABS patch and the transposed one of the LBP SVM filter.
    if (!pftest::featureMirrorAvailable())
        GTEST_SKIP() << "no system Python with numpy";
    std::vector<uint8_t> pixels = pftest::noisyFrame(97, 83);
    const std::string framePath = ::testing::TempDir() + "pf_mirror_frame.raw";
    sourcetree::writeText(framePath, std::string(pixels.begin(), pixels.end()));
    IN_IMAGE image;
    image.Init(97, 83, 97, pixels.data());
    // Whole-pixel, fractional and clipped windows.
    const std::vector<ScoredWindow> hits = {hit(1.25f, 0), hit(-3.5f, 7, {10, 60, 5, 55}),
                                            hit(5.999f, 14, {33, 70, 20, 57}), hit(0.1f, 3, {80, 120, 60, 100}),
                                            hit(2.0f, 9, {-7, 30, -4, 33})};
    const std::string args = "--frame " + framePath + " --width 97 --height 83" + pftest::hitArguments(hits);
    const std::vector<std::string> plain = pftest::runFeatureMirror(args);
    const std::vector<std::string> transposed = pftest::runFeatureMirror(args + " --transpose");
    ASSERT_EQ(plain.size(), hits.size());
    ASSERT_EQ(transposed.size(), hits.size());
    for (std::size_t i = 0; i < hits.size(); ++i) {
        EXPECT_EQ(pftest::parseFloats(plain[i]), ILabsPostFilter().feature(image, hits[i])) << "hit " << i;
        EXPECT_EQ(pftest::parseFloats(transposed[i]), LbpSvmPostFilter().feature(image, hits[i])) << "hit " << i;
    }
}
