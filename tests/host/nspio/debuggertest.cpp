// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "host/nspio/debugger.h"

namespace zarn::nspio {
namespace {

class DebuggerTest : public ::testing::Test {
 protected:
  void TearDown() override {
    Debugger::SetSink({});
    Debugger::moDebugLevel = 0;
  }
};

TEST_F(DebuggerTest, DeliversUpToItsLevelWithAllArguments) {
  std::vector<std::string> received;
  Debugger::SetSink([&](const std::string& message, int level, const std::string& module,
                        const std::string& file, int line) {
    received.push_back(message + "/" + std::to_string(level) + "/" + module + "/" + file + "/" +
                       std::to_string(line));
  });
  Debugger::Debug("silent by default", 1, "m", "f", 1);
  Debugger::moDebugLevel = 2;
  Debugger::Debug("one", 1, "module", "some/file", 38);
  Debugger::Debug("two", 2, "module", "some/file", 39);
  Debugger::Debug("three", 3, "module", "some/file", 40);
  EXPECT_EQ(received,
            (std::vector<std::string>{"one/1/module/some/file/38", "two/2/module/some/file/39"}));
}

TEST_F(DebuggerTest, WritesOneLineToStandardErrorWithoutASink) {
  Debugger::moDebugLevel = 1;
  Debugger::SetSink([](auto&&...) { FAIL(); });
  Debugger::SetSink({});
  ::testing::internal::CaptureStderr();
  Debugger::Debug("what happened", 1, "the module", "the/file", 38);
  const std::string line = ::testing::internal::GetCapturedStderr();
  for (const char* part : {"what happened", "the module", "the/file", "38"}) {
    EXPECT_NE(line.find(part), std::string::npos) << line;
  }
  EXPECT_EQ(line.find('\n'), line.size() - 1);
}

TEST_F(DebuggerTest, HandsBackTheFormerSink) {
  int first = 0;
  int second = 0;
  Debugger::moDebugLevel = 1;
  Debugger::SetSink([&](auto&&...) { ++first; });
  Debugger::Sink former = Debugger::SetSink([&](auto&&...) { ++second; });
  Debugger::Debug("to the second", 1, "", "", 0);
  Debugger::SetSink(former);
  Debugger::Debug("to the first", 1, "", "", 0);
  EXPECT_EQ(first, 1);
  EXPECT_EQ(second, 1);
}

TEST_F(DebuggerTest, CallsTheSinkOneThreadAtATime) {
  std::atomic<int> inside{0};
  std::atomic<bool> overlapped{false};
  int calls = 0;  // unprotected on purpose: the debugger serialises
  Debugger::SetSink([&](auto&&...) {
    if (inside.fetch_add(1) != 0) overlapped = true;
    ++calls;
    inside.fetch_sub(1);
  });
  Debugger::moDebugLevel = 1;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([] {
      for (int i = 0; i < 500; ++i) Debugger::Debug("m", 1, "", "", i);
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_FALSE(overlapped);
  EXPECT_EQ(calls, 2000);
}

}  // namespace
}  // namespace zarn::nspio
