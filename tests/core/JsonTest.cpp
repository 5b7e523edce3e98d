#include <gtest/gtest.h>

#include <random>

#include "core/Json.h"

namespace {

typedef std::map<std::string, std::string> Items;
typedef std::vector<std::string> List;

struct Record {
    int a = 0;
    bool failWrite = false;
    std::string toJson() const {
        if (failWrite) throw std::runtime_error("inner text");
        return "{" + jsonNamedValue("a", a) + "}";
    }
    void fromJson(const std::string& text) { jsonObjectItemToNamedValue(parseJsonObject(text), "a", a); }
};

template <typename F>
void expectJsonError(F f, const char* message, const std::string& context) {
    try {
        f();
        ADD_FAILURE() << "accepted: " << context;
    } catch (const JsonError& e) {
        EXPECT_STREQ(e.what(), message) << context;
    }
}

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
        expectJsonError([&] { parseJsonObject(text); }, "Json deserialization error", text);
}

TEST(JsonArray, ItemsKeepTheirRawTextInOrder) {
    EXPECT_EQ(parseJsonArray("[\"x\",{\"a\":[1,2]},[3],4.5]"), (List{"\"x\"", "{\"a\":[1,2]}", "[3]", "4.5"}));
    EXPECT_EQ(parseJsonArray("[ 1 , 2 ,]"), (List{"1", "2"}));
    EXPECT_TRUE(parseJsonArray("[ ]").empty());
    for (const char* text : {"", "[", "{}", " []", "[\"x]", "[[1]", "[\"a\" 1]", "[{]"})
        expectJsonError([&] { parseJsonArray(text); }, "Json deserialization error", text);
}

TEST(JsonValues, NumbersFollowTheStreamsAndStringsNeedQuotes) {
    EXPECT_EQ(JsonValue<float>::toText(0.1234567f), "0.123457");
    EXPECT_EQ(JsonValue<float>::toText(1234567.0f), "1.23457e+06");
    EXPECT_EQ(JsonValue<int>::toText(-2147483647 - 1), "-2147483648");
    int i = 7;
    JsonValue<int>::fromText("12abc", i);  // what follows the number is not looked at
    EXPECT_EQ(i, 12);
    float f = 0;
    JsonValue<float>::fromText("2.5e1x", f);
    EXPECT_FLOAT_EQ(f, 25.0f);
    EXPECT_NO_THROW(JsonValue<int>::fromText("abc", i));
    EXPECT_NO_THROW(JsonValue<float>::fromText("", f));

    std::string s;
    JsonValue<std::string>::fromText("\"a\\\"b\"", s);  // no unescaping either way
    EXPECT_EQ(s, "a\\\"b");
    EXPECT_EQ(JsonValue<std::string>::toText("a\"b"), "\"a\"b\"");
    for (const char* text : {"", "\"", "x", "\"x", "x\""}) {
        s = "keep";
        EXPECT_THROW(JsonValue<std::string>::fromText(text, s), JsonError) << text;
        EXPECT_EQ(s, "keep");
    }
}

TEST(JsonObjectItem, WrittenPairsReadBackAndAbsentKeysKeepDefaults) {
    Record r;
    r.a = -17;
    const std::string text = "{" + jsonNamedValue("n", 3) + "," + jsonNamedValue("f", 3.14159274f) + "," +
                             jsonNamedValue("s", "x") + "," + jsonNamedValue("b", false) + "," + jsonNamedValue("r", r) +
                             ",\"x\":yes}";
    EXPECT_EQ(text, "{\"n\":3,\"f\":3.14159,\"s\":\"x\",\"b\":false,\"r\":{\"a\":-17},\"x\":yes}");
    const Items m = parseJsonObject(text);
    Record out;
    int missing = 2;
    bool b = true, x = false;
    EXPECT_TRUE(jsonObjectItemToNamedValue(m, "r", out));
    EXPECT_TRUE(jsonObjectItemToNamedValue(m, "b", b));
    EXPECT_FALSE(jsonObjectItemToNamedValue(m, "missing", missing));
    EXPECT_EQ(out.a, -17);
    EXPECT_FALSE(b);
    EXPECT_EQ(missing, 2);
    EXPECT_THROW(jsonObjectItemToNamedValue(m, "x", x), JsonError);
    r.failWrite = true;
    expectJsonError([&] { jsonNamedValue("r", r); }, "Json serialization error", "failing record");
}

// Every prefix of a valid text, and random texts over the dialect's own
// characters, either parse or raise JsonError: no crash, no read out of
// bounds (this suite also runs under ASan/UBSan).
TEST(JsonRobustness, TruncatedAndGarbageTextsFailCleanly) {
    auto tolerate = [](auto f) {
        try {
            f();
        } catch (const JsonError&) {
        }
    };
    const std::string text = "{\"a\":[1,{\"b\":\"}\"}],\"c\":{\"d\":{\"e\":[[]]}},\"f\":\"g\",\"h\":1 2 ,\"i\":,}";
    ASSERT_EQ(parseJsonObject(text).size(), 5u);
    for (std::size_t n = 0; n < text.size(); ++n) tolerate([&] { parseJsonObject(text.substr(0, n)); });

    const std::string alphabet = "{}[]\",: \t\r\nab1\\";
    std::mt19937 rng(20240611u);
    for (int round = 0; round < 20000; ++round) {
        std::string t;
        for (int i = static_cast<int>(rng() % 24); i > 0; --i) t += alphabet[rng() % alphabet.size()];
        t = (round % 2 ? "{" : "[") + t + (round % 2 ? "}" : "]");
        const std::size_t p = rng() % (t.size() + 2);
        tolerate([&] { parseJsonObject(t); });
        tolerate([&] { parseJsonArray(t); });
        tolerate([&] { findPairedChar(t, p, '}'); });
        tolerate([&] { moveToNextToken(t, p); });
    }
}
