#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>

#include "core/Descramble.h"
#include "support/SourceTree.h"

namespace {

std::string scrambleTool() { return sourcetree::python() + " '" + sourcetree::path("tools/scramble_text.py") + "'"; }

// Stored form of `plain` as the generator makes it: one C literal, \" for quotes.
std::string scrambleWithTool(const std::string& plain) {
    FILE* pipe = popen((scrambleTool() + " --text '" + plain + "'").c_str(), "r");
    if (!pipe) return "";
    std::string out;
    char buffer[256];
    while (fgets(buffer, sizeof buffer, pipe)) out += buffer;
    pclose(pipe);
    if (out.size() < 3) return "";
    const std::string literal = out.substr(1, out.find_last_of('"') - 1);
    std::string stored;
    for (std::size_t i = 0; i < literal.size(); ++i) {
        if (literal[i] == '\\' && i + 1 < literal.size()) ++i;
        stored += literal[i];
    }
    return stored;
}

}  // namespace

TEST(Descramble, RestoresWhatTheGeneratorStores) {
    for (const std::string plain : {"Model data truncated", "a-Z_0 9.", "zzzzzzzzzzzzzzzz", "QVFace \"quoted\": 100%"}) {
        const std::string stored = scrambleWithTool(plain);
        ASSERT_FALSE(stored.empty()) << "scramble_text.py did not run";
        EXPECT_NE(stored, plain);
        EXPECT_EQ(descrambleText(stored.c_str()), plain);
    }
}

TEST(Descramble, PositionsBackslashesAndLongTexts) {
    // The shift depends on the output position; a blank keeps its place and
    // still counts, a backslash is dropped and does not.
    const std::string twice = descrambleText("aa");
    EXPECT_NE(twice[0], twice[1]);
    EXPECT_EQ(descrambleText(" a"), " " + descrambleText("xa").substr(1));
    EXPECT_EQ(descrambleText("a\\b"), descrambleText("ab"));
    EXPECT_EQ(descrambleText("ab\\").size(), 2u);
    EXPECT_EQ(descrambleText("+-/ ,.:"), "+-/ ,.:");
    EXPECT_EQ(descrambleText(nullptr), "");
    // The buffer holds 1023 characters: longer texts come back as they are.
    const std::string long1024(1024, 'q'), long1023(1023, 'q');
    EXPECT_EQ(descrambleText(long1024.c_str()), long1024);
    EXPECT_EQ(descrambleText(long1023.c_str()).size(), 1023u);
    EXPECT_NE(descrambleText(long1023.c_str()), long1023);
}

// Each generated header is what the generator makes from its table today;
// with the test above, every stored text restores to its table's plain text.
TEST(ScrambledTextTables, HeadersMatchTheirTables) {
    for (const std::string table : {"src/core/ScrambledTexts", "src/core/RecordTexts", "src/numeric/NumericTexts"}) {
        const std::string command = scrambleTool() + " --check --table '" + sourcetree::path(table + ".txt") +
                                    "' --header '" + sourcetree::path(table + ".h") + "'";
        EXPECT_EQ(std::system(command.c_str()), 0) << "regenerate " << table << ".h";
    }
}
