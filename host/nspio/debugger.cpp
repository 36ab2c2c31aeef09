// SPDX-License-Identifier: Apache-2.0
#include "host/nspio/debugger.h"

#include <iostream>
#include <mutex>
#include <utility>

namespace zarn::nspio {
namespace {

struct SinkHolder {
  std::mutex mutex;
  Debugger::Sink sink;
};

SinkHolder& Holder() {
  static SinkHolder holder;
  return holder;
}

}  // namespace

std::atomic<int> Debugger::moDebugLevel{0};

void Debugger::Debug(const std::string& message, int level, const std::string& module,
                     const std::string& file, int line) {
  if (level > moDebugLevel.load(std::memory_order_relaxed)) return;
  SinkHolder& holder = Holder();
  const std::scoped_lock lock(holder.mutex);
  if (holder.sink) {
    holder.sink(message, level, module, file, line);
  } else {
    std::cerr << module << ": " << file << ':' << line << ": " << message << '\n';
  }
}

Debugger::Sink Debugger::SetSink(Sink sink) {
  SinkHolder& holder = Holder();
  const std::scoped_lock lock(holder.mutex);
  return std::exchange(holder.sink, std::move(sink));
}

}  // namespace zarn::nspio
