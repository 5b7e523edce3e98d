#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"
#include "core/Json.h"
#include "postfilter/PostFilterFactory.h"

namespace {

std::unique_ptr<PostFilter> make(const std::string& description)
{
    return std::unique_ptr<PostFilter>(PostFilterFactory::instance().createInstance(description));
}

} // namespace

TEST(PostFilterFactoryNames, MakesBothFiltersByName)
{
    auto ilabs = make("{\"name\":\"ILABS_POSTFILTER\",\"param\":{}}");
    ASSERT_NE(ilabs, nullptr);
    EXPECT_EQ(ilabs->name(), "ILABS_POSTFILTER");
    auto svm = make("{\"name\":\"LBP_SVM_POSTFILTER\",\"param\":{}}");
    ASSERT_NE(svm, nullptr);
    EXPECT_EQ(svm->name(), "LBP_SVM_POSTFILTER");
    EXPECT_EQ(&PostFilterFactory::instance(), &PostFilterFactory::instance());
}

TEST(PostFilterFactoryNull, UnknownOrMissingNameGivesNull)
{
    EXPECT_EQ(make("{\"name\":\"KF_TRACKER\",\"param\":{}}"), nullptr);
    EXPECT_EQ(make("{\"name\":\"ilabs_postfilter\",\"param\":{}}"), nullptr);
    EXPECT_EQ(make("{\"param\":{}}"), nullptr);
}

TEST(PostFilterFactoryNull, ParametersOrModelThatCannotBeTakenGiveNull)
{
    // No "param": the filter gets an empty text, which is no object.
    EXPECT_EQ(make("{\"name\":\"ILABS_POSTFILTER\"}"), nullptr);
    EXPECT_EQ(make("{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"pf_nowhere\"}}"), nullptr);
    EXPECT_EQ(make("{\"name\":\"LBP_SVM_POSTFILTER\",\"param\":{\"model\":\"pf_nowhere\"}}"), nullptr);
    EXPECT_EQ(make("{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"\"}}"), nullptr);

    // A truncated model.
    std::vector<uint8_t> bytes = pftest::ilabsThresholdModel(0, {1.0f});
    bytes.resize(bytes.size() - 3);
    ScopedModel cut("pf_factory_cut", bytes);
    EXPECT_EQ(make("{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"pf_factory_cut\"}}"), nullptr);
    // The SVM filter wants two models; one is not enough.
    postfilterwriters::ByteWriter one;
    postfilterwriters::writeSvmModel(one, pftest::svmThresholdModel(0, 1.0f));
    ScopedModel half("pf_factory_half", one.bytes());
    EXPECT_EQ(make("{\"name\":\"LBP_SVM_POSTFILTER\",\"param\":{\"model\":\"pf_factory_half\"}}"), nullptr);
}

TEST(PostFilterFactoryModels, LoadsTheNamedModel)
{
    ScopedModel ilabs("pf_factory_ilabs", pftest::ilabsThresholdModel(0, {1.0f}));
    auto f = make("{\"name\":\"ILABS_POSTFILTER\",\"param\":{\"model\":\"pf_factory_ilabs\"}}");
    ASSERT_NE(f, nullptr);
    EXPECT_EQ(f->toJson(), "{\"model\":\"pf_factory_ilabs\"}");

    ScopedModel svm("pf_factory_svm", postfilterwriters::svmModelPayload(pftest::svmThresholdModel(0, 1.0f),
                                                                       pftest::svmThresholdModel(0, 1.0f)));
    EXPECT_NE(make("{\"name\":\"LBP_SVM_POSTFILTER\",\"param\":{\"model\":\"pf_factory_svm\"}}"), nullptr);
}

TEST(PostFilterFactoryNull, MalformedDescriptionIsAJsonError)
{
    EXPECT_THROW(make("name=ILABS_POSTFILTER"), JsonError);
}
