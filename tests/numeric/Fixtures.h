#ifndef QUORIN_TESTS_NUMERIC_FIXTURES_H
#define QUORIN_TESTS_NUMERIC_FIXTURES_H

#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "support/SourceTree.h"

// The numpy/OpenCV reference values of tools/make_numeric_fixtures.py: one
// `name count values...` line per array.
namespace fixtures {

inline const std::map<std::string, std::vector<double>>& reference() {
    static const std::map<std::string, std::vector<double>> table = [] {
        std::map<std::string, std::vector<double>> t;
        std::istringstream in(sourcetree::readText(sourcetree::path("tests/numeric/fixtures/numeric_reference.txt")));
        for (std::string line; std::getline(in, line);) {
            if (line.empty() || line[0] == '#') continue;
            std::istringstream fields(line);
            std::string name;
            std::size_t count = 0;
            fields >> name >> count;
            std::vector<double>& values = t[name];
            double v = 0;
            while (values.size() < count && fields >> v) values.push_back(v);
        }
        return t;
    }();
    return table;
}

// Empty when the name is unknown, so that a test fails on its size check.
inline std::vector<double> values(const std::string& name) {
    auto it = reference().find(name);
    return it == reference().end() ? std::vector<double>() : it->second;
}

inline std::vector<float> floats(const std::string& name) {
    const std::vector<double> v = values(name);
    return std::vector<float>(v.begin(), v.end());
}

}  // namespace fixtures

#endif
