// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <type_traits>
#include <vector>

#include "host/sys/openmp.h"
#include "processes/filters/colorbalance/balancejob.h"
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

/// Scratch of one band: rows of samples and of values, padded.
template <typename T>
class RunScratch {
 public:
  explicit RunScratch(std::size_t channels)
      : run_(std::clamp<std::size_t>(8 * kRunPixels / std::max<std::size_t>(channels, 1) / 64 * 64,
                                     64, kRunPixels)),
        samples_(Rows<T>(channels)),
        planes_(Rows<T>(channels)),
        old_(Rows<T>(channels)),
        values_(Rows<double>(channels)),
        flags_(Rows<std::uint8_t>(1)),
        mask_(Rows<std::uint8_t>(1)) {}

  /// Pixels of a run, a multiple of every vector's length.
  std::size_t Run() const { return run_; }
  /// Elements from one channel to the next.
  std::size_t Pitch() const { return run_ + kSampleRowPadding; }
  T* Samples() { return samples_.get(); }
  T* Planes() { return planes_.get(); }
  T* Old() { return old_.get(); }
  double* Values() { return values_.get(); }
  std::uint8_t* Flags() { return flags_.get(); }
  std::uint8_t* Mask() { return mask_.get(); }

 private:
  template <typename U>
  struct Release {
    void operator()(U* rows) const { ::operator delete[](rows, kAlignment); }
  };
  template <typename U>
  using RowsOf = std::unique_ptr<U[], Release<U>>;

  static constexpr std::align_val_t kAlignment{64};

  template <typename U>
  RowsOf<U> Rows(std::size_t channels) const {
    const std::size_t size = std::max<std::size_t>(channels, 1) * Pitch();
    auto* const rows = static_cast<U*>(::operator new[](size * sizeof(U), kAlignment));
    std::fill_n(rows, size, U{});
    return RowsOf<U>(rows);
  }

  std::size_t run_;
  RowsOf<T> samples_;
  RowsOf<T> planes_;
  RowsOf<T> old_;
  RowsOf<double> values_;
  RowsOf<std::uint8_t> flags_;
  RowsOf<std::uint8_t> mask_;
};

/// Blocks of more bytes leave the caches before anybody reads them again.
inline constexpr std::size_t kStreamedBytes = std::size_t{8} << 20;

/// Whether pixels of a run may be excluded: false is certain, true is not, as single samples are
/// looked at.
template <typename T>
bool MayExclude(const BalanceRules<T>& rules, const T* samples, std::size_t sampleCount,
                const std::uint8_t* mask, std::size_t pixels) {
  return (mask != nullptr && std::memchr(mask, 0, pixels) != nullptr) ||
         (rules.inputNoData() != nullptr &&
          AnySampleNear(samples, sampleCount, rules.inputNoData()[0]));
}

/// Asks for the memory of the pixels ahead while others are computed: the passes over a run keep
/// the machine from looking ahead by itself.
template <typename T>
void Prefetch(const BalanceJob<T>& job, std::size_t begin, std::size_t end) {
  constexpr std::size_t kCacheLine = 64;
  const auto* const first = reinterpret_cast<const std::byte*>(job.input + begin * job.channels);
  const auto* const last = reinterpret_cast<const std::byte*>(job.input + end * job.channels);
  for (const std::byte* line = first; line < last; line += kCacheLine) __builtin_prefetch(line);
}

/// The loop that all fast balancers share: over runs of pixels of one row, `compute(pixels, run,
/// excluded)` brings their results, interleaved, to `scratch.Samples()`, where `pixels` may stand
/// too. With `kSplit` the channels stand in `scratch.Planes()`; `run` has no values yet.
template <bool kSplit, typename T, class Compute>
void ForEachRun(const BalanceJob<T>& job, std::size_t begin, std::size_t end,
                RunScratch<T>& scratch, const Compute& compute) {
  const std::size_t channels = job.channels;
  const BalanceRules<T>& rules = job.rules;
  const std::size_t pixelBytes = channels * sizeof(T);
  const bool streams = job.Pixels() * pixelBytes > kStreamedBytes;
  for (std::size_t i = begin; i < end;) {
    const std::size_t column = i % job.width;
    const std::size_t count = std::min({scratch.Run(), job.width - column, end - i});
    T* const out = job.output + i * channels;
    // Vectors may read past the run, but not past the band: where the output is the input, another
    // thread writes there.
    const T* in = job.input + i * channels;
    const std::uint8_t* mask = rules.mask() == nullptr ? nullptr : rules.mask() + i;
    if (i + count + kSampleRowPadding > end) {
      in = std::copy_n(in, count * channels, scratch.Samples()) - count * channels;
      if (mask != nullptr) mask = std::copy_n(mask, count, scratch.Mask()) - count;
    }
    const bool tests = MayExclude(rules, in, count * channels, mask, count);
    if (kSplit) Prefetch(job, i + count, std::min(end, i + 2 * count));
    if (kSplit || tests) {
      SplitChannels(in, count, channels, scratch.Planes(), scratch.Pitch());
    }
    const bool any = tests && FlagExcluded(scratch.Planes(), scratch.Pitch(), count, channels,
                                           rules.inputNoData(), mask, scratch.Flags());
    const std::uint8_t* const flags = any ? scratch.Flags() : nullptr;
    if (any && rules.outputNoData() == nullptr) {
      std::copy_n(out, count * channels, scratch.Old());
    }
    compute(in, PixelRun{nullptr, scratch.Pitch(), count, channels, column, i / job.width, flags},
            ExcludedPixels<T>{flags, rules.outputNoData(), scratch.Old()});
    if (streams) {
      StreamBytes(reinterpret_cast<const std::byte*>(scratch.Samples()), count * pixelBytes,
                  reinterpret_cast<std::byte*>(out));
    } else {
      std::memcpy(out, scratch.Samples(), count * pixelBytes);
    }
    i += count;
  }
  if (streams) FinishStreaming();
}

/// The same as `BalancePixels`, bit for bit.
template <typename T, class Correction>
void BalanceRuns(const BalanceJob<T>& job, std::size_t begin, std::size_t end,
                 Correction& correction, RunScratch<T>& scratch) {
  const auto compute = [&](const T*, PixelRun run, const ExcludedPixels<T>& excluded) {
    T* const planes = scratch.Planes();
    run.values = scratch.Values();
    for (std::size_t c = 0; c < run.channels; ++c) {
      WidenSamples(planes + c * run.pitch, run.count, run.Channel(c));
    }
    correction.Run(run);
    for (std::size_t c = 0; c < run.channels; ++c) {
      NarrowSamples(run.Channel(c), run.count, job.converters[c], planes + c * run.pitch);
    }
    JoinChannels(planes, run.pitch, run.count, run.channels, excluded, scratch.Samples());
  };
  ForEachRun<true>(job, begin, end, scratch, compute);
}

/// Balances interleaved samples as they stand in memory: `map(samples, count, results)` for all
/// pixels of a run; what it makes of excluded ones is replaced.
template <typename T, class Map>
void MapRuns(const BalanceJob<T>& job, std::size_t begin, std::size_t end, const Map& map,
             RunScratch<T>& scratch) {
  const auto compute = [&](const T* in, const PixelRun& run, const ExcludedPixels<T>& excluded) {
    map(in, run.count, scratch.Samples());
    if (excluded.flags != nullptr) {
      ReplaceExcluded(excluded, run.count, run.channels, scratch.Samples());
    }
  };
  ForEachRun<false>(job, begin, end, scratch, compute);
}

#endif

/// How a family shares out its pixels.
struct BalanceSharing {
  bool parallel;      ///< else the calling thread does all
  std::int64_t most;  ///< threads at most
};

/// Calls `prepare(bands)` once and then `work(band, begin, end)` for contiguous bands of pixels.
/// Exceptions are rethrown when all bands have ended.
template <typename Prepare, typename Work>
void ForEachPixelBand(std::size_t pixels, const BalanceSharing& sharing, const Prepare& prepare,
                      const Work& work) {
  const sys::OMPThreadCount threads(sharing.parallel ? sharing.most : 1);
  const std::ptrdiff_t bands = parallel::BandCount(static_cast<std::ptrdiff_t>(pixels));
  prepare(static_cast<std::size_t>(bands));
  parallel::ForEachRowBandRethrowing(
      static_cast<std::ptrdiff_t>(pixels), bands,
      [&](std::ptrdiff_t band, std::ptrdiff_t begin, std::ptrdiff_t end) {
        work(static_cast<std::size_t>(band), static_cast<std::size_t>(begin),
             static_cast<std::size_t>(end));
      });
}

#if ZARN_SIMD
/// Whether blocks of these samples have vector loops on this machine.
template <typename T>
bool RunsAreFast() {
  return kHasSampleRows<T> && HasVectors();
}

/// Calls `work(band, begin, end, scratch)` for contiguous bands of pixels, each with scratch of its
/// own; `prepare(bands)` comes first.
template <typename T, typename Prepare, typename Work>
void ForEachBandOfRuns(const BalanceJob<T>& job, const BalanceSharing& sharing,
                       const Prepare& prepare, const Work& work) {
  std::vector<RunScratch<T>> scratch;
  const auto prepareAll = [&](std::size_t bands) {
    prepare(bands);
    for (std::size_t b = 0; b < bands; ++b) scratch.emplace_back(job.channels);
  };
  ForEachPixelBand(job.Pixels(), sharing, prepareAll,
                   [&](std::size_t band, std::size_t begin, std::size_t end) {
                     work(band, begin, end, scratch[band]);
                   });
}

/// Balances a block by `map`, see `MapRuns`.
template <typename T, class Map>
void MapBlock(const BalanceJob<T>& job, const BalanceSharing& sharing, const Map& map) {
  ForEachBandOfRuns(
      job, sharing, [](std::size_t) {},
      [&](std::size_t, std::size_t begin, std::size_t end, RunScratch<T>& scratch) {
        MapRuns(job, begin, end, map, scratch);
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
      ForEachBandOfRuns(
          job, sharing, [&](std::size_t bands) { corrections.assign(bands, correction); },
          [&](std::size_t band, std::size_t begin, std::size_t end, RunScratch<T>& scratch) {
            BalanceRuns(job, begin, end, corrections[band], scratch);
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
      job.Pixels(), sharing, prepare, [&](std::size_t band, std::size_t begin, std::size_t end) {
        BalancePixels(job, begin, end, corrections[band], values.data() + band * job.channels);
      });
}

}  // namespace zarn::processes::filters
