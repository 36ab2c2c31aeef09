// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>

namespace zarn::app {

/// From here on Ctrl-C, SIGTERM and a closed terminal remove what `RemoveWhenInterrupted` names and
/// end the program with status 1 at once, whatever its threads are doing. Signals that the caller
/// had switched off stay off. To be called before any thread is started.
void HandleInterruptions();

/// What an interruption does: removes the unfinished output, prints `zarn: <reason>` and ends the
/// program with status 1, from whatever thread.
[[noreturn]] void AbandonAndExit(const char* reason);

/// While it lives, an interruption removes `folder` and all that it holds.
class RemoveWhenInterrupted {
 public:
  explicit RemoveWhenInterrupted(std::filesystem::path folder);
  ~RemoveWhenInterrupted();
  RemoveWhenInterrupted(const RemoveWhenInterrupted&) = delete;
  RemoveWhenInterrupted& operator=(const RemoveWhenInterrupted&) = delete;

 private:
  std::filesystem::path folder_;
};

/// While it lives, an interruption has to wait: for steps that must not be done by half.
class HoldInterruptions {
 public:
  HoldInterruptions();
  ~HoldInterruptions();
  HoldInterruptions(const HoldInterruptions&) = delete;
  HoldInterruptions& operator=(const HoldInterruptions&) = delete;
};

}  // namespace zarn::app
