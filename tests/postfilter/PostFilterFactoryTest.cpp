#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "core/Errors.h"
#include "core/Json.h"
#include "postfilter/ILabsPostFilter.h"
#include "postfilter/LbpSvmPostFilter.h"
#include "postfilter/PostFilterFactory.h"
#include "support/PostFilterModels.h"
#include "support/ScopedModel.h"

namespace {

std::unique_ptr<PostFilter> make(const std::string& name, const std::string& param = "")
{
    std::string description = "{\"name\":\"" + name + "\"";
    if (!param.empty())
        description += ",\"param\":" + param;
    return std::unique_ptr<PostFilter>(PostFilterFactory::instance().createInstance(description + "}"));
}

} // namespace

TEST(PostFilterFactoryNull, UnknownNamesParametersAndModelsGiveNull)
{
    EXPECT_EQ(make("ilabs_postfilter", "{}"), nullptr); // names are case-sensitive
    EXPECT_EQ(PostFilterFactory::instance().createInstance("{\"param\":{}}"), nullptr);
    EXPECT_EQ(make("ILABS_POSTFILTER"), nullptr); // no "param": an empty text is no object
    EXPECT_EQ(make("ILABS_POSTFILTER", "{\"model\":\"pf_nowhere\"}"), nullptr);
    EXPECT_EQ(make("LBP_SVM_POSTFILTER", "{\"model\":\"pf_nowhere\"}"), nullptr);
    EXPECT_EQ(make("ILABS_POSTFILTER", "{\"model\":\"\"}"), nullptr);

    std::vector<uint8_t> bytes = pftest::ilabsThresholdModel(0, {1.0f});
    bytes.resize(bytes.size() - 3);
    ScopedModel cut("pf_factory_cut", bytes);
    EXPECT_EQ(make("ILABS_POSTFILTER", "{\"model\":\"pf_factory_cut\"}"), nullptr);
    // The SVM filter reads two models; one is not enough.
    postfilterwriters::ByteWriter one;
    postfilterwriters::writeSvmModel(one, pftest::svmThresholdModel(0, 1.0f));
    ScopedModel half("pf_factory_half", one.bytes());
    EXPECT_EQ(make("LBP_SVM_POSTFILTER", "{\"model\":\"pf_factory_half\"}"), nullptr);

    EXPECT_THROW(PostFilterFactory::instance().createInstance("name=ILABS_POSTFILTER"), JsonError);
}

TEST(PostFilterJson, ModelKeyRoundTripsAndAModelForAnotherFeatureIsADataError)
{
    // Well-formed models for 3 and 10 features cannot judge the 945 of a patch.
    std::vector<postfilterwriters::IlabsCategory> cats(15);
    for (auto& c : cats)
        c.linear = {1, 1, 1};
    postfilterwriters::SvmModelParams svm = pftest::svmThresholdModel(0, 0.0f);
    svm.featureLength = 10;
    svm.supportVectors[0].resize(10);
    ScopedModel ilabsModel("pf_json_ilabs", postfilterwriters::ilabsModelPayload(cats));
    ScopedModel svmModel("pf_json_svm", postfilterwriters::svmModelPayload(svm, svm));
    ILabsPostFilter ilabs;
    LbpSvmPostFilter lbpSvm;
    ilabs.fromJson("{ \"model\" : \"pf_json_ilabs\" }");
    lbpSvm.fromJson("{\"model\":\"pf_json_svm\"}");
    EXPECT_EQ(ilabs.toJson(), "{\"model\":\"pf_json_ilabs\"}");
    EXPECT_EQ(lbpSvm.toJson(), "{\"model\":\"pf_json_svm\"}");
    EXPECT_THROW(pftest::filterOnHalfRamp(ilabs, {pftest::hit(1.0f, 0)}), qv_data_error);
    EXPECT_THROW(pftest::filterOnHalfRamp(lbpSvm, {pftest::hit(1.0f, 1)}), qv_data_error);
}
