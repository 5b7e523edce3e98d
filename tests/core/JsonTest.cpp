#include <gtest/gtest.h>

#include <random>
#include <stdexcept>

#include "core/Json.h"

namespace {

typedef std::map<std::string, std::string> Items;

// Asserts that `text` is rejected with the reader's one message.
void expectReadError(const std::string& text) {
    try {
        parseJsonObject(text);
        ADD_FAILURE() << "accepted: " << text;
    } catch (const JsonError& e) {
        EXPECT_STREQ(e.what(), "Json deserialization error") << text;
    }
}

struct Record {
    int a = 0;
    bool failWrite = false;
    std::string toJson() const {
        if (failWrite) throw std::runtime_error("inner text");
        return "{" + jsonNamedValue("a", a) + "}";
    }
    void fromJson(const std::string& text) { jsonObjectItemToNamedValue(parseJsonObject(text), "a", a); }
};

}  // namespace

TEST(JsonObject, EmptyObjectsWithAndWithoutBlanks) {
    EXPECT_TRUE(parseJsonObject("{}").empty());
    EXPECT_TRUE(parseJsonObject("{ }").empty());
    EXPECT_TRUE(parseJsonObject("{\n\t\f\v }").empty());
}

TEST(JsonObject, ValuesKeepTheirRawText) {
    Items m = parseJsonObject("{ \"s\" : \"x y\" , \"o\":{\"d\":[1,{\"e\":2}]}, \"a\":[ 1 ,2 ], \"n\": -1.5e3 }");
    ASSERT_EQ(m.size(), 4u);
    EXPECT_EQ(m["s"], "\"x y\"");
    EXPECT_EQ(m["o"], "{\"d\":[1,{\"e\":2}]}");
    EXPECT_EQ(m["a"], "[ 1 ,2 ]");
    EXPECT_EQ(m["n"], "-1.5e3");  // trailing blank of the last bare value dropped
}

TEST(JsonObject, TrailingCommaIsAccepted) {
    EXPECT_EQ(parseJsonObject("{\"a\":1,}"), (Items{{"a", "1"}}));
    EXPECT_EQ(parseJsonObject("{\"a\":\"x\",}"), (Items{{"a", "\"x\""}}));
    EXPECT_EQ(parseJsonObject("{\"a\":[],  }"), (Items{{"a", "[]"}}));
}

TEST(JsonObject, BareValueRunsToTheNextComma) {
    EXPECT_EQ(parseJsonObject("{\"a\":1 2,\"b\":3}"), (Items{{"a", "1 2"}, {"b", "3"}}));
    EXPECT_EQ(parseJsonObject("{\"a\":x\"y,\"b\":true}"), (Items{{"a", "x\"y"}, {"b", "true"}}));
    // The comma search starts behind the value's first character.
    EXPECT_EQ(parseJsonObject("{\"a\":,\"b\":1}"), (Items{{"a", ",\"b\":1"}}));
}

TEST(JsonObject, CarriageReturnIsAnOrdinaryCharacter) {
    EXPECT_EQ(parseJsonObject("{\"a\":1\r}"), (Items{{"a", "1\r"}}));
    expectReadError("{\r\"a\":1}");
    expectReadError("{\"a\":1}\r");
}

TEST(JsonObject, StringsEndAtTheNextQuote) {
    expectReadError("{\"a\":\"x\" \"b\":1}");
    expectReadError("{\"a\":\"b\\\"c\"}");
    EXPECT_EQ(parseJsonObject("{\"a\":\"b\\\\\"}")["a"], "\"b\\\\\"");  // no unescaping
}

TEST(JsonObject, BracketsAreCountedWithoutRegardToStrings) {
    EXPECT_EQ(parseJsonObject("{\"a\":\"}\"}")["a"], "\"}\"");
    expectReadError("{\"a\":{\"b\":\"}\"}}");
    // Only the kind being matched is counted.
    EXPECT_EQ(parseJsonObject("{\"a\":[{],\"b\":1}"), (Items{{"a", "[{]"}, {"b", "1"}}));
    expectReadError("{\"a\":[\"]\",{\"b\":1}]}");
}

TEST(JsonObject, RepeatedKeyKeepsTheLastValueAndKeysStayAsWritten) {
    EXPECT_EQ(parseJsonObject("{\"k\":1,\"k\":2}"), (Items{{"k", "2"}}));
    EXPECT_EQ(parseJsonObject("{\"a b\":1}"), (Items{{"a b", "1"}}));
}

TEST(JsonObject, RejectsMalformedFrames) {
    for (const char* text : {"", "{", "}", "x", "[]", " {}", "{} ", "{}\n", "{\"a\":1"}) expectReadError(text);
}

TEST(JsonObject, RejectsMalformedMembers) {
    for (const char* text : {"{a:1}", "{\"a:1}", "{\"\":1}", "{\"a\" 1}", "{\"a\"}", "{\"a\":}", "{\"a\":  }",
                             "{\"a\":\"x}", "{\"a\":{\"b\":1}", "{\"a\":[1}", "{\"a\":[1] x}", "{,}",
                             "{\"a\":1,,\"b\":2}"})
        expectReadError(text);
}

TEST(JsonArray, ItemsKeepTheirRawTextInOrder) {
    const std::vector<std::string> items = parseJsonArray("[\"x\",{\"a\":[1,2]},[3],4.5]");
    EXPECT_EQ(items, (std::vector<std::string>{"\"x\"", "{\"a\":[1,2]}", "[3]", "4.5"}));
    EXPECT_EQ(parseJsonArray("[ 1 , 2 ,]"), (std::vector<std::string>{"1", "2"}));
}

TEST(JsonArray, EmptyAndMalformed) {
    EXPECT_TRUE(parseJsonArray("[]").empty());
    EXPECT_TRUE(parseJsonArray("[ ]").empty());
    for (const char* text : {"", "[", "{}", " []", "[\"x]", "[[1]", "[\"a\" 1]", "[{]"}) {
        EXPECT_THROW(parseJsonArray(text), JsonError) << text;
    }
}

TEST(JsonTokens, MoveToNextTokenSkipsOneComma) {
    const std::string text = "x  ,  y";
    EXPECT_EQ(moveToNextToken(text, 1), 6u);
    EXPECT_EQ(moveToNextToken(text, 7), std::string::npos);
    EXPECT_EQ(moveToNextToken(text, 100), std::string::npos);
    EXPECT_EQ(moveToNextToken("x   ", 1), std::string::npos);
    EXPECT_EQ(moveToNextToken("x , ", 1), std::string::npos);
    EXPECT_THROW(moveToNextToken("x y", 1), JsonError);
}

TEST(JsonTokens, FindPairedCharFollowsOneKindOfBracket) {
    EXPECT_EQ(findPairedChar("{{}{}}", 0, '}'), 5u);
    EXPECT_EQ(findPairedChar("{[}]}", 0, '}'), 2u);
    EXPECT_EQ(findPairedChar("a[\"]\"]", 1, ']'), 3u);
    EXPECT_THROW(findPairedChar("{{}", 0, '}'), JsonError);
    EXPECT_THROW(findPairedChar("{}", 2, '}'), JsonError);
    EXPECT_THROW(findPairedChar("", 0, '}'), JsonError);
}

TEST(JsonValues, FloatsAreWrittenWithSixSignificantDigits) {
    EXPECT_EQ(JsonValue<float>::toText(0.1234567f), "0.123457");
    EXPECT_EQ(JsonValue<float>::toText(100.0f), "100");
    EXPECT_EQ(JsonValue<float>::toText(1234567.0f), "1.23457e+06");
    EXPECT_EQ(JsonValue<float>::toText(-0.5f), "-0.5");
    EXPECT_EQ(JsonValue<int>::toText(-2147483647 - 1), "-2147483648");
}

TEST(JsonValues, NumbersAreReadByExtractionOnly) {
    int i = 7;
    JsonValue<int>::fromText("12abc", i);
    EXPECT_EQ(i, 12);
    JsonValue<int>::fromText(" -3 ", i);
    EXPECT_EQ(i, -3);
    float f = 0;
    JsonValue<float>::fromText("2.5e1x", f);
    EXPECT_FLOAT_EQ(f, 25.0f);
    EXPECT_NO_THROW(JsonValue<int>::fromText("abc", i));
    EXPECT_NO_THROW(JsonValue<float>::fromText("", f));
}

TEST(JsonValues, StringsNeedQuotesAtBothEnds) {
    std::string s = "keep";
    JsonValue<std::string>::fromText("\"\"", s);
    EXPECT_EQ(s, "");
    JsonValue<std::string>::fromText("\"a\\\"b\"", s);
    EXPECT_EQ(s, "a\\\"b");
    for (const char* text : {"", "\"", "x", "\"x", "x\"", "'x'"}) {
        s = "keep";
        EXPECT_THROW(JsonValue<std::string>::fromText(text, s), JsonError) << text;
        EXPECT_EQ(s, "keep");
    }
    EXPECT_EQ(JsonValue<std::string>::toText("a\"b"), "\"a\"b\"");
}

TEST(JsonNamedValue, WritesPairsWithoutBlanks) {
    EXPECT_EQ(jsonNamedValue("n", 3), "\"n\":3");
    EXPECT_EQ(jsonNamedValue("f", 0.25f), "\"f\":0.25");
    EXPECT_EQ(jsonNamedValue("s", std::string("x")), "\"s\":\"x\"");
    EXPECT_EQ(jsonNamedValue("s", "x"), "\"s\":\"x\"");
    EXPECT_EQ(jsonNamedValue("b", true), "\"b\":true");
    EXPECT_EQ(jsonNamedValue("b", false), "\"b\":false");
    Record r;
    r.a = 5;
    EXPECT_EQ(jsonNamedValue("r", r), "\"r\":{\"a\":5}");
}

TEST(JsonNamedValue, RecordFailureBecomesSerializationError) {
    Record r;
    r.failWrite = true;
    try {
        jsonNamedValue("r", r);
        FAIL();
    } catch (const JsonError& e) {
        EXPECT_STREQ(e.what(), "Json serialization error");
    }
}

TEST(JsonObjectItem, AbsentKeysKeepDefaults) {
    const Items m = parseJsonObject("{\"n\":4,\"r\":{\"a\":9},\"t\":true,\"u\":false,\"x\":yes}");
    int n = 1, missing = 2;
    Record r;
    bool t = false, u = true, x = false;
    EXPECT_TRUE(jsonObjectItemToNamedValue(m, "n", n));
    EXPECT_FALSE(jsonObjectItemToNamedValue(m, "missing", missing));
    EXPECT_TRUE(jsonObjectItemToNamedValue(m, "r", r));
    EXPECT_TRUE(jsonObjectItemToNamedValue(m, "t", t));
    EXPECT_TRUE(jsonObjectItemToNamedValue(m, "u", u));
    EXPECT_EQ(n, 4);
    EXPECT_EQ(missing, 2);
    EXPECT_EQ(r.a, 9);
    EXPECT_TRUE(t);
    EXPECT_FALSE(u);
    EXPECT_THROW(jsonObjectItemToNamedValue(m, "x", x), JsonError);
}

TEST(JsonObjectItem, WrittenRecordsReadBack) {
    Record in;
    in.a = -17;
    const std::string text = "{" + jsonNamedValue("inner", in) + ", " + jsonNamedValue("f", 3.14159274f) + "}";
    Record out;
    float f = 0;
    const Items m = parseJsonObject(text);
    ASSERT_TRUE(jsonObjectItemToNamedValue(m, "inner", out));
    ASSERT_TRUE(jsonObjectItemToNamedValue(m, "f", f));
    EXPECT_EQ(out.a, -17);
    EXPECT_FLOAT_EQ(f, 3.14159f);  // six significant digits survive, not more
}

// Every prefix of a valid text and random texts over the dialect's own
// characters must either parse or raise JsonError: never crash, never read out
// of bounds (this suite runs under ASan/UBSan too).
TEST(JsonRobustness, TruncatedTextsFailCleanly) {
    const std::string text =
        "{\"a\":[1,{\"b\":\"}\"}],\"c\":{\"d\":{\"e\":[[]]}},\"f\":\"g\",\"h\":1 2 ,\"i\":,}";
    ASSERT_NO_THROW(parseJsonObject(text));
    for (std::size_t n = 0; n < text.size(); ++n) {
        const std::string prefix = text.substr(0, n);
        try {
            parseJsonObject(prefix);
            parseJsonArray("[" + prefix.substr(std::min<std::size_t>(1, n)) + "]");
        } catch (const JsonError&) {
        }
    }
}

TEST(JsonRobustness, GarbageFailsCleanly) {
    const std::string alphabet = "{}[]\",: \t\r\nab1\\";
    std::mt19937 rng(20240611u);
    int accepted = 0;
    for (int round = 0; round < 20000; ++round) {
        std::string text;
        const int length = static_cast<int>(rng() % 24);
        for (int i = 0; i < length; ++i) text += alphabet[rng() % alphabet.size()];
        if (round % 2) text = "{" + text + "}";
        if (round % 3 == 0) text = "[" + text + "]";
        try {
            Items m = parseJsonObject(text);
            ++accepted;
            for (const auto& item : m) {
                std::string s;
                try {
                    JsonValue<std::string>::fromText(item.second, s);
                } catch (const JsonError&) {
                }
            }
        } catch (const JsonError&) {
        }
        try {
            parseJsonArray(text);
        } catch (const JsonError&) {
        }
        try {
            if (!text.empty()) findPairedChar(text, rng() % text.size(), '}');
            moveToNextToken(text, rng() % (text.size() + 2));
        } catch (const JsonError&) {
        }
    }
    EXPECT_GT(accepted, 0);  // the generator does reach valid texts
}
