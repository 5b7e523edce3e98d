#include <gtest/gtest.h>

#include "core/Errors.h"
#include "core/ModelRegistry.h"
#include "support/ScopedModel.h"

TEST(ModelRegistryPaths, ReducesToTheLastComponentWithUnderscores) {
    EXPECT_EQ(ModelRegistry::translateModelPath("models/mdcb"), "mdcb");
    EXPECT_EQ(ModelRegistry::translateModelPath("mdcb.bin"), "mdcb_bin");
    EXPECT_EQ(ModelRegistry::translateModelPath("a.b/c.d"), "c_d");
    EXPECT_EQ(ModelRegistry::translateModelPath(""), "");
    EXPECT_EQ(ModelRegistry::translateModelPath("C:\\m\\x-y"), "y");
    EXPECT_EQ(ModelRegistry::translateModelPath("trailing/"), "");
    EXPECT_EQ(ModelRegistry::dot2Underscore('.'), '_');
    EXPECT_EQ(ModelRegistry::dot2Underscore('/'), '/');
}

TEST(ModelRegistryLookup, FindsTheThreeBuiltInRanges) {
    const ModelRegistry& registry = ModelRegistry::instance();
    for (const char* name : {"mdcb", "/x/y/mdnb", "mdpb", "models/mdcb"}) {
        const uint8_t* b = nullptr;
        const uint8_t* e = nullptr;
        ASSERT_TRUE(registry.findModel(name, b, e)) << name;
        ASSERT_NE(b, nullptr);
        EXPECT_GE(e - b, 4) << "a raw model holds at least its seed: " << name;
    }
}

TEST(ModelRegistryLookup, MissLeavesOutParametersAlone) {
    const uint8_t marker[2] = {1, 2};
    for (const char* name : {"MDCB", "mdcb.bin", "", "mdcb/", "mdxx"}) {
        const uint8_t* b = marker;
        const uint8_t* e = marker + 1;
        EXPECT_FALSE(ModelRegistry::instance().findModel(name, b, e)) << name;
        EXPECT_EQ(b, marker);
        EXPECT_EQ(e, marker + 1);
    }
}

TEST(ModelRegistryExtension, ServesAndWithdrawsTestModels) {
    const uint8_t* b = nullptr;
    const uint8_t* e = nullptr;
    {
        ScopedModel model("unit_test_model", {1, 2, 3});
        ASSERT_TRUE(ModelRegistry::instance().findModel("some/dir/unit_test_model", b, e));
        EXPECT_EQ(b, model.packed().data());
        EXPECT_EQ(e - b, 7);
    }
    EXPECT_FALSE(ModelRegistry::instance().findModel("unit_test_model", b, e));
}

TEST(ModelRegistryExtension, OverridingABuiltInIsUndoneOnUnregister) {
    const uint8_t* original = nullptr;
    const uint8_t* originalEnd = nullptr;
    ASSERT_TRUE(ModelRegistry::instance().findModel("mdpb", original, originalEnd));
    {
        ScopedModel model("mdpb", {9, 9});
        const uint8_t* b = nullptr;
        const uint8_t* e = nullptr;
        ASSERT_TRUE(ModelRegistry::instance().findModel("mdpb", b, e));
        EXPECT_EQ(b, model.packed().data());
    }
    const uint8_t* b = nullptr;
    const uint8_t* e = nullptr;
    ASSERT_TRUE(ModelRegistry::instance().findModel("mdpb", b, e));
    EXPECT_EQ(b, original);
    EXPECT_EQ(e, originalEnd);
}

TEST(ModelRegistryExtension, RejectsNamesAndRangesItCouldNotServe) {
    ModelRegistry& registry = ModelRegistry::instance();
    const uint8_t bytes[4] = {};
    for (const char* name : {"", "a.b", "dir/name", "x y", "a::b"})
        EXPECT_THROW(registry.registerModel(name, bytes, bytes + 4), qv_invalid_argument) << name;
    EXPECT_THROW(registry.registerModel("ok", nullptr, bytes), qv_invalid_argument);
    EXPECT_THROW(registry.registerModel("ok", bytes + 4, bytes), qv_invalid_argument);
    const uint8_t* b = nullptr;
    const uint8_t* e = nullptr;
    EXPECT_FALSE(registry.findModel("ok", b, e));
    EXPECT_NO_THROW(registry.unregisterModel("never_registered"));
}
