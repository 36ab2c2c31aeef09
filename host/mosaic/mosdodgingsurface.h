// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/hostexport.h"
#include "host/mosaic/hcachable.h"
#include "host/mosaic/tcachefactoryref.h"

/// A smooth correction over the whole mosaic, with one value per channel at every pixel.
///
/// Reading is safe for any number of threads at a time.
class ZARN_HOST_EXPORT MOSDodgingSurface : public HCachable {
 public:
  virtual unsigned Channels() const = 0;

  /// The surface at a pixel of the mosaic: `Channels()` floats to `values`.
  virtual void GetBilinearValue(unsigned column, unsigned row, float* values) const = 0;

  /// The surface at `count` pixels of a row, from `column` on: the same values as `count` calls of
  /// `GetBilinearValue`, channel after channel, those of channel c from `values + c * pitch` on.
  /// Columns wrap around at 2^32. This one makes the calls; surfaces override it where they can do
  /// it at once.
  virtual void GetBilinearRun(unsigned column, unsigned row, unsigned count, float* values,
                              unsigned pitch) const;
};

/// How the mosaicking core hands out a surface that may have to be loaded first.
using MOSDodgingSurfaceFactoryRef = TCacheFactoryRef<TCacheRef<MOSDodgingSurface>>;
