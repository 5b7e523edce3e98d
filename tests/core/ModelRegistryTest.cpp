#include <gtest/gtest.h>

#include "core/Errors.h"
#include "core/ModelRegistry.h"
#include "support/ScopedModel.h"

namespace {
bool found(const std::string& name, const uint8_t** begin = nullptr) {
    const uint8_t* b = nullptr;
    const uint8_t* e = nullptr;
    const bool ok = ModelRegistry::instance().findModel(name, b, e);
    if (begin) *begin = b;
    return ok;
}
}  // namespace

TEST(ModelRegistryPaths, ReducesToTheLastComponentWithUnderscores) {
    EXPECT_EQ(ModelRegistry::translateModelPath("models/mdcb"), "mdcb");
    EXPECT_EQ(ModelRegistry::translateModelPath("mdcb.bin"), "mdcb_bin");
    EXPECT_EQ(ModelRegistry::translateModelPath("a.b/c.d"), "c_d");
    EXPECT_EQ(ModelRegistry::translateModelPath("C:\\m\\x-y"), "y");
    EXPECT_EQ(ModelRegistry::translateModelPath("trailing/"), "");
    EXPECT_EQ(ModelRegistry::translateModelPath(""), "");
}

TEST(ModelRegistryLookup, FindsTheBuiltInsAndLeavesOutParametersAloneOnAMiss) {
    for (const char* name : {"mdcb", "/x/y/mdnb", "mdpb"}) {
        const uint8_t* b = nullptr;
        const uint8_t* e = nullptr;
        ASSERT_TRUE(ModelRegistry::instance().findModel(name, b, e)) << name;
        EXPECT_GE(e - b, 4) << "a raw model holds at least its seed: " << name;
    }
    const uint8_t marker[2] = {1, 2};
    for (const char* name : {"MDCB", "mdcb.bin", "", "mdcb/"}) {
        const uint8_t* b = marker;
        const uint8_t* e = marker + 1;
        EXPECT_FALSE(ModelRegistry::instance().findModel(name, b, e)) << name;
        EXPECT_TRUE(b == marker && e == marker + 1);
    }
}

TEST(ModelRegistryExtension, TestModelsComeAndGoAndBuiltInsComeBack) {
    const uint8_t* original = nullptr;
    ASSERT_TRUE(found("mdpb", &original));
    {
        ScopedModel extra("unit_test_model", {1, 2, 3});
        ScopedModel replacement("mdpb", {9, 9});
        const uint8_t* b = nullptr;
        EXPECT_TRUE(found("some/dir/unit_test_model", &b));
        EXPECT_EQ(b, extra.packed().data());
        EXPECT_TRUE(found("mdpb", &b));
        EXPECT_EQ(b, replacement.packed().data());
    }
    EXPECT_FALSE(found("unit_test_model"));
    const uint8_t* b = nullptr;
    EXPECT_TRUE(found("mdpb", &b));
    EXPECT_EQ(b, original);
}

TEST(ModelRegistryExtension, RejectsNamesAndRangesItCouldNotServe) {
    ModelRegistry& registry = ModelRegistry::instance();
    const uint8_t bytes[4] = {};
    for (const char* name : {"", "a.b", "dir/name", "a::b"})
        EXPECT_THROW(registry.registerModel(name, bytes, bytes + 4), qv_invalid_argument) << name;
    EXPECT_THROW(registry.registerModel("ok", nullptr, bytes), qv_invalid_argument);
    EXPECT_THROW(registry.registerModel("ok", bytes + 4, bytes), qv_invalid_argument);
    EXPECT_FALSE(found("ok"));
}
