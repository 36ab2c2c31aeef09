// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/framework/blockview.h"
#include "processes/filters/framework/nodata.h"

namespace zarn::processes::filters {

/// Why a pixel takes no part in a window, in the order in which the reasons are looked at.
enum class Exclusion : std::uint8_t {
  kNone,
  kMasked,      ///< mask byte 0
  kNoData,      ///< all channels equal the input no-data values
  kBackground,  ///< all channels equal the background value
};

/// What the square-window filters share: the parameters of one call in the sample type, which
/// neighbours count, and what an excluded centre becomes. Exclusion is decided on whole pixels.
template <typename T>
class WindowRules {
 public:
  /// `mask` is null or covers the full input block; the lists are empty or have an entry for each
  /// channel; without `background` no pixel is background.
  WindowRules(const gobs::Raster& input, const std::vector<double>& inputNoData,
              const std::vector<double>& outputNoData, std::optional<double> background,
              const std::uint8_t* mask)
      : channels_(input.Channels()),
        mask_(mask),
        inputNoData_(ConvertNoData<T>(inputNoData)),
        outputNoData_(ConvertNoData<T>(outputNoData)),
        background_(background ? input.Channels() : 0,
                    TruncateToSample<T>(background.value_or(0))) {}

  /// `maskByte` is the pixel's byte in the mask, if there is one.
  Exclusion Classify(const T* pixel, const std::uint8_t* maskByte) const {
    if (maskByte != nullptr && *maskByte == 0) return Exclusion::kMasked;
    if (HasInputNoData() && PixelEquals(pixel, inputNoData_.data(), channels_)) {
      return Exclusion::kNoData;
    }
    if (HasBackground() && PixelEquals(pixel, background_.data(), channels_)) {
      return Exclusion::kBackground;
    }
    return Exclusion::kNone;
  }

  /// Writes what an excluded centre becomes. Masked pixels, and no-data pixels without an output
  /// no-data value, keep what the output holds.
  void WriteExcluded(Exclusion reason, T* output) const {
    if (reason == Exclusion::kBackground) {
      std::copy_n(background_.data(), channels_, output);
    } else if (reason == Exclusion::kNoData && HasOutputNoData()) {
      std::copy_n(outputNoData_.data(), channels_, output);
    }
  }

  bool HasInputNoData() const { return !inputNoData_.empty(); }
  bool HasOutputNoData() const { return !outputNoData_.empty(); }
  bool HasBackground() const { return !background_.empty(); }
  const std::uint8_t* mask() const { return mask_; }
  /// One value per channel; empty when the feature is off.
  const std::vector<T>& inputNoData() const { return inputNoData_; }
  const std::vector<T>& outputNoData() const { return outputNoData_; }
  const std::vector<T>& background() const { return background_; }

 private:
  std::size_t channels_;
  const std::uint8_t* mask_;
  std::vector<T> inputNoData_;
  std::vector<T> outputNoData_;
  std::vector<T> background_;
};

/// Half the side of a window; a kernel of size -1, 0 or 1 is the pixel alone. For -2 and below the
/// result is the (negative) quotient.
constexpr int HalfWindow(int kernelSize) { return kernelSize / 2; }

}  // namespace zarn::processes::filters
