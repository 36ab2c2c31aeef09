// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/kerneloptions.h"

#include <CLI/CLI.hpp>
#include <algorithm>

#include "apps/zarn/imagefilter.h"

namespace zarn::app {

namespace filters = processes::filters;

Kernel KernelOptions::For(const RasterSource& source) const {
  const std::int64_t side = std::max(source.Width(), source.Height());
  const std::int64_t whole = 2 * side + 1;  // a square that sees the image from all its pixels
  // A disc around that square sees it all as well.
  const bool isSquare = shape != "disc" || size >= 3 * whole / 2;
  return {static_cast<int>(isSquare ? std::min(size, whole) : size),
          isSquare ? filters::KernelShape::kSquare : filters::KernelShape::kDisc};
}

std::int64_t KernelOptions::Halo(const RasterSource& source, int steps) const {
  return std::min<std::int64_t>(steps * (size / 2), std::max(source.Width(), source.Height()));
}

void AddKernelOptions(CLI::App& command, KernelOptions& options) {
  command
      .add_option("--size", options.size,
                  "Side or diameter of the kernel in pixels; an even square acts as the next odd "
                  "one")
      ->type_name("N")
      ->check(WholeNumber(1, static_cast<std::int64_t>(filters::kMaxKernelSize)))
      ->capture_default_str();
  command.add_option("--shape", options.shape, "Shape of the kernel: square or disc")
      ->type_name("SHAPE")
      ->check(CLI::IsMember({"square", "disc"}))
      ->capture_default_str();
}

}  // namespace zarn::app
