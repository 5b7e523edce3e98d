#pragma once
// Expects f to throw an E whose what() is exactly message.
#include <functional>
#include <string>

#include <gtest/gtest.h>

template <typename E>
void expectThrowWith(const std::function<void()>& f, const std::string& message) {
    try {
        f();
        ADD_FAILURE() << "no exception, expected: " << message;
    } catch (const E& e) {
        EXPECT_EQ(std::string(e.what()), message);
    }
}
