// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace zarn::utils {

/// Pixels that are interpolated together. What a kernel keeps of them stays in the first cache.
inline constexpr std::size_t kResampleRun = 64;

/// Where kernels read: `channels` samples per pixel.
struct KernelSource {
  const std::byte* samples;
  const unsigned char* mask;  ///< null: all are valid
  std::ptrdiff_t width;
  std::ptrdiff_t height;
  std::size_t channels;
  std::ptrdiff_t ahead;  ///< pixels from those of a run to those that will soon be asked for
};

/// What became of a pixel of a run.
enum class RunPixel : std::uint8_t {
  kLeft,       ///< has to be interpolated by itself
  kDone = 1,   ///< is what the definition says
  kUncovered,  ///< has a position in the source, but nothing around it is valid
};

/// What a kernel keeps between its steps.
struct RunScratch {
  static constexpr std::size_t kWords =
      std::size_t{4} * 12;  ///< most of a pixel: four rows of three doubles each

  alignas(64) std::array<double, kResampleRun> fractionX;
  alignas(64) std::array<double, kResampleRun> fractionY;
  alignas(64) std::array<std::int32_t, kResampleRun> column;  ///< of the first neighbour, or -1
  alignas(64) std::array<std::int32_t, kResampleRun> row;     ///< of the first neighbour, or -1
  alignas(64) std::array<std::uint64_t, kResampleRun> index;  ///< of the first neighbour
  alignas(64) std::array<std::uint64_t, kResampleRun * kWords> words;
  alignas(64) std::array<std::uint64_t, kResampleRun * 4> planes;
};

/// Whether this machine has vectors at all: emulated ones would be slower than the definition.
bool HasResampleVectors();

/// Interpolates up to `kResampleRun` pixels, bilinearly or by cubic convolution, for samples up to
/// 32 bits and doubles. `x` and `y` can be read up to the whole run. Writes pixels and what became
/// of each; a pixel that is not done may have been written too.
///
/// It does those pixels that have all their neighbours, with the same bits as the definition: the
/// sums run in the same order.
template <typename T>
void InterpolateRun(const KernelSource& source, bool cubic, const double* x, const double* y,
                    std::size_t count, RunScratch& scratch, T* pixels, RunPixel* states);

}  // namespace zarn::utils
