#ifndef QUORIN_TESTS_NUMERIC_FIXTURES_H
#define QUORIN_TESTS_NUMERIC_FIXTURES_H

#include <gtest/gtest.h>

#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "support/SourceTree.h"

// The numpy/OpenCV reference values of tools/make_numeric_fixtures.py: one
// `name count values...` line per array. An unknown name gives an empty array,
// so that the test fails on its size.
namespace fixtures {

inline std::vector<float> floats(const std::string& name) {
    static const std::map<std::string, std::vector<float>> table = [] {
        std::map<std::string, std::vector<float>> t;
        std::istringstream in(sourcetree::readText(sourcetree::path("tests/numeric/fixtures/numeric_reference.txt")));
        for (std::string line; std::getline(in, line);) {
            std::istringstream fields(line);
            std::string key;
            std::size_t count = 0;
            if (!(fields >> key >> count)) continue;  // blank or comment
            for (float x = 0; t[key].size() < count && fields >> x;) t[key].push_back(x);
        }
        return t;
    }();
    auto it = table.find(name);
    return it == table.end() ? std::vector<float>() : it->second;
}

// Expects `actual` to agree with the reference `name`, element by element.
inline void expectAgrees(const std::vector<float>& actual, const std::string& name, double tolerance) {
    const std::vector<float> reference = floats(name);
    ASSERT_EQ(actual.size(), reference.size()) << name;
    for (std::size_t i = 0; i < actual.size(); ++i)
        EXPECT_NEAR(actual[i], reference[i], tolerance) << name << "[" << i << "]";
}

}  // namespace fixtures

#endif
