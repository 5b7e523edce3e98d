#ifndef QUORIN_TESTS_GOLDENFILE_H
#define QUORIN_TESTS_GOLDENFILE_H

#include <cstdlib>
#include <fstream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

// Compares lines made now with a golden file written on x86-64 (the armhf
// build must give the same). QUORIN_WRITE_GOLDEN=1 rewrites the file instead,
// under the comment line `header`, and skips. Lines starting with '#' are
// comments. At most five differing lines are shown.
inline void expectGoldenLines(const std::string& path, const std::string& header,
                              const std::vector<std::string>& lines) {
    if (std::getenv("QUORIN_WRITE_GOLDEN")) {
        std::ofstream out(path);
        out << "# " << header << "\n";
        for (const std::string& l : lines) out << l << "\n";
        GTEST_SKIP() << "golden file rewritten: " << path;
    }
    std::ifstream in(path);
    ASSERT_TRUE(in) << "no golden file at " << path;
    std::vector<std::string> golden;
    for (std::string l; std::getline(in, l);)
        if (!l.empty() && l[0] != '#') golden.push_back(l);
    ASSERT_EQ(golden.size(), lines.size());
    int differences = 0;
    for (size_t i = 0; i < lines.size(); ++i)
        if (lines[i] != golden[i] && ++differences <= 5)
            ADD_FAILURE() << "line " << i << "\n  golden: " << golden[i] << "\n  now:    " << lines[i];
    EXPECT_EQ(differences, 0);
}

#endif
