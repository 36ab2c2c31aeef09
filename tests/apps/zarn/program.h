// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <filesystem>
#include <set>
#include <string>
#include <vector>

namespace zarn::testsupport {

/// How a run of the program ended.
struct Outcome {
  int status = -1;  ///< exit status, or minus the signal that killed it
  std::string out;
  std::string err;
};

/// The program under test, as a process of its own.
class Program {
 public:
  /// Starts it; `largestFile` limits the bytes of any file that it writes (0: no limit).
  explicit Program(const std::vector<std::string>& arguments, std::uint64_t largestFile = 0);
  /// Kills it if it still runs.
  ~Program();
  Program(const Program&) = delete;
  Program& operator=(const Program&) = delete;

  void Signal(int number);
  Outcome Wait();

 private:
  pid_t process_;
  int out_;
  int err_;
};

Outcome RunProgram(const std::vector<std::string>& arguments, std::uint64_t largestFile = 0);

/// A failure must say in one line what is wrong, with `part` in it, and print nothing else.
void ExpectOneLine(const Outcome& outcome, int status, const std::string& part);

/// A folder that vanishes at the end of a test.
class TemporaryFolder {
 public:
  TemporaryFolder();
  ~TemporaryFolder();
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  std::string operator/(const std::string& name) const { return (path_ / name).string(); }
  std::set<std::string> Names() const;

 private:
  std::filesystem::path path_;
};

}  // namespace zarn::testsupport
