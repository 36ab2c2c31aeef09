// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "processes/filters/filtersexport.h"

namespace zarn::processes::filters {

/// How the tails of a histogram are cut off before a stretch.
enum class TrimMethod : std::int32_t {
  kPercentage = 0,  ///< by shares of the pixels
  kMeanNSigma = 1,  ///< by standard deviations around the mean
  kUnknown = 2,
};

/// The method that a text names, whatever its case: "Percentage" or "Mean and N Sigma".
ZARN_FILTERS_EXPORT TrimMethod StringToTrimMethod(std::string text);

/// The text that names a method; "Unknown" for every other value.
ZARN_FILTERS_EXPORT std::string TrimMethodToString(TrimMethod method);

/// Finds the range of grey levels that a stretch is made for. Stateless, so safe for any number of
/// threads.
class ITrimMethod {
 public:
  /// Sets `low` and `high` to the first and the last bin that are kept, of `binCount` bins with
  /// their numbers of pixels. Unless either is 0, `low` may come to lie above `high` and either may
  /// lie one past the bins: an empty range.
  ///
  /// `leftTrim` and `rightTrim` are shares of the pixels, or numbers of standard deviations. Bin 0
  /// and the last one can be left out of the statistics. `total` is the number of pixels, or -1 to
  /// have them counted; the mean and deviation do not use it.
  virtual void Trim(const std::uint64_t* histogram, double leftTrim, double rightTrim,
                    unsigned int binCount, bool ignoreFirstBin, bool ignoreLastBin,
                    std::int64_t total, int& low, int& high) const = 0;
  /// The value of its `TrimMethod`.
  virtual int GetMethod() const = 0;

 protected:
  // Without a virtual destructor: owners destroy the object as what it is.
  ~ITrimMethod() = default;
};

// Final, so that destroying it as what it is needs no virtual destructor.
class PercentTrimMethod final  // NOLINT(cppcoreguidelines-virtual-class-destructor)
    : public ITrimMethod {
 public:
  void Trim(const std::uint64_t* histogram, double leftTrim, double rightTrim,
            unsigned int binCount, bool ignoreFirstBin, bool ignoreLastBin, std::int64_t total,
            int& low, int& high) const override;
  int GetMethod() const override { return static_cast<int>(TrimMethod::kPercentage); }
};

/// Integer arithmetic throughout: mean and deviation are whole grey levels. Sums wrap around at
/// 2^64. A histogram without pixels keeps its whole range.
class MeanNSigmaTrimMethod final  // NOLINT(cppcoreguidelines-virtual-class-destructor)
    : public ITrimMethod {
 public:
  void Trim(const std::uint64_t* histogram, double leftTrim, double rightTrim,
            unsigned int binCount, bool ignoreFirstBin, bool ignoreLastBin, std::int64_t total,
            int& low, int& high) const override;
  int GetMethod() const override { return static_cast<int>(TrimMethod::kMeanNSigma); }
};

/// A histogram of `count` bins of which those outside `begin` .. `end` - 1 are empty.
struct HistogramBins {
  const std::uint64_t* histogram;
  unsigned int count;
  unsigned int begin;
  unsigned int end;
};

/// `ITrimMethod::Trim` of one of the two methods, with the pixels counted, in a time that does not
/// depend on the empty bins.
void Trim(const ITrimMethod& method, const HistogramBins& bins, double leftTrim, double rightTrim,
          bool ignoreFirstBin, bool ignoreLastBin, int& low, int& high);

/// A new object of the method, or null for an unknown one. The caller owns it: see
/// `TrimMethodDeleter`.
ZARN_FILTERS_EXPORT ITrimMethod* CreateTrimMethod(TrimMethod method);

/// Destroys what `CreateTrimMethod` made.
struct ZARN_FILTERS_EXPORT TrimMethodDeleter {
  void operator()(ITrimMethod* method) const;
};
using TrimMethodPtr = std::unique_ptr<ITrimMethod, TrimMethodDeleter>;

}  // namespace zarn::processes::filters
