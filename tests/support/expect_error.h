// Checks that a call raises the ComponentError a test expects.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>

#include "varnel/component_error.h"

namespace varnel::test {

// Runs f, expecting a ComponentError with `number` whose description contains `mentions`.
inline void expectError(const std::function<void()>& f, std::int32_t number, const std::string& mentions) {
    try {
        f();
        ADD_FAILURE() << "no error; expected " << number << " mentioning " << mentions;
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), number) << e.description();
        EXPECT_NE(e.description().find(mentions), std::string::npos) << e.description() << " / " << mentions;
    }
}

}  // namespace varnel::test
