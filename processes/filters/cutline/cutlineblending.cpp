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

// Rows that share one look-up of their edges. Neighbouring slabs go to different threads, because
// the work lies where the polygon is.
constexpr std::int64_t kSlabRows = 32;
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

// One thread's view of the polygons: what becomes of each row of its slabs.
class RowPlanner {
 public:
  RowPlanner(const PolygonRowIndex* cutline, const PolygonRowIndex* tile, std::int64_t left,
             std::size_t width, std::int64_t firstRow, std::int64_t lastRow) {
    plan.copied.resize(WordsFor(width));
    plan.blended.resize(WordsFor(width));
    SetFirst(plan.copied, width);
    if (cutline != nullptr) {
      const std::size_t most = MostEdges(*cutline, firstRow, lastRow, kSlabRows);
      cutline_ = std::make_unique<InsideRows>(*cutline, left, width, most);
      if (cutline->Blend() > 0) {
        band_ = std::make_unique<DistanceRows>(*cutline, left, width, most);
      }
    }
    if (tile != nullptr) {
      const std::size_t most = MostEdges(*tile, firstRow, lastRow, kSlabRows);
      tile_ = std::make_unique<InsideRows>(*tile, left, width, most);
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
  const std::int64_t slabs = (rows + kSlabRows - 1) / kSlabRows;
  const bool parallel = rows >= kSerialBelow && parallel::MayShareOut();
  const std::int64_t bands = parallel ? parallel::BandCount(slabs) : 1;
  std::vector<std::unique_ptr<RowPlanner>> planners;
  for (std::int64_t band = 0; band < bands; ++band) {
    planners.push_back(
        std::make_unique<RowPlanner>(cutline, tile, left, width, top + first, top + last));
  }
  std::atomic<bool> aborted = false;
  parallel::ForEachRowBand(bands, bands, [&](std::ptrdiff_t band, std::ptrdiff_t, std::ptrdiff_t) {
    RowPlanner& planner = *planners[static_cast<std::size_t>(band)];
    for (std::int64_t slab = band; slab < slabs; slab += bands) {
      const std::int64_t begin = first + slab * kSlabRows;
      const std::int64_t end = std::min(last + 1, begin + kSlabRows);
      planner.Prepare(top + begin, top + end - 1);
      for (std::int64_t row = begin; row < end; ++row) {
        if (aborted.load(std::memory_order_relaxed)) return;
        planner.Plan(top + row);
        if (!apply(static_cast<std::size_t>(row), planner.plan)) {
          aborted.store(true, std::memory_order_relaxed);
        }
      }
    }
  });
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
