// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "host/core/exception.h"
#include "host/gobs/datatypes.h"
#include "processes/filters/framework/extendtypedispatch.h"

namespace zarn::typedispatch {
namespace {

struct INamed {
  virtual ~INamed() = default;
  virtual std::string Name() const = 0;
};

template <typename T>
struct Named : INamed {
  std::string Name() const override {
    const std::string kind = !std::numeric_limits<T>::is_integer ? "f"
                             : std::numeric_limits<T>::is_signed ? "s"
                                                                 : "u";
    return kind + std::to_string(8 * sizeof(T));
  }
};

using Dispatcher = ExtendDispatchTypes<Factory1Template<Named, INamed>, 1, AllSampleTypes,
                                       AllSampleTypes, NullDataType>;

std::string NameFor(const std::vector<gobs::DataType>& types, bool allowComplex) {
  return std::unique_ptr<INamed>(Dispatcher::Dispatch(types, allowComplex))->Name();
}

gobs::DataType Describe(std::uint32_t code) {
  return gobs::NativeDataType(static_cast<gobs::NativeDataTypeCode>(code)).Description();
}

TEST(ExtendDispatchTypes, FindsTheTypeOfEveryCode) {
  const char* kNames[] = {"u8", "s8", "u16", "s16", "u32", "s32", "f32", "s64", "u64", "f64"};
  for (std::uint32_t code = 0; code < 10; ++code) {
    for (const bool allowComplex : {false, true}) {
      EXPECT_EQ(NameFor({Describe(code)}, allowComplex), kNames[code]) << code;
    }
  }
}

TEST(ExtendDispatchTypes, GivesComplexBlocksTheirComponentTypeWhenAllowed) {
  const struct {
    std::uint32_t code;
    const char* name;
  } kCases[] = {{11, "s16"}, {12, "s32"}, {13, "f32"}, {14, "f64"}};
  for (const auto& c : kCases) {
    EXPECT_EQ(NameFor({Describe(c.code)}, true), c.name);
    EXPECT_THROW(NameFor({Describe(c.code)}, false), Exception);
  }
}

TEST(ExtendDispatchTypes, ConsumesTheFirstTypeOnly) {
  EXPECT_EQ(NameFor({Describe(3), Describe(9), {}}, false), "s16");
}

void ExpectRefusal(const std::vector<gobs::DataType>& types, const std::string& message) {
  try {
    NameFor(types, false);
    ADD_FAILURE() << "nothing thrown";
  } catch (const Exception& e) {
    EXPECT_EQ(e.Message(), message);
    EXPECT_EQ(e.SourceFile(), "core/typedispatch/extendtypedispatch");
    // The whole signature, with the list that was tried.
    EXPECT_NE(e.Function().find("Dispatch"), std::string::npos) << e.Function();
    EXPECT_NE(e.Function().find("NullDataType"), std::string::npos) << e.Function();
    EXPECT_GT(e.Line(), 0U);
  }
}

TEST(ExtendDispatchTypes, RefusesWhatItDoesNotKnow) {
  ExpectRefusal({}, "Not enough type in the vector for the dispatcher you are using.");
  ExpectRefusal({Describe(11)}, "Invalid type requested.");
  ExpectRefusal({gobs::DataType{}}, "Invalid type requested.");
  // Every field counts.
  gobs::DataType odd = Describe(2);
  odd.significandBits = 15;
  ExpectRefusal({odd}, "Invalid type requested.");
}

}  // namespace
}  // namespace zarn::typedispatch
