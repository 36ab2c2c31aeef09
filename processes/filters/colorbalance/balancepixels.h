// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <type_traits>
#include <vector>

#include "host/sys/openmp.h"
#include "processes/filters/colorbalance/balancejob.h"
#include "processes/filters/framework/includedpixels.h"
#include "processes/filters/framework/parallel.h"
#if ZARN_SIMD
#include "processes/filters/framework/samplerows_simd.h"
#endif

namespace zarn::processes::filters {

/// The definition of every balancer, for pixels `begin` .. `end` - 1: excluded pixels by the rules,
/// all others by the correction and the channel's converter.
///
/// A correction has `void Run(const PixelRun&)`. `values` has room for one pixel.
template <typename T, class Correction>
void BalancePixels(const BalanceJob<T>& job, std::size_t begin, std::size_t end,
                   Correction& correction, double* values) {
  const std::size_t channels = job.channels;
  for (std::size_t i = begin; i < end; ++i) {
    const T* const in = job.input + i * channels;
    T* const out = job.output + i * channels;
    if (job.rules.Excludes(in, i)) {
      job.rules.WriteExcluded(out);
      continue;
    }
    for (std::size_t c = 0; c < channels; ++c) values[c] = static_cast<double>(in[c]);
    correction.Run({values, 1, 1, channels, i % job.width, i / job.width, nullptr});
    for (std::size_t c = 0; c < channels; ++c) out[c] = job.converters[c](values[c]);
  }
}

/// Pixels that a correction is given at a time at most.
inline constexpr std::size_t kRunPixels = 256;

#if ZARN_SIMD

/// Samples that have vector loops.
template <typename T>
inline constexpr bool kHasSampleRows = !std::is_integral_v<T> || sizeof(T) <= 4;

/// Scratch of one band: padded rows for the pixels of a run.
template <typename T>
class RunScratch {
 public:
  /// For runs of `pixels`, whose values are doubles in between if `widens`.
  RunScratch(std::size_t pixels, std::size_t channels, bool widens)
      : run_(pixels),
        values_(widens ? channels * Pitch() + kLine : 0),
        results_(channels * Pitch()),
        flags_(Pitch()) {}

  /// Pixels of a run.
  std::size_t Run() const { return run_; }
  /// Elements from one channel's values to the next.
  std::size_t Pitch() const { return run_ + kSampleRowPadding; }
  /// The values begin with a cache line: vectors across two are slow.
  double* Values() {
    void* first = values_.data();
    std::size_t space = values_.size() * sizeof(double);
    return static_cast<double*>(std::align(kLine * sizeof(double), 0, first, space));
  }
  T* Results() { return results_.data(); }
  std::uint8_t* Flags() { return flags_.data(); }

 private:
  static constexpr std::size_t kLine = 64 / sizeof(double);

  std::size_t run_;
  std::vector<double> values_;
  std::vector<T> results_;
  std::vector<std::uint8_t> flags_;
};

/// Pixels of a run, so that its rows stay in the fastest cache.
inline std::size_t RunPixels(std::size_t bytesPerPixel, std::size_t most) {
  constexpr std::size_t kRunBytes = 16384;
  return std::clamp<std::size_t>(kRunBytes / bytesPerPixel / 64 * 64, 64, most);
}

/// Flags which of `count` pixels from pixel `begin` on are excluded; null when none is.
template <typename T>
const std::uint8_t* FindExcluded(const BalanceJob<T>& job, std::size_t begin, std::size_t count,
                                 RunScratch<T>& scratch) {
  const BalanceRules<T>& rules = job.rules;
  const T* const in = job.input + begin * job.channels;
  const std::uint8_t* mask = rules.mask() == nullptr ? nullptr : rules.mask() + begin;
  if (mask != nullptr && std::memchr(mask, 0, count) == nullptr) mask = nullptr;
  const T* noData = rules.inputNoData();
  if (noData != nullptr && !AnySampleNear(in, count * job.channels, noData[0])) noData = nullptr;
  const bool any = (mask != nullptr || noData != nullptr) &&
                   FlagExcluded(in, count, job.channels, noData, mask, scratch.Flags());
  return any ? scratch.Flags() : nullptr;
}

/// Brings the results of pixels from pixel `begin` on to the output: `compute(results)` writes all
/// of them, but only those that are not excluded may reach an output whose others stay unwritten.
template <typename T, class Compute>
void WriteRun(const BalanceJob<T>& job, std::size_t begin, std::size_t count,
              const std::uint8_t* excluded, RunScratch<T>& scratch, const Compute& compute) {
  T* const out = job.output + begin * job.channels;
  if (excluded == nullptr) {
    compute(out);
  } else if (job.rules.outputNoData() != nullptr) {
    compute(out);
    ReplaceExcluded(excluded, job.rules.outputNoData(), count, job.channels, out);
  } else {
    const T* const results = scratch.Results();
    compute(scratch.Results());
    ForEachIncluded(excluded, count, [&](std::size_t first, std::size_t last) {
      std::copy(results + first * job.channels, results + last * job.channels,
                out + first * job.channels);
    });
  }
}

/// The same as `BalancePixels`, bit for bit, over runs of pixels of one row. The constants are
/// those of the job's converters. The steps of a run keep the machine from looking ahead by itself,
/// so each asks for what the next one waits for.
template <typename T, class Correction>
void BalanceRuns(const BalanceJob<T>& job, std::size_t begin, std::size_t end,
                 Correction& correction, const ConverterConstants<T>* constants,
                 RunScratch<T>& scratch) {
  const std::size_t channels = job.channels;
  double* const values = scratch.Values();
  const std::size_t pitch = scratch.Pitch();
  for (std::size_t i = begin; i < end;) {
    const std::size_t column = i % job.width;
    const std::size_t count = std::min({scratch.Run(), job.width - column, end - i});
    const std::uint8_t* const excluded = FindExcluded(job, i, count, scratch);
    WidenPixels(job.input + i * channels, count, channels, job.output + i * channels, values,
                pitch);
    correction.Run({values, pitch, count, channels, column, i / job.width, excluded});
    WriteRun(job, i, count, excluded, scratch, [&](T* results) {
      NarrowPixels(values, pitch, count, channels, constants, job.input + (i + count) * channels,
                   results);
    });
    i += count;
  }
}

/// Balances interleaved samples as they stand in memory: `map(samples, count, results)` for all
/// pixels of a run.
template <typename T, class Map>
void MapRuns(const BalanceJob<T>& job, std::size_t begin, std::size_t end, const Map& map,
             RunScratch<T>& scratch) {
  for (std::size_t i = begin; i < end; i += scratch.Run()) {
    const std::size_t count = std::min(scratch.Run(), end - i);
    WriteRun(job, i, count, FindExcluded(job, i, count, scratch), scratch,
             [&](T* results) { map(job.input + i * job.channels, count, results); });
  }
}

#endif

/// How a family shares out its pixels.
struct BalanceSharing {
  bool parallel = true;    ///< else the calling thread does all
  bool wholeRows = false;  ///< no two threads work on one row
};

/// Calls `prepare(bands)` once and then `work(band, begin, end)` for contiguous bands of pixels.
/// Exceptions are rethrown when all bands have ended.
template <typename T, typename Prepare, typename Work>
void ForEachPixelBand(const BalanceJob<T>& job, const BalanceSharing& sharing,
                      const Prepare& prepare, const Work& work) {
  const std::size_t unit = sharing.wholeRows ? job.width : 1;
  const auto units = static_cast<std::ptrdiff_t>(job.Pixels() / unit);
  const sys::OMPThreadCount threads(sharing.parallel ? units : 1);
  const std::ptrdiff_t bands = parallel::BandCount(units);
  prepare(static_cast<std::size_t>(bands));
  parallel::ForEachRowBandRethrowing(
      units, bands, [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        work(static_cast<std::size_t>(band), static_cast<std::size_t>(begin) * unit,
             static_cast<std::size_t>(end) * unit);
      });
}

#if ZARN_SIMD
/// Whether blocks of these samples have vector loops on this machine.
template <typename T>
bool RunsAreFast() {
  return kHasSampleRows<T> && HasVectors();
}

/// Balances a block by `map`, see `MapRuns`.
template <typename T, class Map>
void MapBlock(const BalanceJob<T>& job, const BalanceSharing& sharing, const Map& map) {
  constexpr std::size_t kMostPixels = 4096;
  const std::size_t run = RunPixels(4 * job.channels * sizeof(T), kMostPixels);
  std::vector<RunScratch<T>> scratch;
  ForEachPixelBand(
      job, sharing,
      [&](std::size_t bands) { scratch.assign(bands, RunScratch<T>(run, job.channels, false)); },
      [&](std::size_t band, std::size_t begin, std::size_t end) {
        MapRuns(job, begin, end, map, scratch[band]);
      });
}
#endif

/// Balances a block by a correction that may depend on the position. Each band has a copy of it.
template <typename T, class Correction>
void Balance(const BalanceJob<T>& job, const BalanceSharing& sharing,
             const Correction& correction) {
  if (job.Pixels() == 0 || job.channels == 0) return;
  std::vector<Correction> corrections;
#if ZARN_SIMD
  if constexpr (kHasSampleRows<T>) {
    if (RunsAreFast<T>()) {
      const std::size_t run = RunPixels(job.channels * sizeof(double), kRunPixels);
      const std::vector<ConverterConstants<T>> constants(job.converters.begin(),
                                                         job.converters.end());
      std::vector<RunScratch<T>> scratch;
      ForEachPixelBand(
          job, sharing,
          [&](std::size_t bands) {
            corrections.assign(bands, correction);
            scratch.assign(bands, RunScratch<T>(run, job.channels, true));
          },
          [&](std::size_t band, std::size_t begin, std::size_t end) {
            BalanceRuns(job, begin, end, corrections[band], constants.data(), scratch[band]);
          });
      return;
    }
  }
#endif
  std::vector<double> values;
  const auto prepare = [&](std::size_t bands) {
    corrections.assign(bands, correction);
    values.resize(bands * job.channels);
  };
  ForEachPixelBand(
      job, sharing, prepare, [&](std::size_t band, std::size_t begin, std::size_t end) {
        BalancePixels(job, begin, end, corrections[band], values.data() + band * job.channels);
      });
}

}  // namespace zarn::processes::filters
