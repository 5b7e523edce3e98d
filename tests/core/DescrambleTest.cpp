#include <gtest/gtest.h>

#include <cstdio>
#include <sstream>

#include "core/Descramble.h"
#include "core/ScrambledTexts.h"
#include "support/SourceTree.h"

namespace {

// Stored form of `plain` as the generator makes it.
std::string scrambleWithTool(const std::string& plain) {
    const std::string command =
        sourcetree::python() + " '" + sourcetree::path("tools/scramble_text.py") + "' --text '" + plain + "'";
    FILE* pipe = popen(command.c_str(), "r");
    if (!pipe) return "";
    std::string out;
    char buffer[256];
    while (fgets(buffer, sizeof buffer, pipe)) out += buffer;
    pclose(pipe);
    // One C literal per line: "....", with \" for quotes.
    if (out.size() < 3) return "";
    std::string literal = out.substr(1, out.find_last_of('"') - 1);
    std::string stored;
    for (std::size_t i = 0; i < literal.size(); ++i) {
        if (literal[i] == '\\' && i + 1 < literal.size()) ++i;
        stored += literal[i];
    }
    return stored;
}

}  // namespace

TEST(Descramble, RestoresWhatTheGeneratorStores) {
    for (const std::string plain : {"Hello World", "Model data truncated", "leftEye", "a-Z_0 9.", "zzzzzzzzzzzzzzzz",
                                    "QVFace \"quoted\" text: 100%"}) {
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
    // 1024 characters and more come back as they are; 1023 are restored.
    const std::string long1024(1024, 'q'), long1023(1023, 'q');
    EXPECT_EQ(descrambleText(long1024.c_str()), long1024);
    EXPECT_EQ(descrambleText(long1023.c_str()).size(), 1023u);
    EXPECT_NE(descrambleText(long1023.c_str()), long1023);
}

TEST(ScrambledTextTable, HeaderMatchesItsTable) {
    // Each row of the table restores to its plain text, and the generated header
    // is what the generator makes from the table today.
    std::istringstream table(sourcetree::readText(sourcetree::path("src/core/ScrambledTexts.txt")));
    std::map<std::string, std::string> plain;
    for (std::string line; std::getline(table, line);) {
        const std::size_t tab = line.find('\t');
        if (line.empty() || line[0] == '#' || tab == std::string::npos) continue;
        plain[line.substr(0, tab)] = line.substr(tab + 1);
    }
    ASSERT_FALSE(plain.empty());
    EXPECT_EQ(descrambleText(scrambled::kModelNotFound), plain["kModelNotFound"]);
    EXPECT_EQ(descrambleText(scrambled::kConfigurationLoadFailed), plain["kConfigurationLoadFailed"]);
    EXPECT_EQ(descrambleText(scrambled::kFaceRecordReadFailed), plain["kFaceRecordReadFailed"]);

    const std::string command = sourcetree::python() + " '" + sourcetree::path("tools/scramble_text.py") +
                                "' --check --table '" + sourcetree::path("src/core/ScrambledTexts.txt") +
                                "' --header '" + sourcetree::path("src/core/ScrambledTexts.h") + "'";
    EXPECT_EQ(std::system(command.c_str()), 0) << "regenerate src/core/ScrambledTexts.h";
}
