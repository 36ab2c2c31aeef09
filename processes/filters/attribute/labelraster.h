// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <type_traits>

#include "host/gobs/raster.h"
#include "host/gobs/saturatecast.h"
#include "processes/filters/framework/nodata.h"
#if ZARN_SIMD
#include "processes/filters/attribute/poolflags_simd.h"
#endif

namespace zarn::processes::filters {

/// Which labels are pooled.
template <typename A>
class LabelRule {
 public:
  LabelRule(double noData, double tolerance)
      : noData_(gobs::SaturateCast<A>(noData)), tolerance_(gobs::SaturateCast<A>(tolerance)) {}

  /// Pixels without a label are pooled with every other.
  bool Pools(A centre, A neighbour) const {
    return !IsLabel(centre) || !IsLabel(neighbour) || Near(centre, neighbour);
  }
  bool IsLabel(A value) const { return !PixelNearlyEquals(&value, &noData_, 1); }

  /// The difference wraps around in the type of the labels, so that it is never negative for
  /// unsigned ones. A NaN is near everything.
  bool Near(A centre, A neighbour) const {
    if constexpr (std::is_floating_point_v<A>) {
      const A difference = neighbour - centre;
      return !(difference > tolerance_ || difference < -tolerance_);
    } else {
      using Unsigned = std::make_unsigned_t<A>;
      const std::int64_t difference = static_cast<A>(
          static_cast<Unsigned>(static_cast<Unsigned>(neighbour) - static_cast<Unsigned>(centre)));
      const std::int64_t tolerance = tolerance_;
      return difference <= tolerance && difference >= -tolerance;
    }
  }

  A noData() const { return noData_; }
  A tolerance() const { return tolerance_; }

 private:
  A noData_;
  A tolerance_;
};

/// The labels of one call on the grid of the image, behind which their type disappears: the types
/// of labels and of samples never meet in one template.
class LabelRaster {
 public:
  virtual ~LabelRaster();

  /// Whether the labels at two positions are pooled, in coordinates of the image.
  virtual bool Pools(std::ptrdiff_t x, std::ptrdiff_t y, std::ptrdiff_t nx,
                     std::ptrdiff_t ny) const = 0;

#if ZARN_SIMD
  /// Bytes of one label.
  virtual std::size_t LabelSize() const = 0;
  /// Whether `FlagPools` holds for this tolerance: it knows no rule under which labels differ from
  /// themselves.
  virtual bool HasVectors() const = 0;
  /// Labels of `count` pixels of row `y` from column `x` on, as many as there are pixels. `row` is
  /// aligned for labels and padded by `kSampleRowPadding` of them.
  virtual void ReadRow(std::ptrdiff_t x, std::ptrdiff_t y, std::size_t count, void* row) const = 0;
  /// Flags the pixels of such a row that have no label, and tells whether there are any. The flags
  /// are padded likewise.
  virtual bool FlagUnlabelled(const void* row, std::size_t count, std::uint8_t* flags) const = 0;
  /// Tells which neighbours are pooled, for labels from `ReadRow`.
  virtual void FlagPools(const PoolRun& run) const = 0;
#endif
};

/// The first channel of `attr`, each of whose pixels serves `scale` times `scale` pixels of the
/// image. Null for a type that is not handled.
std::unique_ptr<LabelRaster> MakeLabelRaster(const gobs::Raster& attr, std::ptrdiff_t scale,
                                             double noData, double tolerance);

}  // namespace zarn::processes::filters
