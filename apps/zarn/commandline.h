// SPDX-License-Identifier: Apache-2.0
#pragma once

// The header of the command-line library takes seconds in every source that includes it: only the
// sources that add options do, all others know its classes by name.
namespace CLI {  // NOLINT(readability-identifier-naming): as the library has it
class App;
class Option;
class Validator;
}  // namespace CLI
