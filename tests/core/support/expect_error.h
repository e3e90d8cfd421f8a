// A failure of the core with its class and its text, as a test states it.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <utility>

#include "foundations/errors.h"

namespace quillet::test {

template <class Function>
void ExpectError(ErrorKind kind, const std::string& message, Function&& function) {
  try {
    std::forward<Function>(function)();
    ADD_FAILURE() << "no error; expected " << HostExceptionName(kind) << ": " << message;
  } catch (const Error& error) {
    EXPECT_EQ(error.kind(), kind) << error.message();
    EXPECT_EQ(error.message(), message);
  }
}

}  // namespace quillet::test
