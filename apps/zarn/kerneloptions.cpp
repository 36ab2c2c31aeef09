// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/kerneloptions.h"

#include <algorithm>

#include "apps/zarn/imagefilter.h"

namespace zarn::app {

namespace filters = processes::filters;

filters::KernelShape KernelOptions::Shape() const {
  return shape == "disc" ? filters::KernelShape::kDisc : filters::KernelShape::kSquare;
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
