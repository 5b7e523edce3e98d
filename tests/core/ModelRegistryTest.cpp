#include <gtest/gtest.h>

#include "core/ModelRegistry.h"

TEST(ModelRegistry, FindsBuiltIns) {
    const uint8_t* b = nullptr;
    const uint8_t* e = nullptr;
    EXPECT_TRUE(ModelRegistry::instance().findModel("mdcb", b, e));
}
