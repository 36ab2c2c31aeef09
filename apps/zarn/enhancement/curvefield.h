// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "host/gobs/raster.h"
#include "processes/filters/enhancement/igeolutmatrix.h"
#include "processes/filters/enhancement/powercurve.h"

namespace zarn::app {

enum class CellBlending {
  kNone,      ///< every pixel by the curve of its own cell
  kBilinear,  ///< by the curves of the four cells whose centres are around it
};

/// Enhances the pixels of an image by the curves of a grid of cells.
///
/// Blended, a pixel becomes the bilinear mean of what the curves of the four nearest cells make of
/// it, by the distances of its centre to theirs: first between the cells above and below, then
/// between those on the left and on the right; beyond the outermost centres the nearest cells count
/// alone. All is computed in single precision and rounded half up. The place of a pixel is that in
/// the whole image, so that nothing depends on windows.
template <typename T>
class CurveField {
 public:
  CurveField(const processes::filters::IGeoLUTMatrix& matrix, CellBlending blending);

  /// Enhances a block without margins. Pixels whose byte in `valid` is 0 are left alone; `valid`
  /// may be null. An enhanced pixel that is `noData` (one value for each channel, or null) in all
  /// channels becomes its neighbour in the first one.
  void Apply(const gobs::Raster& input, const std::uint8_t* valid, const T* noData,
             gobs::Raster& output) const;

 private:
  using Curve = processes::filters::PowerCurve;
  struct Block;
  struct Run;
  struct Axis;
  struct Scratch;

  Axis PlaceAlong(std::uint64_t origin, std::size_t count, std::uint32_t tile,
                  std::uint32_t cells) const;
  std::array<Curve, 4> Corners(const Run& rows, const Run& columns, std::size_t channel) const;
  /// The powers of the levels above the beginnings of curves; below them that of 0.
  std::array<const float*, 4> Tables(const std::array<Curve, 4>& curves) const;
  void EnhanceRows(const Block& block, const Axis& rows, const Axis& columns, std::size_t begin,
                   std::size_t end, Scratch& scratch) const;
  void EnhanceTile(const Block& block, const Axis& rows, const Axis& columns, const Run& rowRun,
                   const Run& columnRun, std::size_t channel, Scratch& scratch) const;
  void EnhanceRow(const Block& block, std::size_t y, const Run& rowRun, float rowWeight,
                  const Axis& columns, Scratch& scratch) const;

  static constexpr std::size_t kLevels = std::size_t{1} << 8 * sizeof(T);
  static constexpr auto kTop = static_cast<float>(kLevels - 1);

  std::uint32_t tileWidth_;
  std::uint32_t tileHeight_;
  std::uint32_t rows_;
  std::uint32_t columns_;
  std::size_t channels_;
  CellBlending blending_;
  std::vector<float> powers_;  ///< of the levels, after as many zeros
  std::vector<Curve> curves_;  ///< cell by cell, the channels of each
};

extern template class CurveField<std::uint8_t>;
extern template class CurveField<std::uint16_t>;

}  // namespace zarn::app
