// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/interruption.h"

#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <mutex>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

namespace zarn::app {
namespace {

// Never destroyed: the watching thread may still use them while the program ends.
std::recursive_mutex& Mutex() {
  static auto& mutex = *new std::recursive_mutex;
  return mutex;
}
std::vector<std::filesystem::path>& Folders() {
  static auto& folders = *new std::vector<std::filesystem::path>;
  return folders;
}

}  // namespace

void AbandonAndExit(const char* reason) {
  const std::lock_guard lock(Mutex());
  const bool unfinished = !Folders().empty();
  for (const auto& folder : Folders()) {
    // Other threads go on writing; a file that appears during the removal makes it fail once.
    std::error_code error;
    for (int attempt = 0; attempt < 10; ++attempt) {
      std::filesystem::remove_all(folder, error);
      if (!error) break;
    }
  }
  // On a terminal the cursor may stand behind a progress line.
  std::fprintf(stderr, "%szarn: %s%s\n", isatty(STDERR_FILENO) == 1 ? "\n" : "", reason,
               unfinished ? "; no output was written" : "");
  _exit(1);
}

void HandleInterruptions() {
  // A thread that waits for the signals may do anything, which a signal handler may not.
  sigset_t signals;
  sigemptyset(&signals);
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    struct sigaction action = {};
    sigaction(number, nullptr, &action);
    if (action.sa_handler != SIG_IGN) sigaddset(&signals, number);
  }
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  std::thread([signals] {
    int number = 0;
    while (sigwait(&signals, &number) != 0) {
    }
    AbandonAndExit("interrupted");
  }).detach();
}

RemoveWhenInterrupted::RemoveWhenInterrupted(std::filesystem::path folder)
    : folder_(std::move(folder)) {
  const std::lock_guard lock(Mutex());
  Folders().push_back(folder_);
}

RemoveWhenInterrupted::~RemoveWhenInterrupted() {
  const std::lock_guard lock(Mutex());
  std::erase(Folders(), folder_);
}

HoldInterruptions::HoldInterruptions() { Mutex().lock(); }
HoldInterruptions::~HoldInterruptions() { Mutex().unlock(); }

}  // namespace zarn::app
