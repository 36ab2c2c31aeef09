// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <string>

namespace zarn::bench {

/// One case of a filter beside its peer on the same data. Both are measured in the same run, in
/// random order, and the table at the end gives the ratio of the medians.
struct Comparison {
  std::string name;        ///< "average u8x1 1024 size 5 clean"
  std::string peer;        ///< "boxFilter"
  std::size_t blockBytes;  ///< size of the memcpy that serves as the unit
  std::function<void()> own;
  std::function<void()> other;
};

/// Registers the case; the functions keep what they need alive.
void Compare(Comparison comparison);

/// Runs all registered cases that the command line selects (the flags of Google Benchmark) and
/// prints the table. Returns the exit status of the program.
int RunComparisons(int argc, char** argv);

}  // namespace zarn::bench
