// SPDX-License-Identifier: Apache-2.0
#include "tests/apps/zarn/program.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <stdexcept>
#include <string>
#include <system_error>

namespace zarn::testsupport {
namespace {

// The program writes little, so a file that nobody sees holds it without a reading thread.
int AnonymousFile() {
  std::string name = (std::filesystem::temp_directory_path() / "zarnoutput-XXXXXX").string();
  const int file = mkostemp(name.data(), O_CLOEXEC);
  if (file < 0) throw std::system_error(errno, std::generic_category(), name);
  unlink(name.c_str());
  return file;
}

std::string Contents(int file) {
  std::string text(static_cast<std::size_t>(lseek(file, 0, SEEK_END)), '\0');
  const ssize_t count = pread(file, text.data(), text.size(), 0);
  return count == static_cast<ssize_t>(text.size()) ? text : "(unreadable output)";
}

[[noreturn]] void BecomeProgram(char* const* arguments, std::uint64_t largestFile) {
  // A shell that runs the tests in the background has switched Ctrl-C off for its children.
  signal(SIGINT, SIG_DFL);
  if (largestFile > 0) {
    const rlimit limit{largestFile, largestFile};
    setrlimit(RLIMIT_FSIZE, &limit);
  }
  execv(ZARN_PROGRAM, arguments);
  _exit(127);
}

}  // namespace

Program::Program(const std::vector<std::string>& arguments, std::uint64_t largestFile)
    : out_(AnonymousFile()), err_(AnonymousFile()) {
  std::vector<std::string> copies = arguments;
  std::string name = ZARN_PROGRAM;
  std::vector<char*> pointers{name.data()};
  for (std::string& argument : copies) pointers.push_back(argument.data());
  pointers.push_back(nullptr);
  process_ = fork();
  if (process_ < 0) throw std::system_error(errno, std::generic_category(), "fork");
  if (process_ == 0) {
    dup2(out_, STDOUT_FILENO);
    dup2(err_, STDERR_FILENO);
    BecomeProgram(pointers.data(), largestFile);
  }
}

Program::~Program() {
  if (process_ > 0) {
    kill(process_, SIGKILL);
    Wait();
  }
  close(out_);
  close(err_);
}

void Program::Signal(int number) { kill(process_, number); }

Outcome Program::Wait() {
  int state = 0;
  waitpid(process_, &state, 0);
  process_ = 0;
  return {WIFEXITED(state) ? WEXITSTATUS(state) : -WTERMSIG(state), Contents(out_), Contents(err_)};
}

Outcome RunProgram(const std::vector<std::string>& arguments, std::uint64_t largestFile) {
  return Program(arguments, largestFile).Wait();
}

void ExpectOneLine(const Outcome& outcome, int status, const std::string& part) {
  EXPECT_EQ(outcome.status, status);
  EXPECT_TRUE(outcome.err.starts_with("zarn: ")) << outcome.err;
  EXPECT_EQ(std::count(outcome.err.begin(), outcome.err.end(), '\n'), 1) << outcome.err;
  EXPECT_NE(outcome.err.find(part), std::string::npos)
      << "'" << part << "' is not in: " << outcome.err;
  EXPECT_EQ(outcome.out, "");
}

TemporaryFolder::TemporaryFolder() {
  std::string name = (std::filesystem::temp_directory_path() / "zarntest-XXXXXX").string();
  if (mkdtemp(name.data()) == nullptr) throw std::runtime_error("no temporary folder");
  path_ = name;
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code error;
  std::filesystem::remove_all(path_, error);
}

std::set<std::string> TemporaryFolder::Names() const {
  std::set<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(path_)) {
    names.insert(entry.path().filename().string());
  }
  return names;
}

}  // namespace zarn::testsupport
