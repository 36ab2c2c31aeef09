// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace zarn::app {

/// Sets GDAL up for the life of the program: drivers, cache, and an error handler that keeps GDAL's
/// messages from the terminal. Failures are folded into the program's own messages; warnings are
/// printed as one line each, the same text once.
class GdalRuntime {
 public:
  GdalRuntime();
  ~GdalRuntime();
  GdalRuntime(const GdalRuntime&) = delete;
  GdalRuntime& operator=(const GdalRuntime&) = delete;
};

/// Threads that GDAL may use for compression and decompression; 0 means all.
void SetGdalThreads(int threads);

/// Prints `zarn: warning: <text>` on stderr, the same text only once.
void Warn(const std::string& text);
/// Switches warnings off (`-q`).
void SilenceWarnings();

/// From here on GDAL's messages say `to` where they would say `from`: the name that the user knows
/// instead of a temporary one.
void RenameInMessages(const std::string& from, const std::string& to);

/// The last failure that GDAL reported to this thread, or else to one of its own threads, made into
/// one line, with `name` taken off its front; empty when there was none.
std::string LastGdalMessage(const std::string& name = {});

/// Whether a value of errno says that the system refuses to store more: ENOSPC, EDQUOT or EFBIG.
bool IsSpaceError(int error);
/// Such a value when GDAL, on any thread, has reported a failure in its wake, otherwise 0. GDAL's
/// own messages seldom tell.
int LastSpaceError();

/// Notes the first failure that GDAL reports on this thread while it lives: closing a dataset
/// reports a full disk in no other way. At most one per thread at a time.
class GdalFailureWatch {
 public:
  GdalFailureWatch();
  ~GdalFailureWatch();
  GdalFailureWatch(const GdalFailureWatch&) = delete;
  GdalFailureWatch& operator=(const GdalFailureWatch&) = delete;

  /// The failure, made into one line; empty when there was none.
  std::string First() const;
};

}  // namespace zarn::app
