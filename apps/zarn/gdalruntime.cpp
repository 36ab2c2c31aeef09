// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/gdalruntime.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <gdal_priv.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <mutex>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "apps/zarn/interruption.h"

namespace zarn::app {
namespace {

std::mutex mutex;
std::set<std::string> printedWarnings;
bool warningsSilenced = false;
std::string lastFailure;  // of any thread
int lastSpaceError = 0;   // likewise
std::vector<std::pair<std::string, std::string>> renamings;
thread_local bool failureWatched = false;
thread_local std::string firstFailure;

void ReplaceAll(std::string& text, const std::string& from, const std::string& to) {
  for (std::size_t at = text.find(from); at != std::string::npos; at = text.find(from, at)) {
    text.replace(at, from.size(), to);
    at += to.size();
  }
}

std::string OneLine(std::string text) {
  {
    const std::lock_guard lock(mutex);
    for (const auto& [from, to] : renamings) ReplaceAll(text, from, to);
  }
  std::replace_if(
      text.begin(), text.end(), [](char c) { return c == '\n' || c == '\r'; }, ' ');
  while (!text.empty() && (text.back() == ' ' || text.back() == '.')) text.pop_back();
  return text;
}

// GDAL's C code cannot be left by an exception; the only one to expect here is a lack of memory.
void CPL_STDCALL HandleGdalMessage(CPLErr level, CPLErrorNum, const char* text) try {
  const int cause = errno;  // as the failed write has left it
  const std::string line = OneLine(text);
  // GDAL ends the program after a fatal error and would leave files behind.
  if (level == CE_Fatal) AbandonAndExit(line.c_str());
  if (level == CE_Warning) Warn(line);
  if (level != CE_Failure) return;
  if (failureWatched && firstFailure.empty()) firstFailure = line;
  const std::lock_guard lock(mutex);
  lastFailure = line;
  if (IsSpaceError(cause)) lastSpaceError = cause;
} catch (...) {
  AbandonAndExit("out of memory");
}

}  // namespace

GdalRuntime::GdalRuntime() {
  CPLSetErrorHandler(HandleGdalMessage);
  // The stages hold their own blocks; GDAL's cache only has to bridge partly used tiles.
  if (CPLGetConfigOption("GDAL_CACHEMAX", nullptr) == nullptr) GDALSetCacheMax64(64 << 20);
  // Masks belong inside the file that they describe, where the format can hold them.
  CPLSetConfigOption("GDAL_TIFF_INTERNAL_MASK", "YES");
  GDALAllRegister();
}

GdalRuntime::~GdalRuntime() { CPLSetErrorHandler(CPLDefaultErrorHandler); }

void SetGdalThreads(int threads) {
  CPLSetConfigOption("GDAL_NUM_THREADS",
                     threads == 0 ? "ALL_CPUS" : std::to_string(threads).c_str());
}

void Warn(const std::string& text) {
  const std::lock_guard lock(mutex);
  if (warningsSilenced || !printedWarnings.insert(text).second) return;
  std::fprintf(stderr, "zarn: warning: %s\n", text.c_str());
}

void SilenceWarnings() {
  const std::lock_guard lock(mutex);
  warningsSilenced = true;
}

void RenameInMessages(const std::string& from, const std::string& to) {
  const std::lock_guard lock(mutex);
  renamings.emplace_back(from, to);
}

std::string LastGdalMessage(const std::string& name) {
  std::string text = OneLine(CPLGetLastErrorMsg());
  if (text.empty()) {
    const std::lock_guard lock(mutex);
    text = lastFailure;
  }
  for (const std::string& front : {name + ": ", "`" + name + "' ", name + " "}) {
    if (!name.empty() && text.starts_with(front)) return text.substr(front.size());
  }
  return text;
}

bool IsSpaceError(int error) { return error == ENOSPC || error == EDQUOT || error == EFBIG; }

int LastSpaceError() {
  const std::lock_guard lock(mutex);
  return lastSpaceError;
}

GdalFailureWatch::GdalFailureWatch() {
  firstFailure.clear();
  failureWatched = true;
}

GdalFailureWatch::~GdalFailureWatch() { failureWatched = false; }

std::string GdalFailureWatch::First() const { return firstFailure; }

}  // namespace zarn::app
