// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/hostexport.h"
#include "host/utils/ibufpostfm.h"
#include "host/utils/resamplebuffer.h"
#include "host/utils/resampleinfo.h"

namespace zarn::utils {

/// Fills `destination` with values of `source` at the positions that `transform` gives, for all ten
/// sample types and the four complex ones, whose parts are interpolated each for itself.
///
/// A pixel is uncovered that has no position or one outside of the source's pixels, whose nearest
/// pixel is masked (nearest) or less than half of whose weight is valid (bilinear, cubic).
/// Uncovered pixels become the no-data value, or stay as they are without one.
///
/// Masked pixels take no part and the weights of the others are made to sum to one. Pixels beyond
/// the edge do not exist: they take no part either, but nothing is missing without them. A position
/// on the centre of a valid pixel gives that pixel unchanged. Everything else is computed in
/// double, bytes in float; integers are rounded to the nearest, ties to even, and clamped to their
/// type. A computed pixel that would equal the no-data value in all its samples is moved off it by
/// one step.
///
/// Shared out to threads when the transform allows it; the result does not depend on that. Throws
/// `DataException`, before anything is written, for buffers that differ in type or channels, have
/// no data, or a type or a method that cannot be resampled, and for a no-data pixel of another
/// number of channels.
ZARN_HOST_EXPORT void Resample(const ResampleBuffer& source, ResampleBuffer& destination,
                               IBufPosTfm* transform, const ResampleInfo& info);

}  // namespace zarn::utils
