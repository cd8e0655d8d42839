#pragma once

#include <gtest/gtest.h>

#include <exception>
#include <string>
#include <typeinfo>

namespace Varnholt::Tests {

/// Exactly this class, with this text.
template <class Expected, class Operation>
void ExpectThrow(const std::string& text, Operation operation) {
    try {
        operation();
        ADD_FAILURE() << "nothing thrown, expected: " << text;
    } catch (const std::exception& exception) {
        EXPECT_EQ(typeid(exception), typeid(Expected)) << "with the text: " << exception.what();
        EXPECT_EQ(exception.what(), text);
    }
}

}  // namespace Varnholt::Tests
