// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "bench/processes/filters/neighbourhood/windowblocks.h"
#include "bench/support/comparison.h"
#include "host/gobs/raster.h"
#include "processes/filters/factories/averagefilterfactory.h"

namespace zarn::bench {
namespace {

using gobs::NativeDataTypeCode;

struct Case {
  NativeDataTypeCode type;
  int cvDepth;
  const char* typeName;
  std::uint32_t channels;
  std::uint32_t side;
  int size;
  Content content;
  int threads;
};

void Register(const Case& c) {
  struct Fixture {
    gobs::Raster input;
    gobs::Raster output;
    std::unique_ptr<processes::filters::IFilter> filter;
    cv::Mat full;
    cv::Mat source;
    cv::Mat target;
  };
  // Built on first use, so that selecting a few cases does not allocate all of them.
  const auto fixture = [c, cached = std::make_shared<std::unique_ptr<Fixture>>()]() -> Fixture& {
    if (*cached) return **cached;
    const auto half = static_cast<std::uint32_t>(c.size / 2);
    auto f = std::make_unique<Fixture>(
        Fixture{gobs::Raster(gobs::RasterInfo(c.side, c.side, c.channels, c.type,
                                              {.marginX = half, .marginY = half})),
                gobs::Raster(gobs::RasterInfo(c.side, c.side, c.channels, c.type)),
                nullptr,
                {},
                {},
                {}});
    FillBlock(f->input, c.content);
    f->filter.reset(processes::filters::AverageFilterFactory(c.size, 0).GetCPUFilter());
    const std::vector<double> inputNoData(c.channels, kNoData);
    const std::vector<double> outputNoData(c.channels, 0);
    f->filter->SetNoDataValues(&inputNoData, &outputNoData);
    const int type = CV_MAKETYPE(c.cvDepth, static_cast<int>(c.channels));
    f->full = cv::Mat(static_cast<int>(f->input.FullHeight()),
                      static_cast<int>(f->input.FullWidth()), type, f->input.Data());
    const int margin = static_cast<int>(half);
    const int side = static_cast<int>(c.side);
    f->source = f->full(cv::Rect(margin, margin, side, side));
    f->target = cv::Mat(side, side, type);
    *cached = std::move(f);
    return **cached;
  };
  const std::string name = std::string("average ") + c.typeName + "x" + std::to_string(c.channels) +
                           " " + std::to_string(c.side) + " size " + std::to_string(c.size) +
                           (c.content == Content::kClean ? " clean" : " holes") + " threads " +
                           std::to_string(c.threads);
  const std::size_t sampleBytes = gobs::NativeDataType(c.type).Description().BytesPerSample();
  const std::size_t bytes = std::size_t{c.side} * c.side * c.channels * sampleBytes;
  const auto run = [fixture](int threads) {
    Fixture& f = fixture();
    cv::setNumThreads(1);  // its idle threads would compete
    omp_set_num_threads(threads);
    if (!f.filter->Process(f.input, f.output, 0, 0, nullptr).Ok()) std::abort();
  };
  Compare({name, "boxFilter", bytes, [run, c] { run(c.threads); },
           [fixture, c] {
             Fixture& f = fixture();
             cv::setNumThreads(c.threads);
             cv::boxFilter(f.source, f.target, -1, cv::Size(c.size, c.size));
           }});
  if (c.threads > 1) {
    Compare({name, "one thread", bytes, [run, c] { run(c.threads); }, [run] { run(1); }});
  }
}

const bool kRegistered = [] {
  struct Type {
    NativeDataTypeCode code;
    int cvDepth;
    const char* name;
  };
  const int all = omp_get_max_threads();
  for (const Type& type : {Type{NativeDataTypeCode::kUInt8, CV_8U, "u8"},
                           Type{NativeDataTypeCode::kUInt16, CV_16U, "u16"},
                           Type{NativeDataTypeCode::kFloat32, CV_32F, "f32"}}) {
    for (const std::uint32_t channels : {1U, 3U}) {
      for (const std::uint32_t side : {1024U, 4096U}) {
        for (const int size : {3, 5, 7, 15, 31}) {
          for (const Content content : {Content::kClean, Content::kHoles}) {
            Register({type.code, type.cvDepth, type.name, channels, side, size, content, 1});
            if (size == 5 && all > 1) {
              Register({type.code, type.cvDepth, type.name, channels, side, size, content, all});
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
