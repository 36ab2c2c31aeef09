// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <memory>
#include <new>

#include "processes/filters/framework/parallel.h"

namespace zarn::processes::filters {

/// Shares the rows of a block out: `work(begin, end, scratch)` for bands of rows, each with
/// `scratchBytes` of its own, aligned to 64 bytes, whose content does not matter.
template <class Work>
void ForEachWindowBand(std::ptrdiff_t rows, std::size_t scratchBytes, const Work& work) {
  constexpr std::align_val_t kAlignment{64};
  parallel::AllowDynamicThreads();
  const std::ptrdiff_t bands = parallel::BandCount(rows);
  const std::size_t bytes = (scratchBytes + 63) / 64 * 64;
  const auto release = [&](std::byte* memory) { ::operator delete[](memory, kAlignment); };
  const std::unique_ptr<std::byte[], decltype(release)> scratch(
      new (kAlignment) std::byte[bytes * static_cast<std::size_t>(bands)], release);
  parallel::ForEachRowBand(
      rows, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        work(begin, end, scratch.get() + static_cast<std::size_t>(band) * bytes);
      });
}

}  // namespace zarn::processes::filters
