// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <cstdint>
#include <cstdlib>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "bench/processes/filters/neighbourhood/windowblocks.h"
#include "bench/support/comparison.h"
#include "processes/filters/factories/medianfilterfactory.h"
#include "processes/filters/factories/noisefilterfactory.h"
#include "processes/filters/factories/removeblobfactory.h"

namespace zarn::bench {
namespace {

using gobs::NativeDataTypeCode;

struct Type {
  NativeDataTypeCode code;
  int cvDepth;
  const char* name;
};
constexpr Type kUInt8{NativeDataTypeCode::kUInt8, CV_8U, "u8"};
constexpr Type kUInt16{NativeDataTypeCode::kUInt16, CV_16U, "u16"};
constexpr Type kFloat32{NativeDataTypeCode::kFloat32, CV_32F, "f32"};

// What OpenCV does in place of a filter: from the pixels of a block inside its margins to a new
// image. It has no notion of holes.
using Peer = std::function<void(const cv::Mat& source, cv::Mat& target, cv::Mat& second, int size)>;

struct Family {
  const char* name;
  const char* peerName;
  std::unique_ptr<processes::filters::IFilter> (*make)(int size);
  Peer peer;
};

template <class Factory>
std::unique_ptr<processes::filters::IFilter> Make(int size) {
  return std::unique_ptr<processes::filters::IFilter>(Factory(size, 0).GetCPUFilter());
}

const Family kMedian{"median", "medianBlur", Make<processes::filters::MedianFilterFactory>,
                     [](const cv::Mat& source, cv::Mat& target, cv::Mat&, int size) {
                       cv::medianBlur(source, target, size);
                     }};
// The moments that the decision needs, without the decision.
const Family kNoise{"noise", "boxFilter + sqrBoxFilter",
                    Make<processes::filters::NoiseFilterFactory>,
                    [](const cv::Mat& source, cv::Mat& target, cv::Mat& second, int size) {
                      cv::boxFilter(source, target, CV_32F, cv::Size(size, size));
                      cv::sqrBoxFilter(source, second, CV_32F, cv::Size(size, size));
                    }};
// The opening alone, of bytes.
const Family kBlobs{"blobs", "morphologyEx OPEN", Make<processes::filters::RemoveBlobFactory>,
                    [](const cv::Mat& source, cv::Mat& target, cv::Mat&, int size) {
                      cv::morphologyEx(source, target, cv::MORPH_OPEN,
                                       cv::Mat::ones(size, size, CV_8U));
                    }};

void Register(const Family& family, const Type& type, std::uint32_t channels, std::uint32_t side,
              int size, Content content, int threads) {
  struct Fixture {
    gobs::Raster input;
    gobs::Raster output;
    std::unique_ptr<processes::filters::IFilter> filter;
    cv::Mat source;
    cv::Mat target;
    cv::Mat second;
  };
  // Built on first use, so that selecting a few cases does not allocate all of them.
  const auto fixture = [=, cached = std::make_shared<std::unique_ptr<Fixture>>()]() -> Fixture& {
    if (*cached) return **cached;
    const auto half = static_cast<std::uint32_t>(size / 2);
    auto f = std::make_unique<Fixture>(
        Fixture{gobs::Raster(gobs::RasterInfo(side, side, channels, type.code,
                                              {.marginX = half, .marginY = half})),
                gobs::Raster(gobs::RasterInfo(side, side, channels, type.code)),
                nullptr,
                {},
                {},
                {}});
    FillBlock(f->input, content);
    f->filter = family.make(size);
    const std::vector<double> inputNoData(channels, kNoData);
    const std::vector<double> outputNoData(channels, 0);
    f->filter->SetNoDataValues(&inputNoData, &outputNoData);
    const cv::Mat full(static_cast<int>(f->input.FullHeight()),
                       static_cast<int>(f->input.FullWidth()),
                       CV_MAKETYPE(type.cvDepth, static_cast<int>(channels)), f->input.Data());
    f->source = full(cv::Rect(static_cast<int>(half), static_cast<int>(half),
                              static_cast<int>(side), static_cast<int>(side)));
    *cached = std::move(f);
    return **cached;
  };
  const std::string name =
      std::string(family.name) + " " + type.name + "x" + std::to_string(channels) + " " +
      std::to_string(side) + " size " + std::to_string(size) +
      (content == Content::kClean ? " clean" : " holes") + " threads " + std::to_string(threads);
  const std::size_t sampleBytes = gobs::NativeDataType(type.code).Description().BytesPerSample();
  const auto run = [fixture](int count) {
    Fixture& f = fixture();
    cv::setNumThreads(1);  // its idle threads would compete
    omp_set_num_threads(count);
    if (!f.filter->Process(f.input, f.output, 0, 0, nullptr).Ok()) std::abort();
  };
  Compare({name, family.peerName, std::size_t{side} * side * channels * sampleBytes,
           [run, threads] { run(threads); },
           [fixture, &family, size, threads] {
             Fixture& f = fixture();
             cv::setNumThreads(threads);
             family.peer(f.source, f.target, f.second, size);
           }});
}

const bool kRegistered = [] {
  struct Row {
    const Family& family;
    std::vector<Type> types;
    std::vector<int> sizes;
  };
  const Row kRows[] = {
      {kMedian, {kUInt8, kUInt16, kFloat32}, {3, 5}},
      {kMedian, {kUInt8}, {7}},
      {kNoise, {kUInt8, kUInt16}, {3, 5, 7}},
      {kBlobs, {kUInt8}, {3, 15}},
  };
  const int all = omp_get_max_threads();
  for (const Row& row : kRows) {
    for (const Type& type : row.types) {
      for (const std::uint32_t channels : {1U, 3U}) {
        for (const std::uint32_t side : {1024U, 4096U}) {
          for (const int size : row.sizes) {
            for (const Content content : {Content::kClean, Content::kHoles}) {
              Register(row.family, type, channels, side, size, content, 1);
              if (side == 4096 && all > 1) {
                Register(row.family, type, channels, side, size, content, all);
              }
            }
          }
        }
      }
    }
  }
  return true;
}();

}  // namespace
}  // namespace zarn::bench
