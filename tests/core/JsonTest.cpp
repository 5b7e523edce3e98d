#include <gtest/gtest.h>

#include "core/Json.h"

TEST(JsonObject, ReadsOneLevel) {
    auto m = parseJsonObject("{\"a\":1,\"b\":\"x\",\"c\":{\"d\":[1,2]}}");
    ASSERT_EQ(m.size(), 3u);
    EXPECT_EQ(m["a"], "1");
    EXPECT_EQ(m["b"], "\"x\"");
    EXPECT_EQ(m["c"], "{\"d\":[1,2]}");
}
