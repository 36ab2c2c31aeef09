// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <vector>

#include "processes/filters/resample/transformingrs.h"

namespace zarn::processes::filters {

namespace details {

/// Copies one block of one sample type.
class IDirectCopyProc {
 public:
  IDirectCopyProc() = default;
  IDirectCopyProc(const IDirectCopyProc&) = delete;
  IDirectCopyProc& operator=(const IDirectCopyProc&) = delete;
  virtual ~IDirectCopyProc() = default;

  /// `outputNoData` is null when uncovered output stays as it is.
  virtual void Copy(FilterResult& result, const gobs::Raster& input, gobs::Raster& output,
                    int columnShift, int rowShift, const std::vector<double>* outputNoData) = 0;
};

}  // namespace details

/// Copies whole pixels: output pixel (x, y) takes input pixel (x + dx, y + dy), where the shifts
/// are those given plus what the output's origin lies beyond the input's. The blocks may differ in
/// size and margins; margins are neither read nor copied.
///
/// Output that the input does not cover becomes the output no-data pixel, or stays as it is without
/// one. Runs of whole rows are filled as if rows had no margins. For complex samples the list has
/// two entries per channel, or one, which then is the real part.
///
/// All ten sample types and the four complex ones; others end in the dispatcher's `Exception`.
/// Fails only with the common messages, for other types, a short no-data list, and missing or
/// overlapping memory. Large blocks are shared out to threads.
class DirectCopyRSBase : public TransformingRS {
 public:
  DirectCopyRSBase(int columns, int rows)
      : TransformingRS(nullptr), columnShift(columns), rowShift(rows) {}

  utils::ResampleMethod GetResampleMethod() const override {
    return utils::ResampleMethod::kDirectCopy;
  }

 protected:
  int columnShift;
  int rowShift;
};

class CPUDirectCopyRS : public DirectCopyRSBase {
 public:
  using DirectCopyRSBase::DirectCopyRSBase;

  /// Only the two blocks are used.
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output, std::uint32_t blockX,
                       std::uint32_t blockY, const std::uint8_t* inputMask) override;
};

}  // namespace zarn::processes::filters
