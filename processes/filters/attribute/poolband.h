// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <type_traits>
#include <vector>

#include "processes/filters/attribute/filteralgo.h"
#include "processes/filters/attribute/pooling.h"
#include "processes/filters/attribute/poolplanes_simd.h"
#include "processes/filters/attribute/poolstatistics_simd.h"
#include "processes/filters/framework/includedpixels.h"
#include "processes/filters/framework/orderedkeys.h"
#include "processes/filters/framework/samplerows_simd.h"
#include "processes/filters/framework/sortingnetwork.h"

namespace zarn::processes::filters {

/// How the vector loops go about one call, the same for all threads.
template <typename T>
class PoolPlan {
 public:
  using Key = OrderedKey<T>;

  PoolPlan(const PoolingJob<T>& job, FILTERALGO algo)
      : algo_(algo),
        cells_(job.offsets.size()),
        channels_(static_cast<std::size_t>(job.output.Channels())),
        reachX_(static_cast<std::size_t>(job.reach.x)),
        slots_(2 * static_cast<std::size_t>(job.reach.y) + 1),
        labelSize_(job.labels == nullptr ? 0 : job.labels->LabelSize()) {
    usable_ = HasVectors() && cells_ <= MostCells() && channels_ > 0 &&
              (algo == FILTERALGO::kAverage || cells_ % 2 == 1) &&
              (job.labels == nullptr || job.labels->HasVectors());
    if (!usable_) return;
    const auto width = static_cast<std::size_t>(job.output.Width());
    strip_ = std::min(std::max(kStrip, 8 * reachX_), width);
    // Whole blocks of the ordering loops.
    constexpr std::size_t kBlock = std::max<std::size_t>(kPoolGroup, PoolWorkBytes(1) / sizeof(T));
    segment_ = kBlock * std::clamp<std::size_t>(kFlagBytes / (kBlock * cells_), 1, 512 / kBlock);
    if (algo == FILTERALGO::kMedian) {
      network_ = SelectionNetwork(cells_, cells_ / 2, cells_ / 2);
    } else if (algo == FILTERALGO::kTrimmedMean) {
      const TrimmedRanks ranks = TrimmedRanks::OfAny(cells_);
      network_ = SelectionNetwork(cells_, ranks.first, ranks.last);
    }
  }

  /// Whether the vector loops serve this call at all.
  bool Usable() const { return usable_; }

  /// Whether rows hold keys in place of samples of another type, or of other bits.
  bool Keyed() const {
    if constexpr (std::is_floating_point_v<T>) return algo_ != FILTERALGO::kAverage;
    return std::is_signed_v<T>;
  }

  /// Computes one run of pixels.
  void Reduce(const PoolSamples& pools) const {
    switch (algo_) {
      case FILTERALGO::kAverage:
        return PoolMeans<T>(pools);
      case FILTERALGO::kMedian:
        return PoolMedians<Key>(pools);
      case FILTERALGO::kTrimmedMean:
        return PoolTrimmedMeans<T>(pools);
    }
  }
  /// Whether the results are keys.
  bool GivesKeys() const { return algo_ == FILTERALGO::kMedian && Keyed(); }

  std::size_t Cells() const { return cells_; }
  std::size_t Channels() const { return channels_; }
  std::size_t ReachX() const { return reachX_; }
  /// Input rows that are held at a time.
  std::size_t Slots() const { return slots_; }
  std::size_t LabelSize() const { return labelSize_; }
  /// Columns that are processed at a time, so that their rows stay in cache.
  std::size_t Strip() const { return strip_; }
  /// Pixels whose flags are held at a time.
  std::size_t Segment() const { return segment_; }
  const std::vector<Exchange>& Network() const { return network_; }

  /// Pixels of an input row of a strip, and the same with its padding.
  std::size_t Pixels() const { return strip_ + 2 * reachX_; }
  std::size_t Pitch() const {
    return (Pixels() + 2 * kSampleRowPadding) / kPoolGroup * kPoolGroup + kPoolGroup;
  }
  std::size_t SegmentPitch() const { return segment_ + kSampleRowPadding; }

 private:
  static constexpr std::size_t kStrip = 2048;
  // Half of the smallest first-level cache.
  static constexpr std::size_t kFlagBytes = 16384;

  std::size_t MostCells() const {
    return algo_ == FILTERALGO::kAverage ? kMostMeanCells : kMostOrderedCells;
  }

  FILTERALGO algo_;
  std::size_t cells_;
  std::size_t channels_;
  std::size_t reachX_;
  std::size_t slots_;
  std::size_t labelSize_;
  std::size_t strip_ = 0;
  std::size_t segment_ = 0;
  bool usable_ = false;
  std::vector<Exchange> network_;
};

/// One input row of a strip.
struct HeldRow {
  std::byte* labels;
  std::uint8_t* unlabelled;
  std::uint8_t* excluded;
  std::byte* samples;  ///< planes of keys or samples
  bool anyUnlabelled;
  bool anyExcluded;
};

/// Scratch of one band, cut from a single allocation.
template <typename T>
struct PoolScratch {
  HeldRow* rows;
  NeighbourRow* neighbours;
  const void** cells;
  T* pixels;
  T* planes;
  std::uint8_t* flags;
  std::uint8_t* counts8;
  std::uint16_t* counts16;
  OrderedKey<T>* keys;
  T* results;
  T* joined;
  std::uint8_t* kept;
  std::byte* work;

  static std::size_t Bytes(const PoolPlan<T>& plan) {
    std::size_t size = 0;
    Layout(plan, nullptr, size);
    return size;
  }
  /// `memory` is aligned to 64 bytes and zeroed.
  static PoolScratch Take(const PoolPlan<T>& plan, std::byte* memory) {
    std::size_t size = 0;
    return Layout(plan, memory, size);
  }

 private:
  static PoolScratch Layout(const PoolPlan<T>& plan, std::byte* memory, std::size_t& size) {
    constexpr std::size_t kAlignment = 64;
    const auto take = [&]<typename Element>(std::type_identity<Element>, std::size_t elements) {
      std::byte* const place = memory == nullptr ? nullptr : memory + size;
      size += (elements * sizeof(Element) + kAlignment - 1) / kAlignment * kAlignment;
      return reinterpret_cast<Element*>(place);
    };
    const std::type_identity<std::uint8_t> bytes;
    const std::type_identity<T> samples;
    const std::size_t pitch = plan.Pitch();
    const std::size_t segment = plan.SegmentPitch();
    PoolScratch s{};
    s.rows = take(std::type_identity<HeldRow>(), plan.Slots());
    for (std::size_t slot = 0; slot < plan.Slots(); ++slot) {
      auto* const labels = take(std::type_identity<std::byte>(), pitch * plan.LabelSize());
      std::uint8_t* const unlabelled = take(bytes, pitch);
      std::uint8_t* const excluded = take(bytes, pitch);
      auto* const planes =
          take(std::type_identity<std::byte>(), pitch * plan.Channels() * sizeof(T));
      if (memory != nullptr) s.rows[slot] = {labels, unlabelled, excluded, planes, false, false};
    }
    s.neighbours = take(std::type_identity<NeighbourRow>(), plan.Cells());
    s.cells = take(std::type_identity<const void*>(), plan.Cells());
    s.pixels = take(samples, pitch * plan.Channels());
    s.planes = take(samples, pitch * plan.Channels());
    s.flags = take(bytes, plan.Cells() * plan.Segment());
    s.counts8 = take(bytes, segment);
    s.counts16 = take(std::type_identity<std::uint16_t>(), segment);
    s.keys = take(std::type_identity<OrderedKey<T>>(), segment);
    s.results = take(samples, segment * plan.Channels());
    s.joined = take(samples, segment * plan.Channels());
    s.kept = take(bytes, segment);
    s.work = take(std::type_identity<std::byte>(), PoolWorkBytes(plan.Cells()));
    return s;
  }
};

/// The vector twin of `ReduceRows`, for one band of rows. Each input row is looked at once as the
/// window reaches it: it is cut into channels, with its labels on the same grid beside it and flags
/// of what is never pooled. For each run of an output row, flags then tell for every cell of the
/// kernel which neighbours are pooled, and serve all channels.
template <typename T>
class PoolBand {
 public:
  using Key = OrderedKey<T>;

  PoolBand(const PoolingJob<T>& job, const PoolPlan<T>& plan, std::byte* memory)
      : job_(job), plan_(plan), scratch_(PoolScratch<T>::Take(plan, memory)) {}

  void Run(std::ptrdiff_t begin, std::ptrdiff_t end) {
    if (begin == end) return;
    const std::ptrdiff_t width = job_.output.Width();
    const std::ptrdiff_t reach = job_.reach.y;
    for (strip_ = 0; strip_ < width; strip_ += static_cast<std::ptrdiff_t>(plan_.Strip())) {
      stripWidth_ = std::min(plan_.Strip(), static_cast<std::size_t>(width - strip_));
      top_ = begin - reach;
      for (std::ptrdiff_t y = top_; y < begin + reach; ++y) Enter(y);
      for (std::ptrdiff_t y = begin; y < end; ++y) {
        Enter(y + reach);
        PoolOutputRow(y);
      }
    }
  }

 private:
  HeldRow& Held(std::ptrdiff_t y) const {
    return scratch_.rows[static_cast<std::size_t>(y - top_) % plan_.Slots()];
  }

  // Reads input row y into the place of the row that has left the window.
  void Enter(std::ptrdiff_t y) {
    HeldRow& row = Held(y);
    const std::size_t wanted = stripWidth_ + 2 * plan_.ReachX();
    row.anyUnlabelled = false;
    row.anyExcluded = !job_.RowExists(y);
    if (row.anyExcluded) {
      std::memset(row.excluded, 1, plan_.Pitch());
      return;
    }
    const std::ptrdiff_t left = strip_ - job_.reach.x;
    const std::ptrdiff_t first = std::max(left, -job_.input.MarginX());
    const std::ptrdiff_t end = std::min(left + static_cast<std::ptrdiff_t>(wanted),
                                        job_.input.Width() + job_.input.MarginX());
    const auto lead = static_cast<std::size_t>(first - left);
    const auto count = static_cast<std::size_t>(end - first);
    ReadSamples(first, y, lead, count, row);
    if (lead > 0 || count < wanted) {
      // Pixels that do not exist.
      if (!row.anyExcluded) std::memset(row.excluded, 0, plan_.Pitch());
      std::memset(row.excluded, 1, lead);
      std::memset(row.excluded + lead + count, 1, plan_.Pitch() - lead - count);
      row.anyExcluded = true;
    }
    if (job_.labels == nullptr) return;
    std::byte* const labels = row.labels + lead * plan_.LabelSize();
    job_.labels->ReadRow(first, y, count, labels);
    row.anyUnlabelled = job_.labels->FlagUnlabelled(labels, count, row.unlabelled + lead);
  }

  void ReadSamples(std::ptrdiff_t x, std::ptrdiff_t y, std::size_t lead, std::size_t count,
                   HeldRow& row) const {
    const std::size_t channels = plan_.Channels();
    const std::size_t pitch = plan_.Pitch();
    // Copied, because the loops read on past the end of a row.
    std::memcpy(scratch_.pixels, job_.input.Pixel(x, y), count * channels * sizeof(T));
    T* const samples = reinterpret_cast<T*>(row.samples);
    T* const planes = plan_.Keyed() ? scratch_.planes : samples + lead;
    SplitChannels(scratch_.pixels, count, channels, planes, pitch);
    if (job_.hasInputMask || !job_.noData.empty()) {
      row.anyExcluded = FlagExcluded(
          scratch_.pixels, count, channels, job_.noData.empty() ? nullptr : job_.noData.data(),
          job_.hasInputMask ? job_.inputMask.Pixel(x, y) : nullptr, row.excluded + lead);
    }
    if (!plan_.Keyed()) return;
    Key* const keys = reinterpret_cast<Key*>(row.samples) + lead;
    for (std::size_t c = 0; c < channels; ++c) {
      std::transform(planes + c * pitch, planes + c * pitch + count, keys + c * pitch,
                     [](T sample) { return ToOrderedKey(sample); });
    }
  }

  NeighbourRow NeighbourAt(const HeldRow& row, std::size_t pixel) const {
    return {row.labels + pixel * plan_.LabelSize(),
            row.anyUnlabelled ? row.unlabelled + pixel : nullptr,
            row.anyExcluded ? row.excluded + pixel : nullptr};
  }

  // Writes the strip of output row y.
  void PoolOutputRow(std::ptrdiff_t y) {
    for (std::size_t k = 0; k < plan_.Cells(); ++k) {
      const PoolOffset& offset = job_.offsets[k];
      const HeldRow& row = Held(y + offset.dy);
      const auto pixel = static_cast<std::size_t>(job_.reach.x + offset.dx);
      scratch_.neighbours[k] = NeighbourAt(row, pixel);
      scratch_.cells[k] = row.samples + pixel * sizeof(T);
    }
    const NeighbourRow centre = NeighbourAt(Held(y), plan_.ReachX());
    for (std::size_t x = 0; x < stripWidth_; x += plan_.Segment()) {
      const std::size_t count = std::min(plan_.Segment(), stripWidth_ - x);
      const std::size_t padded = (count + kPoolGroup - 1) / kPoolGroup * kPoolGroup;
      const PoolRun run{
          scratch_.neighbours, plan_.Cells(),    centre,           x, padded, scratch_.flags,
          plan_.Segment(),     scratch_.counts8, scratch_.counts16};
      job_.labels == nullptr ? FlagNeighbours(run) : job_.labels->FlagPools(run);
      for (std::size_t c = 0; c < plan_.Channels(); ++c) {
        T* const results = scratch_.results + c * plan_.SegmentPitch();
        plan_.Reduce({scratch_.cells, plan_.Cells(), c * plan_.Pitch(), x, padded, scratch_.flags,
                      plan_.Segment(), scratch_.counts8, scratch_.counts16,
                      plan_.GivesKeys() ? static_cast<void*>(scratch_.keys) : results,
                      scratch_.work, &plan_.Network()});
        if (plan_.GivesKeys()) {
          std::transform(scratch_.keys, scratch_.keys + count, results,
                         [](Key key) { return FromOrderedKey<T>(key); });
        }
      }
      Write(strip_ + static_cast<std::ptrdiff_t>(x), y, count);
    }
  }

  // Brings results home, but for pixels without a pool and those that the output mask keeps.
  void Write(std::ptrdiff_t x, std::ptrdiff_t y, std::size_t count) const {
    T* const out = job_.output.Pixel(x, y);
    const std::size_t samples = count * plan_.Channels();
    const bool any =
        FlagKept(scratch_.counts16, job_.hasOutputMask ? job_.outputMask.Pixel(x, y) : nullptr,
                 count, scratch_.kept);
    if (!any && plan_.Channels() == 1) {
      std::memcpy(out, scratch_.results, samples * sizeof(T));
      return;
    }
    const std::size_t channels = plan_.Channels();
    const T* const joined = scratch_.joined;
    JoinChannels(scratch_.results, plan_.SegmentPitch(), count, channels, scratch_.joined);
    if (!any) {
      std::memcpy(out, joined, samples * sizeof(T));
      return;
    }
    // Kept pixels are not even written as they were: others may be writing there.
    ForEachIncluded(scratch_.kept, count, [&](std::size_t first, std::size_t last) {
      std::copy(joined + first * channels, joined + last * channels, out + first * channels);
    });
  }

  const PoolingJob<T>& job_;
  const PoolPlan<T>& plan_;
  PoolScratch<T> scratch_;
  std::ptrdiff_t strip_ = 0;  // its first column
  std::size_t stripWidth_ = 0;
  std::ptrdiff_t top_ = 0;  // the first row that entered
};

}  // namespace zarn::processes::filters
