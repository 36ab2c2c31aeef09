// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <type_traits>

#include "processes/filters/framework/sampletypes.h"

namespace zarn::processes::filters {
namespace {

TEST(VisitSampleType, HandsOverTheTypeOrRefuses) {
  const auto describe = [](std::uint32_t code) {
    std::string name;
    const FilterResult result =
        VisitSampleType(static_cast<gobs::NativeDataTypeCode>(code), "not this one",
                        [&]<typename T>(std::type_identity<T>) {
                          name = (std::is_floating_point_v<T> ? "f"
                                  : std::is_signed_v<T>       ? "s"
                                                              : "u") +
                                 std::to_string(8 * sizeof(T));
                          return FilterResult::Failure("visited");
                        });
    EXPECT_EQ(result.code, 0);
    EXPECT_EQ(result.message, name.empty() ? "not this one" : "visited");
    return name;
  };
  const char* kNames[] = {"u8", "s8", "u16", "s16", "u32", "s32", "f32", "", "", "f64"};
  for (std::uint32_t code = 0; code < 10; ++code) EXPECT_EQ(describe(code), kNames[code]) << code;
  for (const std::uint32_t code : {10U, 11U, 12U, 13U, 14U, 15U, 16U, 4294967295U}) {
    EXPECT_EQ(describe(code), "") << code;
  }
}

}  // namespace
}  // namespace zarn::processes::filters
