// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <random>
#include <string>

#include "apps/zarn/enhancement/curvefield.h"
#include "bench/support/comparison.h"
#include "host/datasources/irasterreader.h"
#include "host/gobs/raster.h"
#include "processes/filters/enhancement/glut.h"

namespace zarn::bench {
namespace {

constexpr std::uint32_t kSide = 4096;

// An image in memory, all of it valid.
class BlockReader : public datasources::IRasterReader {
 public:
  explicit BlockReader(const gobs::Raster& image) : image_(image) {}
  std::uint32_t Width() const override { return image_.Width(); }
  std::uint32_t Height() const override { return image_.Height(); }
  std::uint32_t Channels() const override { return image_.Channels(); }
  gobs::NativeDataTypeCode DataTypeCode() const override { return gobs::GetDataTypeCode(image_); }
  datasources::AuxiliaryData Auxiliary() const override { return {}; }
  void Read(gobs::Raster& block, std::uint8_t* valid) override {
    const std::size_t pixel = block.DescribedSize() / (std::size_t{block.Width()} * block.Height());
    for (std::size_t y = 0; y < block.Height(); ++y) {
      const auto* const row = static_cast<const std::uint8_t*>(image_.Data()) +
                              ((block.OriginY() + y) * Width() + block.OriginX()) * pixel;
      std::copy_n(row, block.Width() * pixel,
                  static_cast<std::uint8_t*>(block.Data()) + y * block.Width() * pixel);
    }
    std::fill_n(valid, std::size_t{block.Width()} * block.Height(), std::uint8_t{1});
  }

 private:
  const gobs::Raster& image_;
};

template <typename T>
struct Scene {
  Scene(gobs::NativeDataTypeCode code, int tile)
      : input(gobs::RasterInfo(kSide, kSide, 1, code)),
        output(gobs::RasterInfo(kSide, kSide, 1, code)),
        clahe(cv::createCLAHE(2.0,
                              {static_cast<int>(kSide) / tile, static_cast<int>(kSide) / tile})) {
    std::mt19937 random(11);
    auto* const samples = static_cast<T*>(input.Data());
    const unsigned scale = sizeof(T) == 1 ? 1 : 200;
    for (std::size_t i = 0; i < std::size_t{kSide} * kSide; ++i) {
      samples[i] = static_cast<T>((20 + i / kSide / 40 + random() % 60) * scale);
    }
    const std::unique_ptr<processes::filters::IGeoLUTMatrix> matrix(
        processes::filters::GLUT::GetGLUTMatrix({.tileWidth = tile,
                                                 .tileHeight = tile,
                                                 .gridRows = static_cast<int>(kSide) / tile,
                                                 .gridColumns = static_cast<int>(kSide) / tile,
                                                 .channelCount = 1,
                                                 .power = 0.8F,
                                                 .pixelDepth = 8 * static_cast<int>(sizeof(T))}));
    BlockReader reader(input);
    matrix->LoadFromImage(reader);
    matrix->InterpolateCells(true);
    field = std::make_unique<app::CurveField<T>>(*matrix, app::CellBlending::kBilinear);
  }

  gobs::Raster input;
  gobs::Raster output;
  cv::Ptr<cv::CLAHE> clahe;
  std::unique_ptr<app::CurveField<T>> field;
};

template <typename T>
void Register(const std::string& type, gobs::NativeDataTypeCode code, int depth, int tile) {
  const auto cached = std::make_shared<std::unique_ptr<Scene<T>>>();
  const auto scene = [=]() -> Scene<T>& {
    if (!*cached) *cached = std::make_unique<Scene<T>>(code, tile);
    return **cached;
  };
  Compare({"enhance " + type + "x1 tile " + std::to_string(tile) + " threads 1", "CLAHE",
           std::size_t{kSide} * kSide * sizeof(T),
           [=] {
             omp_set_num_threads(1);
             scene().field->Apply(scene().input, nullptr, nullptr, scene().output);
           },
           [=] {
             cv::setNumThreads(1);
             const cv::Mat from(kSide, kSide, CV_MAKETYPE(depth, 1), scene().input.Data());
             cv::Mat to(kSide, kSide, CV_MAKETYPE(depth, 1), scene().output.Data());
             scene().clahe->apply(from, to);
           }});
}

const bool kRegistered = [] {
  for (const int tile : {64, 128}) {
    Register<std::uint8_t>("u8", gobs::NativeDataTypeCode::kUInt8, CV_8U, tile);
    Register<std::uint16_t>("u16", gobs::NativeDataTypeCode::kUInt16, CV_16U, tile);
  }
  return true;
}();

}  // namespace
}  // namespace zarn::bench
