#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <vector>

#include "PostFilterWriters.h"
#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/ILabsClassifier.h"
#include "support/ScopedModel.h"

using postfilterwriters::IlabsCategory;

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

TEST(ILabsCategoryScore, MatchesHandComputedQuadraticFormAndChecksLength)
{
    auto m = asModel(handCategory());
    EXPECT_EQ(m->getScore(kFeature, 3), 62.5f);
    EXPECT_THROW(m->getScore(kFeature, 2), qv_data_error);
    try {
        m->getScore(kFeature, 4);
        FAIL() << "no exception";
    } catch (const qv_data_error& e) {
        EXPECT_STREQ(e.what(), "Incorrect PostFilter's feature length");
    }
}

TEST(ILabsClassifierDecision, FastPassAtSixAndZeroScoreRejects)
{
    ILabsClassifier c;
    EXPECT_TRUE(c.preClassify(6.0f));
    EXPECT_FALSE(c.preClassify(std::nextafter(6.0f, 0.0f)));
    EXPECT_THROW(c.classify(0, kFeature, 3), qv_invalid_argument); // no model
    std::vector<std::unique_ptr<ILabsClassifier::CategoryModel>> models;
    models.push_back(asModel(handCategory(64.0f)));  // 62.5 + 1.5 - 64 = 0
    models.push_back(asModel(handCategory(63.75f))); // 0.25
    c.setCategories(std::move(models));
    EXPECT_FALSE(c.classify(0, kFeature, 3));
    EXPECT_TRUE(c.classify(1, kFeature, 3));
    EXPECT_THROW(c.classify(2, kFeature, 3), qv_invalid_argument);
    EXPECT_THROW(c.classify(-1, kFeature, 3), qv_invalid_argument);
}

TEST(ILabsClassifierLoad, ReadsFifteenQuantisedCategoriesInOrder)
{
    // Category c has bias 64 - c / 4: score 0 for category 0, then rising.
    // Stored as int16 at scale 1/2, so an unscaled load scores differently.
    std::vector<IlabsCategory> cats;
    for (int c = 0; c < 15; ++c)
        cats.push_back(handCategory(64.0f - c * 0.25f));
    ScopedModel model("pf_ilabs_hand", postfilterwriters::ilabsModelPayload(cats));
    ILabsClassifier classifier;
    classifier.init("pf_ilabs_hand");
    ASSERT_EQ(classifier.categoryCount(), 15);
    for (int c = 0; c < 15; ++c)
        EXPECT_EQ(classifier.categoryScore(c, kFeature, 3), c * 0.25f) << c;
}

TEST(ILabsClassifierLoad, EveryTruncationIsADataErrorAndLeavesNoCategories)
{
    std::vector<uint8_t> full = postfilterwriters::ilabsModelPayload(std::vector<IlabsCategory>(15, handCategory()));
    for (std::size_t n = 0; n < full.size(); n += (n < 120 ? 1 : 37)) {
        ScopedModel model("pf_ilabs_cut", std::vector<uint8_t>(full.begin(), full.begin() + n));
        ILabsClassifier classifier;
        EXPECT_THROW(classifier.init("pf_ilabs_cut"), qv_data_error) << "cut at " << n;
        EXPECT_EQ(classifier.categoryCount(), 0);
    }
}

TEST(ILabsClassifierLoad, RejectsCountsOutOfRange)
{
    // Writes a record whose blocks claim `counts` but store `stored` values.
    auto load = [](std::vector<long long> counts, std::vector<std::size_t> stored) {
        postfilterwriters::ByteWriter w;
        w.int32(0);
        for (std::size_t i = 0; i < counts.size(); ++i) {
            postfilterwriters::QuantisedBlock b;
            b.values.assign(stored[i], 1);
            postfilterwriters::writeBlock(w, b, counts[i]);
        }
        w.float32(0.0f);
        w.int32(0);
        ScopedModel model("pf_ilabs_bad", w.bytes());
        ModelReader reader("pf_ilabs_bad", ModelReader::RAW);
        ILabsClassifier::CategoryModel m(reader);
    };
    EXPECT_NO_THROW(load({3, 1, 3, 3}, {3, 1, 3, 3}));
    EXPECT_THROW(load({-1}, {0}), qv_data_error);
    EXPECT_THROW(load({0x7fffffff}, {4}), qv_data_error);
    EXPECT_THROW(load({3, 1, 4, 3}, {3, 1, 4, 3}), qv_data_error); // R x D is 3, not 4
    EXPECT_THROW(load({3, 1, 3, 2}, {3, 1, 3, 2}), qv_data_error);
    ILabsClassifier classifier;
    EXPECT_THROW(classifier.init("pf_no_such_model"), qv_data_error);
}
