// SPDX-License-Identifier: Apache-2.0
#include "Helper/Platform/SharedLibrary.h"

#include <gtest/gtest.h>

namespace {

TEST(SharedLibrary, BindsAFunctionOfALibrary) {
  platform::SharedLibrary library("libm.so.6");
  double (*cosine)(double) = nullptr;
  library.bind(cosine, "cos");
  ASSERT_TRUE(library.complete()) << library.failure();
  EXPECT_EQ(cosine(0.0), 1.0);
}

TEST(SharedLibrary, SaysWhichSymbolIsMissing) {
  platform::SharedLibrary library("libm.so.6");
  double (*function)(double) = nullptr;
  library.bind(function, "no_such_function_here");
  EXPECT_EQ(function, nullptr);
  EXPECT_FALSE(library.complete());
  EXPECT_NE(library.failure().find("no_such_function_here"), std::string::npos);
}

TEST(SharedLibrary, KeepsTheFirstFailureWhenTheLibraryIsMissing) {
  platform::SharedLibrary library("/nonexistent/libnothing.so");
  double (*function)(double) = nullptr;
  library.bind(function, "cos");
  EXPECT_EQ(function, nullptr);
  EXPECT_FALSE(library.complete());
  EXPECT_NE(library.failure().find("/nonexistent/libnothing.so"), std::string::npos);
}

}  // namespace
