// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/positionfield.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <utility>

#include "host/sys/vectorised.h"

namespace zarn::app {
namespace {

constexpr std::int64_t kPatch = 64;
// Squares of this side that have no position at any of their nine nodes have none inside.
constexpr std::int64_t kSurelyOutside = 8;

// Adding and subtracting it rounds to a multiple of 2^-20: far below any threshold, but enough to
// make positions that should lie on centres or borders of pixels do so, and to make differences to
// whole numbers exact.
constexpr double kSnap = 0x1.8p32;

struct Place {
  double x;
  double y;
};

bool Exists(const Place& place) { return !std::isnan(place.x); }

double Between(double a, double b, double fraction) { return a + (b - a) * fraction; }
Place Between(const Place& a, const Place& b, double fraction) {
  return {Between(a.x, b.x, fraction), Between(a.y, b.y, fraction)};
}

ZARN_VECTORISED
void FillRow(double first, double last, double offset, double side, std::int64_t count,
             double* positions) {
  for (std::int64_t i = 0; i < count; ++i) {
    const double fraction = (offset + static_cast<double>(i)) / side;
    positions[i] = (first + (last - first) * fraction + kSnap) - kSnap;
  }
}

}  // namespace

/// Places at every `step`-th pixel from (left, top) on.
struct PositionField::Lattice {
  const Place& At(std::int64_t column, std::int64_t row) const {
    return places[static_cast<std::size_t>((row - top) / step * columns + (column - left) / step)];
  }

  std::int64_t left;
  std::int64_t top;
  std::int64_t columns;
  std::int64_t step;
  std::vector<Place> places;
};

/// Pixels [left, left + side) x [top, top + side), whose corners are those of the next square's.
struct PositionField::Square {
  std::int64_t left;
  std::int64_t top;
  std::int64_t side;
};

PositionField::PositionField(LocateFunction locate, double threshold)
    : locate_(std::move(locate)), threshold_(threshold) {}

PositionField::Lattice PositionField::Evaluate(std::int64_t left, std::int64_t top,
                                               std::int64_t columns, std::int64_t rows,
                                               std::int64_t step) const {
  std::vector<double> x;
  std::vector<double> y;
  for (std::int64_t row = 0; row < rows; ++row) {
    for (std::int64_t column = 0; column < columns; ++column) {
      x.push_back(static_cast<double>(left + column * step) + 0.5);
      y.push_back(static_cast<double>(top + row * step) + 0.5);
    }
  }
  locate_(x, y);
  Lattice lattice{left, top, columns, step, {}};
  for (std::size_t i = 0; i < x.size(); ++i) lattice.places.push_back({x[i], y[i]});
  return lattice;
}

bool PositionField::IsFlat(const Lattice& lattice, const Square& square) const {
  const std::int64_t half = square.side / 2;
  const auto at = [&](std::int64_t i, std::int64_t j) -> const Place& {
    return lattice.At(square.left + i * half, square.top + j * half);
  };
  int existing = 0;
  double error = 0;
  for (std::int64_t j = 0; j <= 2; ++j) {
    const Place left = Between(at(0, 0), at(0, 2), static_cast<double>(j) / 2);
    const Place right = Between(at(2, 0), at(2, 2), static_cast<double>(j) / 2);
    for (std::int64_t i = 0; i <= 2; ++i) {
      const Place guess = Between(left, right, static_cast<double>(i) / 2);
      const Place& truth = at(i, j);
      if (Exists(truth)) ++existing;
      error = std::max(error, std::abs(guess.x - truth.x) + std::abs(guess.y - truth.y));
    }
  }
  if (existing == 0) return square.side <= kSurelyOutside;
  return existing == 9 && threshold_ > 0 && error <= threshold_;
}

void PositionField::FillPatch(const Lattice& lattice, const Square& square, const Window& window,
                              double* x, double* y) {
  const std::int64_t left = std::max(square.left, window.x);
  const std::int64_t top = std::max(square.top, window.y);
  const std::int64_t right = std::min(square.left + square.side, window.x + window.width);
  const std::int64_t bottom = std::min(square.top + square.side, window.y + window.height);
  if (left >= right || top >= bottom) return;
  const bool exact = square.side == lattice.step;
  if (exact || IsFlat(lattice, square)) {
    const auto side = static_cast<double>(square.side);
    for (std::int64_t row = top; row < bottom; ++row) {
      const double down = static_cast<double>(row - square.top) / side;
      const auto corner = [&](std::int64_t i, std::int64_t j) {
        return lattice.At(square.left + i * square.side, square.top + j * square.side);
      };
      // A square of one pixel has no other corners.
      const Place first = exact ? corner(0, 0) : Between(corner(0, 0), corner(0, 1), down);
      const Place last = exact ? first : Between(corner(1, 0), corner(1, 1), down);
      const std::int64_t at = (row - window.y) * window.width + left - window.x;
      const auto offset = static_cast<double>(left - square.left);
      FillRow(first.x, last.x, offset, side, right - left, x + at);
      FillRow(first.y, last.y, offset, side, right - left, y + at);
    }
    return;
  }
  const std::int64_t half = square.side / 2;
  // Finer nodes once for the whole square: calls with many points cost less for each.
  const bool finer = half < 2 * lattice.step && lattice.step > 1;
  const std::int64_t step = lattice.step / 2;
  const Lattice nodes = finer ? Evaluate(square.left, square.top, square.side / step + 1,
                                         square.side / step + 1, step)
                              : Lattice{};
  for (const std::int64_t j : {std::int64_t{0}, half}) {
    for (const std::int64_t i : {std::int64_t{0}, half}) {
      FillPatch(finer ? nodes : lattice, {square.left + i, square.top + j, half}, window, x, y);
    }
  }
}

void PositionField::Fill(const Window& window, std::vector<double>& x, std::vector<double>& y) {
  const auto pixels = static_cast<std::size_t>(window.width * window.height);
  x.resize(pixels);
  y.resize(pixels);
  const std::int64_t left = window.x / kPatch * kPatch;
  const std::int64_t top = window.y / kPatch * kPatch;
  const std::int64_t columns = (window.x + window.width - left + kPatch - 1) / kPatch;
  const std::int64_t rows = (window.y + window.height - top + kPatch - 1) / kPatch;
  const std::int64_t step = threshold_ > 0 ? kPatch / 2 : 1;
  const Lattice lattice =
      Evaluate(left, top, columns * kPatch / step + 1, rows * kPatch / step + 1, step);
  for (std::int64_t row = 0; row < rows; ++row) {
    for (std::int64_t column = 0; column < columns; ++column) {
      FillPatch(lattice, {left + column * kPatch, top + row * kPatch, kPatch}, window, x.data(),
                y.data());
    }
  }
}

}  // namespace zarn::app
