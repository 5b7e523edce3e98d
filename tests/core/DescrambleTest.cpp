#include <gtest/gtest.h>

#include <cstdlib>
#include <sstream>

#include "core/Descramble.h"
#include "core/ScrambledTexts.h"
#include "support/SourceTree.h"

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

// Each generated header is what tools/scramble_text.py makes from its table
// today, and the stored texts restore to the table's plain texts.
TEST(ScrambledTextTables, HeadersMatchTheirTablesAndRestore) {
    for (const std::string table : {"src/core/ScrambledTexts", "src/core/RecordTexts", "src/numeric/NumericTexts"}) {
        const std::string command = sourcetree::python() + " '" + sourcetree::path("tools/scramble_text.py") +
                                    "' --check --table '" + sourcetree::path(table + ".txt") + "' --header '" +
                                    sourcetree::path(table + ".h") + "'";
        EXPECT_EQ(std::system(command.c_str()), 0) << "regenerate " << table << ".h";
    }
    std::istringstream table(sourcetree::readText(sourcetree::path("src/core/ScrambledTexts.txt")));
    std::map<std::string, std::string> plain;
    for (std::string line; std::getline(table, line);) {
        const std::size_t tab = line.find('\t');
        if (line[0] != '#' && tab != std::string::npos) plain[line.substr(0, tab)] = line.substr(tab + 1);
    }
    EXPECT_EQ(descrambleText(scrambled::kModelNotFound), plain["kModelNotFound"]);
    EXPECT_EQ(descrambleText(scrambled::kConfigurationLoadFailed), plain["kConfigurationLoadFailed"]);
    EXPECT_EQ(descrambleText(scrambled::kFaceRecordReadFailed), plain["kFaceRecordReadFailed"]);
}
