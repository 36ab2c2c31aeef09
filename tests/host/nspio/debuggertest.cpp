// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <string>
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

}  // namespace
}  // namespace zarn::nspio
