// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <array>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <random>
#include <string>
#include <vector>

#include "bench/support/comparison.h"
#include "host/gobs/raster.h"
#include "host/utils/affinepostfm.h"
#include "processes/filters/factories/bilinearrsfactory.h"
#include "processes/filters/factories/cubicrsfactory.h"
#include "processes/filters/factories/directcopyrsfactory.h"
#include "processes/filters/factories/nearestrsfactory.h"

namespace zarn::bench {
namespace {

using gobs::NativeDataTypeCode;
using processes::filters::IFilter;

constexpr int kSide = 4096;
constexpr double kAngle = 0.03;  // radians

struct SampleType {
  const char* name;
  NativeDataTypeCode code;
  int depth;
};

/// A rotation about the centre, for both sides.
std::array<double, 6> Rotation() {
  const double c = std::cos(kAngle);
  const double s = std::sin(kAngle);
  constexpr double kCentre = kSide / 2.0;
  return {kCentre - c * kCentre + s * kCentre, c, -s, kCentre - s * kCentre - c * kCentre, s, c};
}

/// OpenCV's maps of the same positions; it counts from the centre of the first pixel.
struct Maps {
  Maps() : x(kSide, kSide, CV_32F), y(kSide, kSide, CV_32F) {
    utils::AffinePosTfm transform(Rotation());
    std::vector<double> px(kSide);
    std::vector<double> py(kSide);
    for (int row = 0; row < kSide; ++row) {
      transform.Transform(0, row, kSide, px.data(), py.data());
      for (int i = 0; i < kSide; ++i) {
        const auto at = static_cast<std::size_t>(i);
        x.at<float>(row, i) = static_cast<float>(px[at] - 0.5);
        y.at<float>(row, i) = static_cast<float>(py[at] - 0.5);
      }
    }
  }
  cv::Mat x;
  cv::Mat y;
};

struct Blocks {
  Blocks(const SampleType& type, int channels)
      : input(gobs::RasterInfo(kSide, kSide, static_cast<std::uint32_t>(channels), type.code)),
        output(gobs::RasterInfo(kSide, kSide, static_cast<std::uint32_t>(channels), type.code)),
        mask(std::size_t{kSide} * kSide, 1),
        cvType(CV_MAKETYPE(type.depth, channels)) {
    cv::Mat samples = In();
    cv::randu(samples, 0, 250);
    std::mt19937 random(7);
    for (std::size_t i = random() % 1000; i < mask.size(); i += random() % 1000) mask[i] = 0;
  }
  cv::Mat In() { return cv::Mat(kSide, kSide, cvType, input.Data()); }
  cv::Mat Out() { return cv::Mat(kSide, kSide, cvType, output.Data()); }

  gobs::Raster input;
  gobs::Raster output;
  std::vector<std::uint8_t> mask;
  int cvType;
};

/// Those of one sample type and number of channels at a time.
Blocks& BlocksOf(const SampleType& type, int channels) {
  static std::unique_ptr<Blocks> current;
  const int cvType = CV_MAKETYPE(type.depth, channels);
  if (!current || current->cvType != cvType) {
    current.reset();
    current = std::make_unique<Blocks>(type, channels);
  }
  return *current;
}

struct Case {
  std::string name;
  const char* peer;
  SampleType type;
  int channels;
  bool masked;
  std::function<IFilter*()> makeFilter;
  std::function<void(Blocks&)> runPeer;
};

void Register(const Case& c) {
  static const int all = omp_get_max_threads();
  const auto blocks = [=]() -> Blocks& { return BlocksOf(c.type, c.channels); };
  const std::shared_ptr<IFilter> filter(c.makeFilter());
  const auto run = [=](int threads) {
    Blocks& b = blocks();
    omp_set_num_threads(threads);
    if (!filter->Process(b.input, b.output, 0, 0, c.masked ? b.mask.data() : nullptr).Ok()) {
      std::abort();
    }
  };
  const std::size_t bytes =
      std::size_t{kSide} * kSide * CV_ELEM_SIZE(CV_MAKETYPE(c.type.depth, c.channels));
  const std::string name =
      c.name + " " + c.type.name + "x" + std::to_string(c.channels) + (c.masked ? " masked" : "");
  Compare({name + " threads 1", c.peer, bytes, [=] { run(1); },
           [=] {
             cv::setNumThreads(1);
             c.runPeer(blocks());
           }});
  if (all > 1 && !c.masked) {
    Compare({name + " threads " + std::to_string(all), "one thread", bytes, [=] { run(all); },
             [=] { run(1); }});
  }
}

template <typename Factory>
IFilter* MakeRotating() {
  return Factory(new utils::AffinePosTfm(Rotation())).GetCPUFilter();
}

void CopyRows(Blocks& blocks, int shift) {
  const std::size_t pixel = CV_ELEM_SIZE(blocks.cvType);
  const auto* const from = static_cast<const std::byte*>(blocks.input.Data());
  auto* const to = static_cast<std::byte*>(blocks.output.Data());
  const auto columns = static_cast<std::size_t>(kSide - shift);
  for (std::size_t row = 0; row < columns; ++row) {
    std::memcpy(
        to + row * kSide * pixel,
        from + ((row + static_cast<std::size_t>(shift)) * kSide + static_cast<std::size_t>(shift)) *
                   pixel,
        columns * pixel);
  }
}

const bool kRegistered = [] {
  using namespace processes::filters;
  const auto maps = std::make_shared<std::unique_ptr<Maps>>();
  const auto remap = [=](int interpolation) {
    return [=](Blocks& b) {
      if (!*maps) *maps = std::make_unique<Maps>();
      cv::Mat out = b.Out();
      cv::remap(b.In(), out, (*maps)->x, (*maps)->y, interpolation, cv::BORDER_CONSTANT);
    };
  };
  for (const SampleType& type : {SampleType{"u8", NativeDataTypeCode::kUInt8, CV_8U},
                                 SampleType{"u16", NativeDataTypeCode::kUInt16, CV_16U},
                                 SampleType{"f32", NativeDataTypeCode::kFloat32, CV_32F}}) {
    for (const int channels : {1, 3}) {
      for (const bool masked : {false, true}) {
        Register({"nearest", "remap nearest", type, channels, masked,
                  MakeRotating<NearestRSFactory>, remap(cv::INTER_NEAREST)});
        Register({"bilinear", "remap linear", type, channels, masked,
                  MakeRotating<BilinearRSFactory>, remap(cv::INTER_LINEAR)});
        Register({"cubic", "remap cubic", type, channels, masked, MakeRotating<CubicRSFactory>,
                  remap(cv::INTER_CUBIC)});
      }
      constexpr int kShift = 5;
      Register({"direct-copy", "memcpy by rows", type, channels, false,
                [] { return DirectCopyRSFactory(kShift, kShift).GetCPUFilter(); },
                [](Blocks& b) { CopyRows(b, kShift); }});
    }
  }
  return true;
}();

}  // namespace
}  // namespace zarn::bench
