// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <functional>
#include <string>

namespace zarn::bench {

/// One case of a filter beside its peer on the same data. The two and a copy of the block are timed
/// in turns, each after one run of its own that is not timed, so that changes in the machine's
/// speed and threads left over from the one before fall on all alike.
struct Comparison {
  std::string name;        ///< "average u8x1 1024 size 5 clean"
  std::string peer;        ///< "boxFilter"
  std::size_t blockBytes;  ///< size of the memcpy that serves as the unit
  std::function<void()> own;
  std::function<void()> other;
  double otherScale = 1;  ///< the peer's time counts so often: it was given a part of the block
};

/// Registers the case; the functions keep what they need alive.
void Compare(Comparison comparison);

/// Runs all registered cases that the command line selects (the flags of Google Benchmark) and
/// prints the table: medians of the times, and of the ratios turn by turn. Returns the exit status
/// of the program.
int RunComparisons(int argc, char** argv);

}  // namespace zarn::bench
