// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <exception>

#include "host/core/exception.h"

namespace zarn {
namespace {

constexpr unsigned kLineOfTheThrow = __LINE__ + 1;
void ThrowHere() { throw DataException("no room"); }

TEST(Exception, CarriesThePlaceOfTheThrow) {
  try {
    ThrowHere();
    FAIL();
  } catch (const Exception& e) {
    EXPECT_EQ(e.Message(), "no room");
    EXPECT_NE(e.SourceFile().find("exceptiontest.cpp"), std::string::npos) << e.SourceFile();
    EXPECT_NE(e.Function().find("ThrowHere"), std::string::npos) << e.Function();
    EXPECT_EQ(e.Line(), kLineOfTheThrow);
  }
}

TEST(Exception, SurvivesBeingCaughtByTheStandardBase) {
  try {
    throw ParameterException("too long", "rows", 7, "a/b", "void f()", 12);
  } catch (const std::exception& e) {
    EXPECT_STREQ(e.what(), "too long");
    const auto* parameter = dynamic_cast<const ParameterException*>(&e);
    ASSERT_NE(parameter, nullptr);
    EXPECT_EQ(parameter->ParameterName(), "rows");
    EXPECT_EQ(parameter->Type(), 7);
    EXPECT_EQ(parameter->SourceFile(), "a/b");
    EXPECT_EQ(parameter->Function(), "void f()");
    EXPECT_EQ(parameter->Line(), 12U);
  }
}

}  // namespace
}  // namespace zarn
