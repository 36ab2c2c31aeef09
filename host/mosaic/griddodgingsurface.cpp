// SPDX-License-Identifier: Apache-2.0
#include "host/mosaic/griddodgingsurface.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "host/core/exception.h"
#include "host/sys/vectorised.h"

namespace {

// The last column or row of nodes that has another one after it, if any has.
unsigned LastNode(unsigned nodes) { return nodes > 1 ? nodes - 2 : 0; }

/// Where a pixel lies between two nodes of one axis.
struct Place {
  std::size_t node;
  double fraction;
};

/// Steps from the first node, held within the grid.
double PositionOf(unsigned pixel, double origin, double step, double lastNode) {
  const double position = (static_cast<double>(pixel) - origin) / step;
  return std::min(std::max(position, 0.0), lastNode);
}

Place PlaceOf(unsigned pixel, double origin, double step, unsigned nodes) {
  const double position = PositionOf(pixel, origin, step, nodes - 1.0);
  const auto node = std::min(static_cast<std::size_t>(position), std::size_t{LastNode(nodes)});
  return {node, position - static_cast<double>(node)};
}

double Between(double a, double b, double fraction) { return a + (b - a) * fraction; }

/// One axis of the grid.
struct Axis {
  double origin;
  double step;
  double lastNode;
};

constexpr unsigned kPiece = 256;

// How far the pixels of a cell lie from its left nodes to its right ones.
ZARN_VECTORISED
void PlaceInCell(const Axis& x, double node, unsigned column, unsigned count, double* fractions) {
  const Axis axis = x;
  for (unsigned k = 0; k < count; ++k) {
    fractions[k] = PositionOf(column + k, axis.origin, axis.step, axis.lastNode) - node;
  }
}

// Interpolates between the values a and b of two neighbouring nodes.
ZARN_VECTORISED
void FillCell(const double* fractions, unsigned count, double a, double b, float* values) {
  for (unsigned k = 0; k < count; ++k) {
    values[k] = static_cast<float>(Between(a, b, fractions[k]));
  }
}

}  // namespace

GridDodgingSurface::GridDodgingSurface(DodgingGrid grid) : grid_(std::move(grid)) {
  const auto usable = [](double step) { return std::isfinite(step) && step != 0.0; };
  const std::size_t values = std::size_t{grid_.columns} * grid_.rows * grid_.channels;
  if (values == 0 || values != grid_.values.size() || !usable(grid_.stepX) ||
      !usable(grid_.stepY) || !std::isfinite(grid_.originX) || !std::isfinite(grid_.originY)) {
    throw zarn::DataException("The grid of a dodging surface is inconsistent.", __FILE__,
                              __PRETTY_FUNCTION__, __LINE__);
  }
}

std::size_t GridDodgingSurface::ByteSize() const {
  return sizeof(*this) + grid_.values.size() * sizeof(float);
}

unsigned GridDodgingSurface::Channels() const { return grid_.channels; }

void GridDodgingSurface::GetBilinearValue(unsigned column, unsigned row, float* values) const {
  GetBilinearRun(column, row, 1, values, 1);
}

void GridDodgingSurface::GetBilinearRun(unsigned column, unsigned row, unsigned count,
                                        float* values, unsigned pitch) const {
  const unsigned beforeWrap = 0U - column;  // 0 stands for 2^32
  if (beforeWrap != 0 && count > beforeWrap) {
    GetBilinearRun(column, row, beforeWrap, values, pitch);
    GetBilinearRun(0, row, count - beforeWrap, values + beforeWrap, pitch);
    return;
  }
  const Place y = PlaceOf(row, grid_.originY, grid_.stepY, grid_.rows);
  const Axis x{grid_.originX, grid_.stepX, grid_.columns - 1.0};
  const std::size_t channels = grid_.channels;
  const std::size_t rowPitch = grid_.columns * channels;
  const float* const upper = grid_.values.data() + y.node * rowPitch;
  const float* const lower = grid_.rows > 1 ? upper + rowPitch : upper;
  if (grid_.columns == 1) {
    for (std::size_t c = 0; c < channels; ++c) {
      const auto value = static_cast<float>(Between(upper[c], lower[c], y.fraction));
      std::fill_n(values + c * pitch, count, value);
    }
    return;
  }
  // All pixels between the same two columns of nodes share the interpolations along these.
  for (unsigned k = 0; k < count;) {
    const std::size_t node = PlaceOf(column + k, x.origin, x.step, grid_.columns).node;
    const unsigned end = EndOfCell(column, k, k + std::min(count - k, kPiece), node);
    double fractions[kPiece];
    PlaceInCell(x, static_cast<double>(node), column + k, end - k, fractions);
    for (std::size_t c = 0; c < channels; ++c) {
      const std::size_t i = node * channels + c;
      const double a = Between(upper[i], lower[i], y.fraction);
      const double b = Between(upper[i + channels], lower[i + channels], y.fraction);
      FillCell(fractions, end - k, a, b, values + c * pitch + k);
    }
    k = end;
  }
}

// The end of the pixels from k on that lie in the cell of `node`, which only ever change to another
// cell once they have left one.
unsigned GridDodgingSurface::EndOfCell(unsigned column, unsigned k, unsigned count,
                                       std::size_t node) const {
  const auto holds = [&](unsigned pixel) {
    return PlaceOf(column + pixel, grid_.originX, grid_.stepX, grid_.columns).node == node;
  };
  if (holds(count - 1)) return count;
  unsigned inside = k;
  unsigned outside = count - 1;
  while (outside - inside > 1) {
    const unsigned middle = inside + (outside - inside) / 2;
    (holds(middle) ? inside : outside) = middle;
  }
  return outside;
}
