// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <memory>
#include <numbers>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <random>
#include <string>
#include <vector>

#include "bench/support/comparison.h"
#include "host/gobs/raster.h"
#include "processes/filters/factories/cutlineblendingfactory.h"

namespace zarn::bench {
namespace {

using processes::filters::CutlineBlendingFactory;
using processes::filters::IFilter;
using processes::filters::PolygonParam;

constexpr int kSide = 4096;
constexpr int kChannels = 3;
constexpr std::size_t kBytes = std::size_t{kSide} * kSide * kChannels;

using Points = std::vector<cv::Point2d>;

// Five round bulges, 45 % of the block. Vertices are off the curve by up to `jitter` pixels.
Points Star(int count, double jitter) {
  std::mt19937 random(11);
  Points points;
  for (int i = 0; i < count; ++i) {
    const double angle = 2 * std::numbers::pi * i / count;
    const double off = jitter * (static_cast<double>(random() % 2001) / 1000 - 1);
    const double radius = 1535 * (1 + 0.2 * std::cos(5 * angle)) + off;
    points.emplace_back(2048.3 + radius * std::cos(angle), 2048.7 + radius * std::sin(angle));
  }
  return points;
}

// All vertices but three along one row.
Points AlongOneRow(int count) {
  std::mt19937 random(12);
  Points points;
  for (int i = 0; i < count; ++i) {
    points.emplace_back(100 + 3900.0 * i / count,
                        2000.5 + 0.4 * static_cast<double>(random() % 1000) / 1000);
  }
  points.emplace_back(4000, 4000);
  points.emplace_back(100, 4000);
  return points;
}

// As high as the block.
Points Comb(int teeth) {
  Points points;
  for (int i = 0; i < 2 * teeth; ++i) {
    points.emplace_back(10 + 4000.0 * i / (2 * teeth), i % 2 == 0 ? 10.2 : 4000.7);
  }
  points.emplace_back(4010, 4090);
  points.emplace_back(10, 4090);
  return points;
}

PolygonParam Closed(const Points& points) {
  const std::size_t count = points.size() + 1;
  auto* const vertices = new double[2 * count];
  for (std::size_t i = 0; i < count; ++i) {
    vertices[2 * i] = points[i % points.size()].x;
    vertices[2 * i + 1] = points[i % points.size()].y;
  }
  return {.vertices = vertices, .vertexCount = static_cast<std::uint32_t>(count)};
}

struct Blocks {
  Blocks() : source(Info()), mosaic(Info()) {
    std::mt19937 random(7);
    for (gobs::Raster* const block : {&source, &mosaic}) {
      auto* const bytes = static_cast<std::uint8_t*>(block->Data());
      for (std::size_t i = 0; i < kBytes; ++i) bytes[i] = static_cast<std::uint8_t>(random());
    }
  }
  static gobs::RasterInfo Info() {
    return {kSide, kSide, kChannels, gobs::NativeDataTypeCode::kUInt8};
  }
  static Blocks& Shared() {
    static Blocks blocks;
    return blocks;
  }
  static cv::Mat Whole(gobs::Raster& block) { return cv::Mat(kSide, kSide, CV_8UC3, block.Data()); }

  gobs::Raster source;
  gobs::Raster mosaic;
};

// The same with OpenCV: a filled polygon, distances to its border on both sides, a mix.
void PasteWithOpenCV(const Points& points, unsigned blend) {
  constexpr int kShift = 8;
  std::vector<cv::Point> fixed;
  for (const cv::Point2d& p : points) {
    fixed.emplace_back(static_cast<int>((p.x - 0.5) * (1 << kShift)),
                       static_cast<int>((p.y - 0.5) * (1 << kShift)));
  }
  cv::Mat inside = cv::Mat::zeros(kSide, kSide, CV_8U);
  cv::fillPoly(inside, std::vector<std::vector<cv::Point>>{fixed}, 255, cv::LINE_8, kShift);
  cv::Mat source = Blocks::Whole(Blocks::Shared().source);
  cv::Mat mosaic = Blocks::Whole(Blocks::Shared().mosaic);
  if (blend == 0) {
    source.copyTo(mosaic, inside);
    return;
  }
  cv::Mat within;
  cv::Mat without;
  cv::distanceTransform(inside, within, cv::DIST_L2, cv::DIST_MASK_PRECISE);
  cv::distanceTransform(~inside, without, cv::DIST_L2, cv::DIST_MASK_PRECISE);
  for (int y = 0; y < kSide; ++y) {
    const auto* const s = source.ptr<std::uint8_t>(y);
    auto* const t = mosaic.ptr<std::uint8_t>(y);
    for (int x = 0; x < kSide; ++x) {
      const float w =
          (within.at<float>(y, x) - without.at<float>(y, x)) / static_cast<float>(blend);
      if (w <= -1) continue;
      const float a = std::min(0.5F * w + 0.5F, 1.0F);
      for (int c = 0; c < kChannels; ++c) {
        const int i = x * kChannels + c;
        t[i] = static_cast<std::uint8_t>(static_cast<float>(s[i]) * a +
                                         static_cast<float>(t[i]) * (1 - a));
      }
    }
  }
}

void Paste(IFilter& filter, int threads) {
  omp_set_num_threads(threads);
  Blocks& blocks = Blocks::Shared();
  if (!filter.Process(blocks.source, blocks.mosaic, 0, 0, nullptr).Ok()) std::abort();
}

// Many vertices beside few, one thread.
void RegisterGrowth(int few, int many, unsigned blend) {
  const auto filterOf = [=](int count) {
    return [=, filter = std::make_shared<std::unique_ptr<IFilter>>()] {
      if (!*filter) {
        filter->reset(CutlineBlendingFactory(Closed(Star(count, 0.25)), blend).GetCPUFilter());
      }
      Paste(**filter, 1);
    };
  };
  Compare({"cutline growth " + std::to_string(few) + " to " + std::to_string(many) + " feather " +
               std::to_string(blend),
           std::to_string(few) + " vertices", kBytes, filterOf(many), filterOf(few)});
}

void Register(const std::string& name, const std::function<Points()>& shape, unsigned blend) {
  static const int all = omp_get_max_threads();
  const auto points = std::make_shared<Points>();
  const auto filter = std::make_shared<std::unique_ptr<IFilter>>();
  const auto run = [=](int threads) {
    if (!*filter) {
      *points = shape();
      filter->reset(CutlineBlendingFactory(Closed(*points), blend).GetCPUFilter());
    }
    Paste(**filter, threads);
  };
  const std::string label = "cutline " + name + " feather " + std::to_string(blend);
  Compare({label + " threads 1", "OpenCV", kBytes, [=] { run(1); },
           [=] {
             cv::setNumThreads(1);
             PasteWithOpenCV(*points, blend);
           }});
  if (all > 1) {
    Compare({label + " threads " + std::to_string(all), "one thread", kBytes, [=] { run(all); },
             [=] { run(1); }});
  }
}

const bool kRegistered = [] {
  for (const unsigned blend : {0U, 10U, 50U}) {
    for (const int count : {10, 100, 1000, 20000, 50000}) {
      Register(
          "star " + std::to_string(count), [=] { return Star(count, 0.25); }, blend);
    }
    Register(
        "spikes 20000", [] { return Star(20000, 150); }, blend);
    Register(
        "row 20000", [] { return AlongOneRow(20000); }, blend);
    Register(
        "comb 2000", [] { return Comb(2000); }, blend);
  }
  RegisterGrowth(100, 50000, 10);
  // Making the factory and its filter.
  Compare({"cutline index 20000", "copy into new memory", kBytes,
           [] {
             const CutlineBlendingFactory factory(Closed(Star(20000, 0.25)), 10);
             const std::unique_ptr<IFilter> filter(factory.GetCPUFilter());
           },
           [] {
             const Blocks& blocks = Blocks::Shared();
             std::vector<std::uint8_t> copy(kBytes);
             std::copy_n(static_cast<const std::uint8_t*>(blocks.source.Data()), kBytes,
                         copy.data());
           }});
  return true;
}();

}  // namespace
}  // namespace zarn::bench
