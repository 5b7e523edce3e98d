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

// Unknown names and missing models giving null are left to FuzzConfig, which
// builds the detector from any text.
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
