// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace zarn::testsupport {

/// Reproducible numbers (splitmix64). The standard library's distributions differ between
/// implementations, so a failing seed would not travel.
class RandomNumbers {
 public:
  explicit RandomNumbers(std::uint64_t seed) : state_(seed) {}

  std::uint64_t Next() {
    state_ += 0x9E3779B97F4A7C15U;
    std::uint64_t z = state_;
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9U;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBU;
    return z ^ (z >> 31);
  }
  /// 0 .. `bound` - 1.
  std::uint32_t Below(std::uint32_t bound) {
    return static_cast<std::uint32_t>((Next() >> 32) * bound >> 32);
  }
  std::uint32_t Between(std::uint32_t first, std::uint32_t last) {
    return first + Below(last - first + 1);
  }
  bool Percent(std::uint32_t chance) { return Below(100) < chance; }
  /// In [-1, 1), a multiple of 2^-23.
  double Fraction() { return static_cast<double>(Below(1U << 24)) / (1 << 23) - 1.0; }
  template <typename Value>
  Value Pick(const std::vector<Value>& values) {
    return values[Below(static_cast<std::uint32_t>(values.size()))];
  }

 private:
  std::uint64_t state_;
};

}  // namespace zarn::testsupport
