#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <stdexcept>

#include "core/Json.h"
#include "support/ExpectThrow.h"

namespace {

typedef std::map<std::string, std::string> Items;

// A record whose text cannot be written.
struct Unwritable {
    std::string toJson() const { throw std::runtime_error("inner text"); }
};

const char* const kReadError = "Json deserialization error";

}  // namespace

// The dialect's quirks are behaviour that stored texts depend on.
TEST(JsonObject, AcceptsTheDialect) {
    const std::vector<std::pair<std::string, Items>> cases = {
        {"{}", {}},
        {"{\n\t\f\v }", {}},
        {"{ \"s\" : \"x y\" , \"o\":{\"d\":[1,{\"e\":2}]}, \"n\": -1.5e3 }",
         {{"s", "\"x y\""}, {"o", "{\"d\":[1,{\"e\":2}]}"}, {"n", "-1.5e3"}}},
        {"{\"a\":1,}", {{"a", "1"}}},                          // trailing comma
        {"{\"a\":\"x\",}", {{"a", "\"x\""}}},
        {"{\"a\":1 2,\"b\":3}", {{"a", "1 2"}, {"b", "3"}}},    // bare value runs to the comma
        {"{\"a\":x\"y,\"b\":true}", {{"a", "x\"y"}, {"b", "true"}}},
        {"{\"a\":,\"b\":1}", {{"a", ",\"b\":1"}}},              // comma search starts behind v
        {"{\"a\":1\r}", {{"a", "1\r"}}},                        // CR is no white space
        {"{\"a\":\"b\\\\\"}", {{"a", "\"b\\\\\""}}},            // no unescaping
        {"{\"a\":\"}\"}", {{"a", "\"}\""}}},                    // strings are read by quotes
        {"{\"a\":[{],\"b\":1}", {{"a", "[{]"}, {"b", "1"}}},    // only one bracket kind counts
        {"{\"k\":1,\"k\":2}", {{"k", "2"}}},
        {"{\"a b\":1}", {{"a b", "1"}}},
    };
    for (const auto& c : cases) EXPECT_EQ(parseJsonObject(c.first), c.second) << c.first;
}

TEST(JsonObject, RejectsWithTheDeserializationMessage) {
    for (const char* text :
         {"", "{", "}", "x", "[]", " {}", "{} ", "{}\n", "{\"a\":1}\r", "{\r\"a\":1}", "{\"a\":1",
          "{\"a\":\"x\" \"b\":1}", "{\"a\":\"b\\\"c\"}", "{\"a\":{\"b\":\"}\"}}", "{\"a\":[\"]\",{\"b\":1}]}",
          "{a:1}", "{\"a:1}", "{\"\":1}", "{\"a\" 1}", "{\"a\"}", "{\"a\":}", "{\"a\":  }", "{\"a\":\"x}",
          "{\"a\":{\"b\":1}", "{\"a\":[1}", "{\"a\":[1] x}", "{,}", "{\"a\":1,,\"b\":2}"})
        expectThrowWith<JsonError>([&] { parseJsonObject(text); }, kReadError, text);
}

TEST(JsonArray, ItemsKeepTheirRawTextInOrder) {
    typedef std::vector<std::string> List;
    EXPECT_EQ(parseJsonArray("[\"x\",{\"a\":[1,2]},[3],4.5]"), (List{"\"x\"", "{\"a\":[1,2]}", "[3]", "4.5"}));
    EXPECT_EQ(parseJsonArray("[ 1 , 2 ,]"), (List{"1", "2"}));
    EXPECT_TRUE(parseJsonArray("[ ]").empty());
    for (const char* text : {"", "[", "{}", " []", "[\"x]", "[[1]", "[\"a\" 1]", "[{]"})
        expectThrowWith<JsonError>([&] { parseJsonArray(text); }, kReadError, text);
}

TEST(JsonValues, NumbersIgnoreWhatFollowsAndStringsNeedQuotes) {
    int i = 7;
    JsonValue<int>::fromText("12abc", i);  // what follows the number is not looked at
    EXPECT_EQ(i, 12);
    EXPECT_NO_THROW(JsonValue<int>::fromText("abc", i));
    EXPECT_EQ(JsonValue<std::string>::toText("a\"b"), "\"a\"b\"");  // no escaping
    std::string s = "keep";
    for (const char* text : {"", "\"", "x", "\"x", "x\""}) {
        EXPECT_THROW(JsonValue<std::string>::fromText(text, s), JsonError) << text;
        EXPECT_EQ(s, "keep");
    }
}

// The frame path rounds a face's floats without making text; hosts must get
// bit for bit the floats that the text form gave them.
TEST(JsonValues, SixDigitRoundingIsTheFloatsTripThroughItsText) {
    std::vector<float> values = {0.0f, -0.0f, 100.49999f, 0.1234561f, 999999.5f, 9999995.0f, 1e-40f,
                                 std::numeric_limits<float>::max(), std::numeric_limits<float>::lowest(),
                                 std::numeric_limits<float>::min(), std::numeric_limits<float>::denorm_min(),
                                 std::numeric_limits<float>::infinity(), -std::numeric_limits<float>::infinity(),
                                 std::numeric_limits<float>::quiet_NaN()};
    std::mt19937 random(25);
    for (int i = 0; i < 100000; ++i) {
        const uint32_t bits = static_cast<uint32_t>(random());
        float v;
        std::memcpy(&v, &bits, sizeof v);
        values.push_back(v);
        values.push_back(static_cast<float>(random() % 2000000) / 1000.0f);  // pixel-like values
    }
    for (float v : values) {
        float viaText = -1.0f;
        JsonValue<float>::fromText(JsonValue<float>::toText(v), viaText);
        const float rounded = roundToSixDigits(v);
        uint32_t a, b;
        std::memcpy(&a, &viaText, sizeof a);
        std::memcpy(&b, &rounded, sizeof b);
        ASSERT_EQ(a, b) << JsonValue<float>::toText(v);
    }
}

// The record tests write and read every other kind of value.
TEST(JsonObjectItem, BooleansAreWordsAndInnerFailuresBecomeJsonErrors) {
    bool b = false;
    for (const char* text : {"{\"b\":yes}", "{\"b\":1}", "{\"b\":\"true\"}"})
        EXPECT_THROW(jsonObjectItemToNamedValue(parseJsonObject(text), "b", b), JsonError) << text;
    expectThrowWith<JsonError>([] { jsonNamedValue("r", Unwritable()); }, "Json serialization error");
}
