#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "support/PostFilterModels.h"
#include "PostFilterWriters.h"
#include "support/ScopedModel.h"
#include "container/ModelReader.h"
#include "core/Errors.h"
#include "postfilter/ILabsClassifier.h"

using postfilterwriters::IlabsCategory;

namespace {

// D = 3, R = 2, values chosen to be exact at a scale of 1/2. For the feature
// (2, 3, 4), by hand:
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

const float kHandFeature[3] = {2.0f, 3.0f, 4.0f};

std::string messageOf(const std::function<void()>& f)
{
    try {
        f();
    } catch (const std::exception& e) {
        return e.what();
    }
    return "";
}

} // namespace

TEST(ILabsCategoryScore, MatchesHandComputedQuadraticForm)
{
    EXPECT_FLOAT_EQ(asModel(handCategory())->getScore(kHandFeature, 3), 62.5f);
}

TEST(ILabsCategoryScore, RankZeroIsLinearMinusBias)
{
    auto m = std::make_unique<ILabsClassifier::CategoryModel>(std::vector<float>{1, 2, 3}, std::vector<float>{},
                                                              std::vector<std::vector<float>>{},
                                                              std::vector<std::vector<float>>{}, 4.0f);
    EXPECT_FLOAT_EQ(m->getScore(kHandFeature, 3), 2 + 6 + 12 - 4.0f);
}

TEST(ILabsCategoryScore, WrongFeatureLengthIsADataError)
{
    auto m = asModel(handCategory());
    EXPECT_THROW(m->getScore(kHandFeature, 2), qv_data_error);
    EXPECT_EQ(messageOf([&] { m->getScore(kHandFeature, 4); }), "Incorrect PostFilter's feature length");
}

TEST(ILabsClassifierDecision, FastPassStartsAtSixExactly)
{
    ILabsClassifier c;
    EXPECT_TRUE(c.preClassify(6.0f));
    EXPECT_TRUE(c.preClassify(100.0f));
    EXPECT_FALSE(c.preClassify(std::nextafter(6.0f, 0.0f)));
}

TEST(ILabsClassifierDecision, ZeroScoreIsARejection)
{
    ILabsClassifier c;
    std::vector<std::unique_ptr<ILabsClassifier::CategoryModel>> models;
    models.push_back(asModel(handCategory(64.0f)));  // 62.5 + 1.5 - 64 = 0
    models.push_back(asModel(handCategory(63.75f))); // 0.25
    c.setCategories(std::move(models));
    EXPECT_FALSE(c.classify(0, kHandFeature, 3));
    EXPECT_TRUE(c.classify(1, kHandFeature, 3));
}

TEST(ILabsClassifierDecision, CategoryOutsideTheModelIsRefused)
{
    ILabsClassifier empty;
    EXPECT_THROW(empty.classify(0, kHandFeature, 3), qv_invalid_argument);
    ILabsClassifier one;
    std::vector<std::unique_ptr<ILabsClassifier::CategoryModel>> models;
    models.push_back(asModel(handCategory()));
    one.setCategories(std::move(models));
    EXPECT_THROW(one.classify(1, kHandFeature, 3), qv_invalid_argument);
    EXPECT_THROW(one.classify(-1, kHandFeature, 3), qv_invalid_argument);
}

TEST(ILabsClassifierLoad, ReadsFifteenCategoriesInOrder)
{
    // Category c has bias 64 - c / 4: score 0 for category 0, then rising.
    std::vector<IlabsCategory> cats;
    for (int c = 0; c < 15; ++c)
        cats.push_back(handCategory(64.0f - c * 0.25f));
    ScopedModel model("pf_ilabs_hand", postfilterwriters::ilabsModelPayload(cats));
    ILabsClassifier classifier;
    classifier.init("pf_ilabs_hand");
    ASSERT_EQ(classifier.categoryCount(), 15);
    EXPECT_FALSE(classifier.classify(0, kHandFeature, 3));
    for (int c = 1; c < 15; ++c)
        EXPECT_TRUE(classifier.classify(c, kHandFeature, 3)) << c;
}

TEST(ILabsClassifierLoad, WidensInt16TimesBlockScale)
{
    // Automatic scales: the loaded values are what the writer says it stores.
    IlabsCategory c = handCategory();
    c.scale = 0.0f;
    c.linear = {0.1f, -0.37f, 3.3f};
    IlabsCategory loaded = postfilterwriters::ilabsAsLoaded(c);
    std::vector<IlabsCategory> cats(15, c);
    ScopedModel model("pf_ilabs_auto", postfilterwriters::ilabsModelPayload(cats));
    ModelReader reader("pf_ilabs_auto", ModelReader::RAW);
    ILabsClassifier::CategoryModel m(reader);
    EXPECT_FLOAT_EQ(m.getScore(kHandFeature, 3), asModel(loaded)->getScore(kHandFeature, 3));
    EXPECT_EQ(m.featureLength(), 3);
    EXPECT_EQ(m.rank(), 2);
}

TEST(ILabsClassifierLoad, EveryTruncationIsADataErrorAndLeavesNoCategories)
{
    std::vector<uint8_t> full = postfilterwriters::ilabsModelPayload(std::vector<IlabsCategory>(15, handCategory()));
    // Cut inside the first record at every byte, and at a few places further on.
    std::vector<std::size_t> cuts;
    for (std::size_t n = 0; n < 120; ++n)
        cuts.push_back(n);
    for (std::size_t n = 120; n < full.size(); n += 37)
        cuts.push_back(n);
    cuts.push_back(full.size() - 1);
    for (std::size_t n : cuts) {
        std::vector<uint8_t> cut(full.begin(), full.begin() + n);
        ScopedModel model("pf_ilabs_cut", cut);
        ILabsClassifier classifier;
        EXPECT_THROW(classifier.init("pf_ilabs_cut"), qv_data_error) << "cut at " << n;
        EXPECT_EQ(classifier.categoryCount(), 0);
    }
}

TEST(ILabsClassifierLoad, RejectsCountsOutOfRange)
{
    using postfilterwriters::ByteWriter;
    auto block = [](ByteWriter& w, long long count, std::size_t stored) {
        postfilterwriters::QuantisedBlock b;
        b.values.assign(stored, 1);
        postfilterwriters::writeBlock(w, b, count);
    };
    auto load = [](const std::vector<uint8_t>& bytes) {
        ScopedModel model("pf_ilabs_bad", bytes);
        ModelReader reader("pf_ilabs_bad", ModelReader::RAW);
        ILabsClassifier::CategoryModel m(reader);
    };
    {   // negative vector count
        ByteWriter w;
        w.int32(0);
        block(w, -1, 0);
        EXPECT_THROW(load(w.bytes()), qv_data_error);
    }
    {   // a count far beyond the data
        ByteWriter w;
        w.int32(0);
        block(w, 0x7fffffff, 4);
        EXPECT_THROW(load(w.bytes()), qv_data_error);
    }
    {   // matrix block that does not hold R x D values: D = 3, R = 1, but 4 stored
        ByteWriter w;
        w.int32(0);
        block(w, 3, 3);
        block(w, 1, 1);
        block(w, 4, 4);
        block(w, 3, 3);
        w.float32(0.0f);
        w.int32(0);
        EXPECT_THROW(load(w.bytes()), qv_data_error);
    }
}

TEST(ILabsClassifierLoad, UnknownModelRaisesTheReadersError)
{
    ILabsClassifier classifier;
    EXPECT_THROW(classifier.init("pf_no_such_model"), qv_data_error);
}
