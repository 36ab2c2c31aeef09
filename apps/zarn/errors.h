// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <stdexcept>

namespace zarn::app {

/// The command line asks for something impossible; the program ends with status 2.
struct UsageError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

/// The work could not be done; the program ends with status 1. The text names the file or value and
/// what to do about it.
struct RunError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

}  // namespace zarn::app
