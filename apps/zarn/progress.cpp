// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/progress.h"

#include <unistd.h>

#include <algorithm>
#include <cstdio>

namespace zarn::app {
namespace {

constexpr int kTicks = 40;

}  // namespace

TerminalProgress::TerminalProgress(bool quiet) : active_(!quiet && isatty(STDERR_FILENO) == 1) {}

TerminalProgress::~TerminalProgress() {
  if (active_ && shown_ >= 0 && shown_ < kTicks) std::fputc('\n', stderr);
}

void TerminalProgress::Report(double fraction, const std::string& /*step*/) {
  if (!active_) return;
  const int reached = std::clamp(static_cast<int>(fraction * kTicks), 0, kTicks);
  while (shown_ < reached) {
    ++shown_;
    if (shown_ % 4 == 0) {
      std::fprintf(stderr, "%d", shown_ * 100 / kTicks);
    } else {
      std::fputc('.', stderr);
    }
    if (shown_ == kTicks) std::fputs(" - done.\n", stderr);
  }
  std::fflush(stderr);
}

}  // namespace zarn::app
