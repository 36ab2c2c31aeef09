// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

namespace zarn::processes::filters {

/// Channels of `count` interleaved pixels, those of channel c from `planes + c * pitch` on, for the
/// eight sample types. Pixels and planes are padded by `kSampleRowPadding` pixels.
template <typename T>
void SplitChannels(const T* pixels, std::size_t count, std::size_t channels, T* planes,
                   std::size_t pitch);

/// The inverse; all rows are padded likewise.
template <typename T>
void JoinChannels(const T* planes, std::size_t pitch, std::size_t count, std::size_t channels,
                  T* pixels);

}  // namespace zarn::processes::filters
