#pragma once
// Expects f to throw an E whose what() is exactly message.
#include <string>

#include <gtest/gtest.h>

template <typename E, typename F>
void expectThrowWith(F&& f, const std::string& message) {
    try {
        f();
        ADD_FAILURE() << "no exception, expected: " << message;
    } catch (const E& e) {
        EXPECT_EQ(std::string(e.what()), message);
    }
}
