#include <gtest/gtest.h>

#include "core/Errors.h"
#include "core/ModelRegistry.h"
#include "support/ScopedModel.h"

namespace {
// The start of the range served for `name`, or null when none is.
const uint8_t* served(const std::string& name) {
    const uint8_t* b = nullptr;
    const uint8_t* e = nullptr;
    return ModelRegistry::instance().findModel(name, b, e) ? b : nullptr;
}
}  // namespace

TEST(ModelRegistryPaths, ReducesToTheLastComponentWithUnderscores) {
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"models/mdcb", "mdcb"}, {"mdcb.bin", "mdcb_bin"}, {"a.b/c.d", "c_d"},
        {"C:\\m\\x-y", "y"},     {"trailing/", ""},        {"", ""}};
    for (const auto& c : cases) EXPECT_EQ(ModelRegistry::translateModelPath(c.first), c.second) << c.first;
}

TEST(ModelRegistryExtension, TestModelsComeAndGoAndBuiltInsComeBack) {
    const uint8_t* original = served("mdpb");
    ASSERT_NE(original, nullptr);
    {
        ScopedModel extra("unit_test_model", {1, 2, 3});
        ScopedModel replacement("mdpb", {9, 9});
        EXPECT_EQ(served("some/dir/unit_test_model"), extra.packed().data());
        EXPECT_EQ(served("mdpb"), replacement.packed().data());
    }
    EXPECT_EQ(served("unit_test_model"), nullptr);
    EXPECT_EQ(served("mdpb"), original);
}
