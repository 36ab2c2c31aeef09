// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/tilerunner.h"

#include <cpl_conv.h>
#include <gdal.h>

#include <algorithm>
#include <array>
#include <limits>
#include <map>
#include <memory>
#include <utility>

#include "apps/zarn/carryover.h"
#include "apps/zarn/mosaic/scenefeed.h"
#include "apps/zarn/pipeline.h"
#include "apps/zarn/streamer.h"
#include "host/sys/openmp.h"

namespace zarn::app {
namespace {

// Keeps the rows of blocks of all scenes along a row of tiles, and what is being written.
constexpr GIntBig kBlockCache = GIntBig{256} << 20;

// A process may have about 1000 files open, and a scene may consist of some.
constexpr std::size_t kMostOpen = 128;

/// A scene in a tile, or a tile that no scene touches.
struct Job {
  std::size_t tile;
  std::size_t scene;
  Window rows;  ///< of the tile, in its full width; of no size without a scene
  bool first;   ///< of its tile
  bool last;
};

std::vector<Job> JobsOf(const MosaicPlan& plan, const std::vector<TilePlan>& tiles) {
  std::vector<Job> jobs;
  for (std::size_t i = 0; i < tiles.size(); ++i) {
    const Window& tile = tiles[i].window;
    const std::size_t count = tiles[i].scenes.size();
    if (count == 0) jobs.push_back({i, 0, {}, true, true});
    for (std::size_t k = 0; k < count; ++k) {
      const Window& reach = plan.scenes[tiles[i].scenes[k]].reach;
      const std::int64_t top = std::max(tile.y, reach.y);
      const std::int64_t bottom = std::min(tile.y + tile.height, reach.y + reach.height);
      jobs.push_back(
          {i, tiles[i].scenes[k], {tile.x, top, tile.width, bottom - top}, k == 0, k + 1 == count});
    }
  }
  return jobs;
}

/// The scenes that are open.
class OpenScenes {
 public:
  OpenScenes(const MosaicPlan& plan, std::int64_t mostSourcePixels)
      : plan_(plan),
        request_{.grid = plan.grid,
                 .resampling = plan.resampling,
                 .threshold = plan.threshold,
                 .filter = plan.filter,
                 .mostSourcePixels = mostSourcePixels} {}

  std::shared_ptr<SceneFeed> At(std::size_t scene) {
    if (!feeds_.contains(scene) && feeds_.size() == kMostOpen) CloseLeastRecent();
    Feed& feed = feeds_[scene];
    feed.used = ++uses_;
    if (!feed.scene) feed.scene = std::make_shared<SceneFeed>(plan_.scenes[scene], request_);
    return feed.scene;
  }

  /// Closes those that end above a row; work that is under way keeps them.
  void CloseAbove(std::int64_t row) {
    std::erase_if(feeds_, [&](const auto& entry) {
      const Window& reach = plan_.scenes[entry.first].reach;
      return reach.y + reach.height <= row;
    });
  }

 private:
  struct Feed {
    std::shared_ptr<SceneFeed> scene;
    std::size_t used = 0;
  };

  void CloseLeastRecent() {
    feeds_.erase(std::min_element(feeds_.begin(), feeds_.end(), [](const auto& a, const auto& b) {
      return a.second.used < b.second.used;
    }));
  }

  const MosaicPlan& plan_;
  FeedRequest request_;
  std::map<std::size_t, Feed> feeds_;
  std::size_t uses_ = 0;
};

struct Slot {
  GridMover::Slot pixels;
  std::shared_ptr<SceneFeed> feed;
};

}  // namespace

std::int64_t MostSourcePixels(std::size_t pixelBytes, const WorkOptions& work) {
  // A pixel is held before and after it is worked on, with its validity.
  const auto bytes = static_cast<double>(2 * pixelBytes + 2);
  const double memory = static_cast<double>(work.memory) * (1 << 20) / kStreamSlots;
  // What a block can hold at most bounds it too.
  return static_cast<std::int64_t>(
      std::min<double>(memory, std::numeric_limits<std::uint32_t>::max()) / bytes);
}

void RunTiles(const MosaicPlan& plan, const RasterSource& like, const std::vector<TilePlan>& tiles,
              const WorkOptions& work, const TileSink& sink, nspio::Counter& progress) {
  if (CPLGetConfigOption("GDAL_CACHEMAX", nullptr) == nullptr) GDALSetCacheMax64(kBlockCache);
  const std::vector<Job> jobs = JobsOf(plan, tiles);
  const std::size_t bands = like.Channels().size() + like.Alphas().size();
  OpenScenes scenes(plan, MostSourcePixels(bands * like.Type().Bytes(), work));
  TileComposer composer(plan, like, NeedsMask(like, plan.noData));
  std::array<Slot, kStreamSlots> slots;
  // Three jobs at a time belong to three tiles at most.
  std::array<TileBuffers, kStreamSlots> buffers;
  const Stage read = [&](std::size_t index, std::size_t number) {
    const Job& job = jobs[index];
    Slot& slot = slots[number];
    slot.feed.reset();
    if (job.first) scenes.CloseAbove(tiles[job.tile].window.y);
    if (tiles[job.tile].scenes.empty()) return;
    slot.feed = scenes.At(job.scene);
    slot.feed->Read(job.rows, slot.pixels);
  };
  const Stage paste = [&](std::size_t index, std::size_t number) {
    const Job& job = jobs[index];
    Slot& slot = slots[number];
    TileBuffers& tile = buffers[job.tile % kStreamSlots];
    if (job.first) composer.Begin(tiles[job.tile].window, tile);
    if (slot.feed) {
      slot.feed->Fill(slot.pixels);
      if (slot.pixels.drawsOnSource || plan.stopsOnNoData)
        composer.Paste(job.scene, slot.pixels, tile);
    }
    if (job.last) composer.Finish(tile);
  };
  const Stage write = [&](std::size_t index, std::size_t) {
    const Job& job = jobs[index];
    if (job.last) sink(tiles[job.tile], buffers[job.tile % kStreamSlots]);
    progress.Update(static_cast<double>(index + 1) / static_cast<double>(jobs.size()));
  };
  const int count = sys::OMPThreadsFor(work.threads);
  const sys::OMPThreadCount threads(count);
  if (count == 1) {
    RunOnOneThread(jobs.size(), kStreamSlots, {read, paste, write});
  } else {
    RunPipeline(jobs.size(), kStreamSlots, {read, paste, write}, 1);
  }
}

}  // namespace zarn::app
