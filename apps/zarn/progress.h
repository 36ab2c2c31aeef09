// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

#include "host/nspio/counter.h"

namespace zarn::app {

/// Progress on stderr in GDAL's manner, `0...10...20...`; silent unless stderr is a terminal.
class TerminalProgress : public nspio::Counter {
 public:
  explicit TerminalProgress(bool quiet);
  /// Ends a line that was begun, so that what is printed next starts on its own.
  ~TerminalProgress() override;

 protected:
  void Report(double fraction, const std::string& step) override;

 private:
  bool active_;
  int shown_ = -1;  ///< ticks printed, each a fortieth
};

/// Tells nobody.
class SilentProgress : public nspio::Counter {
 protected:
  void Report(double, const std::string&) override {}
};

/// A part of a longer operation: maps 0..1 onto begin..end of `whole`.
class ProgressSpan : public nspio::Counter {
 public:
  ProgressSpan(nspio::Counter& whole, double begin, double end)
      : whole_(whole), begin_(begin), end_(end) {}

 protected:
  void Report(double fraction, const std::string& step) override {
    whole_.Update(begin_ + fraction * (end_ - begin_), step);
  }

 private:
  nspio::Counter& whole_;
  double begin_;
  double end_;
};

}  // namespace zarn::app
