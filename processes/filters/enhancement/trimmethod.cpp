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
  low = FirstBin(ignoreFirstBin);
  high = LastBin(binCount, ignoreLastBin);
  if (leftTrim == 0.0 && rightTrim == 0.0) return;
  auto pixels = static_cast<double>(total);
  if (total == -1) {
    std::uint64_t sum = 0;
    for (int i = low; i <= high; ++i) sum += histogram[i];
    pixels = static_cast<double>(sum);
  }
  const auto isKept = [&](int bin, double& remaining) {
    remaining -= static_cast<double>(histogram[bin]);
    return remaining < 0.0;
  };
  // Up to the end of the histogram, past `high` if need be.
  double remaining = pixels * leftTrim + 0.5;
  while (static_cast<unsigned int>(low) < binCount && !isKept(low, remaining)) ++low;
  remaining = pixels * rightTrim + 0.5;
  while (high >= 0 && !isKept(high, remaining)) --high;
}

void MeanNSigmaTrimMethod::Trim(const std::uint64_t* histogram, double leftTrim, double rightTrim,
                                unsigned int binCount, bool ignoreFirstBin, bool ignoreLastBin,
                                std::int64_t /*total*/, int& low, int& high) const {
  low = FirstBin(ignoreFirstBin);
  high = LastBin(binCount, ignoreLastBin);
  std::uint64_t pixels = 0;
  std::uint64_t sum = 0;
  std::uint64_t squares = 0;
  const unsigned int end = ignoreLastBin && binCount > 0 ? binCount - 1 : binCount;
  for (auto i = static_cast<unsigned int>(low); i < end; ++i) {
    pixels += histogram[i];
    sum += i * histogram[i];
    const unsigned int square = i * i;  // in 32 bits
    squares += square * histogram[i];
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
  const auto bins = static_cast<int>(binCount);
  if (high >= bins) high = bins - 1;
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
