// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "apps/zarn/windows.h"

namespace zarn::app {

/// The area in which a scene shows.
struct ScenePolygon {
  /// Closed rings in pixels of the mosaic, (0, 0) being its upper left corner. They count by the
  /// even-odd rule, do not cross themselves or each other, and touch in single vertices at most.
  /// With y pointing down, what they enclose lies to their right: outer rings have a positive
  /// `RingArea`, holes a negative one.
  std::vector<std::vector<std::array<double, 2>>> rings;
};

/// The area within a closed ring, in the unit of its coordinates; negative when, with y pointing
/// down, it runs anticlockwise.
double RingArea(const std::vector<std::array<double, 2>>& ring);

/// The areas of the labels 0 .. `count` - 1 as polygons, which together cover the lattice without
/// gap or overlap: neighbours share the same vertices. A label that occurs nowhere has no rings.
/// `cell` is the size of a cell in pixels.
///
/// Borders run through the middles of the edges of cells, which cuts the corners of stairs; then
/// vertices are left out where the border moves by no more than `tolerance` cells (D. Douglas, T.
/// Peucker: Algorithms for the Reduction of the Number of Points Required to Represent a Digitized
/// Line or its Caricature, 1973), and put back where borders would meet or pass each other. Points
/// where three areas meet or a border ends at the frame stay where they are. With a tolerance of 0
/// the centre of every cell lies in the polygon of its label; with 1 to 2 there is a vertex every
/// few cells of a ragged seam.
std::vector<ScenePolygon> SeamPolygons(const std::vector<std::uint32_t>& labels, WindowSize lattice,
                                       std::size_t count, double cell, double tolerance);

}  // namespace zarn::app
