#pragma once
// Expects f to throw an E whose what() is exactly message; `context` names
// the case in a failure.
#include <string>

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
