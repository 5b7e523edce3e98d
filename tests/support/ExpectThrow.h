#pragma once
// Expects f to throw an E whose what() is exactly message; `context` names
// the case in a failure.
#include <cstdint>
#include <string>
#include <vector>

#include <gtest/gtest.h>

template <typename E, typename F>
void expectThrowWith(F&& f, const std::string& message, const std::string& context = "") {
    try {
        f();
        ADD_FAILURE() << "no exception, expected: " << message << " " << context;
    } catch (const E& e) {
        EXPECT_EQ(std::string(e.what()), message) << context;
    }
}

// Expects load to throw an E on every cut of `bytes` short of the whole, each
// in a vector of its own length so that ASan sees a read past it.
template <typename E, typename F>
void expectEveryCutThrows(const std::vector<uint8_t>& bytes, F&& load) {
    for (std::size_t n = 0; n < bytes.size(); ++n)
        EXPECT_THROW(load(std::vector<uint8_t>(bytes.begin(), bytes.begin() + static_cast<long>(n))), E) << "cut at " << n;
}
