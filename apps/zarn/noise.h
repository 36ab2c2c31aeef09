// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cmath>
#include <cstdint>

// Random numbers and noise as pure functions of a seed and a place. Only integer hashing and the
// operations that IEEE 754 rounds correctly (+ - * / sqrt floor) are used, so that every compiler
// and machine computes the same bits; the distributions and the trigonometry of the standard
// library promise no such thing.
namespace zarn::app::noise {

/// Spreads a key over all 64 bits. The multipliers, here and in `Hash`, are the fractional parts of
/// the square roots of 2, 3, 5 and 7.
constexpr std::uint64_t Scramble(std::uint64_t key) {
  key ^= key >> 31;
  key *= 0x6A09E667F3BCC909ull;
  key ^= key >> 29;
  key *= 0xBB67AE8584CAA73Bull;
  key ^= key >> 32;
  return key;
}

constexpr std::uint64_t Hash(std::uint64_t seed, std::int64_t x, std::int64_t y = 0) {
  return Scramble(seed + static_cast<std::uint64_t>(x) * 0x3C6EF372FE94F82Bull +
                  static_cast<std::uint64_t>(y) * 0xA54FF53A5F1D36F1ull);
}

/// 0 <= result < 1, from the top bits.
constexpr double Unit(std::uint64_t bits) { return static_cast<double>(bits >> 11) * 0x1p-53; }

/// -1 <= result < 1.
constexpr double Signed(std::uint64_t bits) { return 2.0 * Unit(bits) - 1.0; }

constexpr double Lerp(double from, double to, double share) { return from + (to - from) * share; }

/// 0 up to `low`, 1 from `high`, smooth between.
constexpr double SmoothStep(double low, double high, double value) {
  const double t = (value - low) / (high - low);
  if (t <= 0.0) return 0.0;
  if (t >= 1.0) return 1.0;
  return t * t * (3.0 - 2.0 * t);
}

/// A wave of period 1 between -1 and 1, made of two parabolas.
inline double Wave(double phase) {
  const double u = phase - std::floor(phase);
  return u < 0.5 ? 16.0 * u * (0.5 - u) : -16.0 * (u - 0.5) * (1.0 - u);
}

/// Gradient noise with a lattice of width 1: smooth, mean 0, mostly within -1 .. 1.
inline double Smooth(std::uint64_t seed, double x, double y) {
  const double left = std::floor(x);
  const double top = std::floor(y);
  const double u = x - left;
  const double v = y - top;
  const auto column = static_cast<std::int64_t>(left);
  const auto row = static_cast<std::int64_t>(top);
  const auto corner = [&](std::int64_t dx, std::int64_t dy) {
    const std::uint64_t bits = Hash(seed, column + dx, row + dy);
    const double gx = static_cast<double>(bits & 0xFFFF) * 0x1p-15 - 1.0;
    const double gy = static_cast<double>(bits >> 16 & 0xFFFF) * 0x1p-15 - 1.0;
    return gx * (u - static_cast<double>(dx)) + gy * (v - static_cast<double>(dy));
  };
  const double su = u * u * u * (u * (u * 6.0 - 15.0) + 10.0);
  const double sv = v * v * v * (v * (v * 6.0 - 15.0) + 10.0);
  return 1.6 * Lerp(Lerp(corner(0, 0), corner(1, 0), su), Lerp(corner(0, 1), corner(1, 1), su), sv);
}

/// Octaves of `Smooth`, from `wavelength` downwards, each of half the width and half the strength.
/// The lattices of the octaves are turned and shifted so that their zeros do not coincide.
inline double Fractal(std::uint64_t seed, double x, double y, double wavelength, int octaves) {
  double sum = 0.0;
  double strength = 1.0;
  x /= wavelength;
  y /= wavelength;
  for (int octave = 0; octave < octaves; ++octave) {
    sum += strength * Smooth(seed + static_cast<std::uint64_t>(octave), x, y);
    const double turned = 1.6 * x - 1.2 * y + 0.37;
    y = 1.2 * x + 1.6 * y + 0.71;
    x = turned;
    strength *= 0.5;
  }
  return sum;
}

}  // namespace zarn::app::noise
