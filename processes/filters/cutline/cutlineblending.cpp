// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/cutline/cutlineblending.h"

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <memory>
#include <utility>
#include <vector>

#include "processes/filters/cutline/blendrows.h"
#include "processes/filters/cutline/distancerows.h"
#include "processes/filters/cutline/insiderows.h"
#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/messages.h"
#include "processes/filters/framework/parallel.h"
#include "processes/filters/framework/sampletypes.h"

namespace zarn::processes::filters {
namespace {

constexpr const char* kDescriptionsDiffer = "Raster dimensions don't match.";
constexpr const char* kMapSize = "Invalid source map size";

// Rows that share one look-up of their edges.
constexpr std::int64_t kSlabRows = 32;
// The same where so many edges are that threads would wait for the one that has them.
constexpr std::int64_t kShortSlabRows = 8;
constexpr std::int64_t kSerialBelow = 129;

bool SameDescription(const gobs::RasterInfo& a, const gobs::RasterInfo& b) {
  return a.Width() == b.Width() && a.Height() == b.Height() && a.Channels() == b.Channels() &&
         a.Type() == b.Type() && a.Frame() == b.Frame();
}

// Complex samples of short and of float are handled as pairs of them.
gobs::NativeDataTypeCode ComponentCode(const gobs::RasterInfo& block) {
  using enum gobs::NativeDataTypeCode;
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(block);
  if (code == kComplexInt16) return kInt16;
  if (code == kComplexFloat32) return kFloat32;
  return code;
}

// A no-data pixel; that of a complex type has no imaginary part.
template <typename T>
std::vector<T> NoDataPixel(const std::vector<double>& list, const gobs::RasterInfo& block) {
  if (list.empty()) return {};
  std::vector<T> pixel = ConvertNoData<T>(list);
  pixel.resize(block.Channels());
  if (block.Type().isComplex == 0) return pixel;
  std::vector<T> pairs(2 * pixel.size());
  for (std::size_t c = 0; c < pixel.size(); ++c) pairs[2 * c] = pixel[c];
  return pairs;
}

// Rows of the block that are worked on together.
struct Slab {
  std::int64_t first;
  std::int64_t end;
};

// All slabs, and the most that any of them has to do with.
struct Slabs {
  std::vector<Slab> slabs;
  PolygonRowIndex::Crowd cutline;
  PolygonRowIndex::Crowd tile;
};

// Cuts the rows `first` .. `last` of a block whose first row is `top` for so many threads. A slab
// that is a good part of the work of one thread is cut again.
Slabs CutSlabs(const PolygonRowIndex* cutline, const PolygonRowIndex* tile, std::int64_t top,
               std::int64_t first, std::int64_t last, std::int64_t threads) {
  constexpr std::size_t kPartsOfThread = 4;
  Slabs cut;
  std::vector<std::size_t> work;
  std::size_t all = 0;
  for (std::int64_t begin = first; begin <= last; begin += kSlabRows) {
    const std::int64_t end = std::min(last + 1, begin + kSlabRows);
    std::size_t& own = work.emplace_back(1);
    for (const auto& [index, most] : {std::pair{cutline, &cut.cutline}, {tile, &cut.tile}}) {
      if (index == nullptr) continue;
      const PolygonRowIndex::Crowd crowd = index->CrowdOf(top + begin, top + end - 1);
      own += crowd.places;
      most->groups = std::max(most->groups, crowd.groups);
      most->places = std::max(most->places, crowd.places);
    }
    all += own;
  }
  std::int64_t begin = first;
  for (const std::size_t own : work) {
    const std::int64_t slabEnd = std::min(last + 1, begin + kSlabRows);
    const bool again =
        threads > 1 && own * kPartsOfThread * static_cast<std::size_t>(threads) > all;
    while (begin < slabEnd) {
      const std::int64_t end = again ? std::min(slabEnd, begin + kShortSlabRows) : slabEnd;
      cut.slabs.push_back({begin, end});
      begin = end;
    }
  }
  return cut;
}

// One thread's view of the polygons: what becomes of each row of its slabs.
class RowPlanner {
 public:
  RowPlanner(const PolygonRowIndex* cutline, const PolygonRowIndex* tile, std::int64_t left,
             std::size_t width, const Slabs& slabs) {
    plan.copied.resize(WordsFor(width));
    plan.blended.resize(WordsFor(width));
    SetFirst(plan.copied, width);
    if (cutline != nullptr) {
      cutline_ = std::make_unique<InsideRows>(*cutline, left, width, slabs.cutline);
      if (cutline->Blend() > 0) {
        band_ = std::make_unique<DistanceRows>(*cutline, left, width, slabs.cutline);
      }
    }
    if (tile != nullptr) {
      tile_ = std::make_unique<InsideRows>(*tile, left, width, slabs.tile);
      inTile_.resize(WordsFor(width));
    }
    whole_ = plan.copied;
  }

  void Prepare(std::int64_t first, std::int64_t last) {
    if (cutline_) cutline_->Prepare(first, last);
    if (tile_) tile_->Prepare(first, last);
    if (band_) band_->Prepare(first, last);
  }

  void Plan(std::int64_t row) {
    if (cutline_) {
      cutline_->Compute(row, plan.copied);
    } else {
      plan.copied = whole_;
    }
    if (band_) {
      band_->Compute(row, plan.copied, plan.blended);
      plan.weights = band_->Weights();
      for (std::size_t w = 0; w < plan.copied.size(); ++w) plan.copied[w] &= ~plan.blended[w];
    } else {
      std::fill(plan.blended.begin(), plan.blended.end(), 0);
    }
    if (!tile_) return;
    tile_->Compute(row, inTile_);
    for (std::size_t w = 0; w < inTile_.size(); ++w) {
      plan.copied[w] &= inTile_[w];
      plan.blended[w] &= inTile_[w];
    }
  }

  RowPlan plan;

 private:
  std::unique_ptr<InsideRows> cutline_;
  std::unique_ptr<InsideRows> tile_;
  std::unique_ptr<DistanceRows> band_;
  PixelBits inTile_;
  PixelBits whole_;
};

// Calls `apply(row, plan)` for the rows `first` .. `last` of a block whose first pixel lies at
// (`left`, `top`), until it returns false. Tells whether it never did.
template <typename Apply>
bool ForEachPlan(const PolygonRowIndex* cutline, const PolygonRowIndex* tile, std::int64_t left,
                 std::int64_t top, std::size_t width, std::int64_t first, std::int64_t last,
                 const Apply& apply) {
  const std::int64_t rows = last - first + 1;
  const bool parallel = rows >= kSerialBelow && parallel::MayShareOut();
  const std::int64_t threads = parallel ? parallel::BandCount(rows / kShortSlabRows) : 1;
  const Slabs slabs = CutSlabs(cutline, tile, top, first, last, threads);
  std::vector<std::unique_ptr<RowPlanner>> planners;
  for (std::int64_t thread = 0; thread < threads; ++thread) {
    planners.push_back(std::make_unique<RowPlanner>(cutline, tile, left, width, slabs));
  }
  // Whoever is free takes the next slab: the work lies where the polygon is.
  std::atomic<std::size_t> next = 0;
  std::atomic<bool> aborted = false;
  const auto work = [&](std::ptrdiff_t thread, std::ptrdiff_t, std::ptrdiff_t) {
    RowPlanner& planner = *planners[static_cast<std::size_t>(thread)];
    for (;;) {
      const std::size_t taken = next.fetch_add(1, std::memory_order_relaxed);
      if (taken >= slabs.slabs.size()) return;
      const auto [begin, end] = slabs.slabs[taken];
      planner.Prepare(top + begin, top + end - 1);
      for (std::int64_t row = begin; row < end; ++row) {
        if (aborted.load(std::memory_order_relaxed)) return;
        planner.Plan(top + row);
        if (!apply(static_cast<std::size_t>(row), planner.plan)) {
          aborted.store(true, std::memory_order_relaxed);
        }
      }
    }
  };
  parallel::ForEachRowBand(threads, threads, work);
  return !aborted.load(std::memory_order_relaxed);
}

}  // namespace

FilterResult CPUCutlineBlending::Process(const gobs::Raster& input, gobs::Raster& output,
                                         std::uint32_t blockX, std::uint32_t blockY,
                                         const std::uint8_t* inputMask) {
  if (!SameDescription(input, output)) return FilterResult::Failure(kDescriptionsDiffer);
  return VisitSampleType(
      ComponentCode(input), messages::kUnknownBalancedType,
      [&]<typename T>(std::type_identity<T>) -> FilterResult {
        SourceMapWriter map;
        if (sourceMap != nullptr) {
          if (sourceMap->Width() != input.Width() || sourceMap->Height() != input.Height() ||
              std::int64_t{sourceMapChannel} > std::int64_t{sourceMap->Channels()}) {
            return FilterResult::Failure(kMapSize);
          }
          FilterResult known =
              VisitSampleType(ComponentCode(*sourceMap), messages::kUnknownBalancedType,
                              [&]<typename M>(std::type_identity<M>) {
                                if (sourceMapChannel >= 1 && sourceMapValue >= 1) {
                                  map = SourceMapWriter(static_cast<M*>(sourceMap->Data()),
                                                        static_cast<std::size_t>(sourceMapChannel),
                                                        static_cast<M>(sourceMapValue));
                                }
                                return FilterResult::Success();
                              });
          if (!known.Ok()) return known;
        }
        if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                                    blockchecks::Aliasing::kSameBlockAllowed)) {
          return *refusal;
        }
        if (sourceMap != nullptr) {
          for (const gobs::Raster* const block : {&input, &std::as_const(output)}) {
            if (auto refusal = blockchecks::CheckApart(*sourceMap, *block)) return *refusal;
          }
        }
        int start = 0;
        int end = 0;
        GetStartEndY(start, end);
        const std::int64_t left = std::int64_t{blockX} + offsetX;
        const std::int64_t top = std::int64_t{blockY} + offsetY;
        const std::int64_t first = std::max<std::int64_t>(start - top, 0);
        const std::int64_t last =
            std::min<std::int64_t>(input.Height() - std::int64_t{1}, end - top);
        if (first > last || input.Width() == 0 || input.Channels() == 0) {
          return FilterResult::Success();
        }
        const BlendRows<T> rows(static_cast<const T*>(input.Data()), static_cast<T*>(output.Data()),
                                inputMask, input.Width(),
                                std::size_t{input.Channels()} * (input.Type().isComplex + 1U),
                                NoDataPixel<T>(inputNoData, input),
                                NoDataPixel<T>(outputNoData, input), map, stopOnNoData);
        const bool whole =
            ForEachPlan(cutline.get(), tile.get(), left, top, input.Width(), first, last,
                        [&](std::size_t row, RowPlan& plan) { return rows.Apply(row, plan); });
        return whole ? FilterResult::Success() : FilterResult::Failure(NoDataErrorMessage());
      });
}

}  // namespace zarn::processes::filters
