// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/enhancement/trimmethod.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstddef>

#include "host/gobs/saturatecast.h"

namespace zarn::processes::filters {
namespace {

int FirstBin(bool ignoreFirstBin) { return ignoreFirstBin ? 1 : 0; }
int LastBin(unsigned int binCount, bool ignoreLastBin) {
  return static_cast<int>(binCount) - (ignoreLastBin ? 2 : 1);
}

// Sums wrap around as unsigned numbers and are read as signed ones.
std::int64_t AsSigned(std::uint64_t sum) { return static_cast<std::int64_t>(sum); }

std::int64_t Quotient(std::int64_t a, std::int64_t b) {
  if (b == -1) return AsSigned(-static_cast<std::uint64_t>(a));
  return a / b;
}

// By shares of the pixels.
void TrimTails(const HistogramBins& bins, double leftTrim, double rightTrim, bool ignoreFirstBin,
               bool ignoreLastBin, std::int64_t total, int& low, int& high) {
  low = FirstBin(ignoreFirstBin);
  high = LastBin(bins.count, ignoreLastBin);
  if (leftTrim == 0.0 && rightTrim == 0.0) return;
  const auto begin = static_cast<int>(bins.begin);
  const auto end = static_cast<int>(bins.end);
  auto pixels = static_cast<double>(total);
  if (total == -1) {
    std::uint64_t sum = 0;
    for (int i = std::max(low, begin); i <= std::min(high, end - 1); ++i) sum += bins.histogram[i];
    pixels = static_cast<double>(sum);
  }
  // Empty bins are cut off, unless nothing may be. Passing over them keeps the subtractions, each
  // of which waits for the one before, few.
  const auto isKept = [&](int bin, double& remaining) {
    if (bins.histogram[bin] == 0) return false;
    remaining -= static_cast<double>(bins.histogram[bin]);
    return remaining < 0.0;
  };
  // Up to the end of the histogram, past `high` if need be.
  double remaining = pixels * leftTrim + 0.5;
  if (!(remaining < 0.0)) {
    low = std::max(low, begin);
    while (low < end && !isKept(low, remaining)) ++low;
    if (low >= end) low = std::max(low, static_cast<int>(bins.count));
  }
  remaining = pixels * rightTrim + 0.5;
  if (!(remaining < 0.0)) {
    high = std::min(high, end - 1);
    while (high >= begin && !isKept(high, remaining)) --high;
    if (high < begin) high = std::min(high, -1);
  }
}

// By deviations around the mean.
void TrimDeviating(const HistogramBins& bins, double leftTrim, double rightTrim,
                   bool ignoreFirstBin, bool ignoreLastBin, int& low, int& high) {
  low = FirstBin(ignoreFirstBin);
  high = LastBin(bins.count, ignoreLastBin);
  std::uint64_t pixels = 0;
  std::uint64_t sum = 0;
  std::uint64_t squares = 0;
  const unsigned int end = ignoreLastBin && bins.count > 0 ? bins.count - 1 : bins.count;
  for (unsigned int i = std::max(static_cast<unsigned int>(low), bins.begin);
       i < std::min(end, bins.end); ++i) {
    pixels += bins.histogram[i];
    sum += i * bins.histogram[i];
    const unsigned int square = i * i;  // in 32 bits
    squares += square * bins.histogram[i];
  }
  const std::int64_t n = AsSigned(pixels);
  if (n == 0) return;
  const std::int64_t mean = Quotient(AsSigned(sum), n);
  const auto meanBits = static_cast<std::uint64_t>(mean);
  const auto variance =
      AsSigned(static_cast<std::uint64_t>(Quotient(AsSigned(squares), n)) - meanBits * meanBits);
  const int sigma =
      gobs::SaturateCast<int>(static_cast<double>(std::sqrt(static_cast<float>(variance))));
  low = gobs::SaturateCast<int>(static_cast<double>(mean) - sigma * leftTrim);
  high = gobs::SaturateCast<int>(sigma * rightTrim + static_cast<double>(mean));
  if (low < 0) low = 0;
  const auto count = static_cast<int>(bins.count);
  if (high >= count) high = count - 1;
}

}  // namespace

TrimMethod StringToTrimMethod(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return static_cast<char>(std::toupper(c)); });
  if (text == "PERCENTAGE") return TrimMethod::kPercentage;
  if (text == "MEAN AND N SIGMA") return TrimMethod::kMeanNSigma;
  return TrimMethod::kUnknown;
}

std::string TrimMethodToString(TrimMethod method) {
  if (method == TrimMethod::kPercentage) return "Percentage";
  if (method == TrimMethod::kMeanNSigma) return "Mean and N Sigma";
  return "Unknown";
}

void PercentTrimMethod::Trim(const std::uint64_t* histogram, double leftTrim, double rightTrim,
                             unsigned int binCount, bool ignoreFirstBin, bool ignoreLastBin,
                             std::int64_t total, int& low, int& high) const {
  TrimTails({histogram, binCount, 0, binCount}, leftTrim, rightTrim, ignoreFirstBin, ignoreLastBin,
            total, low, high);
}

void MeanNSigmaTrimMethod::Trim(const std::uint64_t* histogram, double leftTrim, double rightTrim,
                                unsigned int binCount, bool ignoreFirstBin, bool ignoreLastBin,
                                std::int64_t /*total*/, int& low, int& high) const {
  TrimDeviating({histogram, binCount, 0, binCount}, leftTrim, rightTrim, ignoreFirstBin,
                ignoreLastBin, low, high);
}

void Trim(const ITrimMethod& method, const HistogramBins& bins, double leftTrim, double rightTrim,
          bool ignoreFirstBin, bool ignoreLastBin, int& low, int& high) {
  if (method.GetMethod() == static_cast<int>(TrimMethod::kPercentage)) {
    TrimTails(bins, leftTrim, rightTrim, ignoreFirstBin, ignoreLastBin, -1, low, high);
  } else {
    TrimDeviating(bins, leftTrim, rightTrim, ignoreFirstBin, ignoreLastBin, low, high);
  }
}

ITrimMethod* CreateTrimMethod(TrimMethod method) {
  if (method == TrimMethod::kPercentage) return new PercentTrimMethod;
  if (method == TrimMethod::kMeanNSigma) return new MeanNSigmaTrimMethod;
  return nullptr;
}

void TrimMethodDeleter::operator()(ITrimMethod* method) const {
  if (method == nullptr) return;
  if (method->GetMethod() == static_cast<int>(TrimMethod::kPercentage)) {
    delete static_cast<PercentTrimMethod*>(method);
  } else {
    delete static_cast<MeanNSigmaTrimMethod*>(method);
  }
}

}  // namespace zarn::processes::filters
