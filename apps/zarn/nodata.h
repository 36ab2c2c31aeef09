// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "apps/zarn/dataset.h"

namespace zarn::app {

/// A number of the command line; throws `UsageError` naming `option`.
double ParseNumber(const std::string& option, const std::string& text);

/// A list "V[,V...]" of the command line, of at least one number.
std::vector<double> ParseNumbers(const std::string& option, const std::string& text);

/// A list as `ParseNumbers` takes it; "none" is the empty list. Nothing when `text` is empty,
/// that is, when the option was not given.
std::optional<std::vector<double>> ParseNoData(const std::string& option, const std::string& text);

/// Whether a sample of that type can have the value.
bool CanHold(gobs::NativeDataTypeCode code, double value);

/// The no-data values of a run: one per channel, or none.
struct NoDataValues {
  std::vector<double> input;
  std::vector<double> output;
  /// The output value was asked for, so every pixel that the input declares invalid becomes it.
  bool translate = false;
};

/// The no-data values of one raster: those of `option`, where it was given as `text`, else the
/// file's own. Refuses and warns as `ResolveNoData` does.
std::vector<double> NoDataOf(const RasterSource& source, const std::string& option,
                             const std::string& text);

/// Settles the values: the options, where given, else the file's own, and for the output those of
/// the input. A value that the samples cannot hold means none and is warned about; a list of a
/// wrong length is a `UsageError`.
NoDataValues ResolveNoData(const RasterSource& source, const std::string& srcOption,
                           const std::string& dstOption);

}  // namespace zarn::app
