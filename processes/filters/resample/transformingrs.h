// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "host/gobs/raster.h"
#include "host/utils/ibufpostfm.h"
#include "processes/filters/resample/iresample.h"

namespace zarn::processes::filters {

/// What the bases of the resamplers share: a position transform that they own, and sampling by the
/// host's `Resample` where it says.
///
/// Input and output may differ in size. They have the same sample type, any of the ten or of the
/// four complex ones, and no margins. The mask covers the input; masked pixels take no part.
/// Uncovered output becomes the first output no-data value in all channels, or stays as it is
/// without one.
///
/// | message (code 0, output untouched unless the transform itself failed) | when |
/// |---|---|
/// | No source position transform in resampling | the transform is null |
/// | Raster margins are not supported in resampling. | either block has margins |
/// | the common ones | other types, short no-data lists, missing or overlapping memory |
/// | the text of the host's exception | it knows no such type, or the transform throws it |
class TransformingRS : public IResample {
 public:
  /// Takes the transform, which may be null, and deletes it at its own end.
  explicit TransformingRS(utils::IBufPosTfm* positions) : transform(positions) {}
  ~TransformingRS() override;

 protected:
  /// One call of `Process`.
  FilterResult SampleBlock(const gobs::Raster& input, gobs::Raster& output,
                           const std::uint8_t* inputMask) const;

  utils::IBufPosTfm* transform;
  std::uint8_t ownsTransform = 1;
};

}  // namespace zarn::processes::filters
