// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>

#include "apps/zarn/commandline.h"
#include "apps/zarn/dataset.h"
#include "processes/filters/framework/structuringkernel.h"

namespace zarn::app {

/// What `SetupKernelSE` makes a kernel of.
struct Kernel {
  int size;
  processes::filters::KernelShape shape;
};

/// The structuring kernel of a command.
struct KernelOptions {
  std::int64_t size = 3;
  std::string shape = "square";

  /// The kernel for an image, without most of the cells that lie outside of it from everywhere.
  Kernel For(const RasterSource& source) const;
  /// Pixels around a window that `steps` runs of the kernel, one upon the other, need; no more than
  /// the image has.
  std::int64_t Halo(const RasterSource& source, int steps) const;
};

/// Declares --size and --shape on a subcommand.
void AddKernelOptions(CLI::App& command, KernelOptions& options);

}  // namespace zarn::app
