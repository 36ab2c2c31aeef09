// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <functional>
#include <string>

#include "host/hostexport.h"

namespace zarn::nspio {

/// The host's debug messages.
class ZARN_HOST_EXPORT Debugger {
 public:
  using Sink = std::function<void(const std::string& message, int level, const std::string& module,
                                  const std::string& file, int line)>;

  /// 0 (the default) is silent. Callers test it before they compose a message; a message is
  /// delivered when its level does not exceed it.
  static std::atomic<int> moDebugLevel;

  /// Hands the message to the sink. Safe to call from several threads; calls are serialised.
  static void Debug(const std::string& message, int level, const std::string& module,
                    const std::string& file, int line);

  /// Replaces the sink and returns the former one. An empty sink restores the default, which writes
  /// one line to standard error.
  static Sink SetSink(Sink sink);
};

}  // namespace zarn::nspio
