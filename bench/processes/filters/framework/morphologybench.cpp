// SPDX-License-Identifier: Apache-2.0
#include <omp.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "bench/support/comparison.h"
#include "processes/filters/framework/morphology.h"
#include "processes/filters/framework/structuringkernel.h"

namespace zarn::bench {
namespace {

using processes::filters::KernelShape;

constexpr int kSide = 4096;
constexpr std::uint8_t kInside = 255;

// A mask as segmentation leaves it: smooth patches with ragged outlines, about half of the image.
cv::Mat MakeMask() {
  cv::Mat noise(kSide, kSide, CV_8U);
  cv::RNG random(7);
  random.fill(noise, cv::RNG::UNIFORM, 0, 256);
  cv::Mat smooth;
  cv::blur(noise, smooth, cv::Size(41, 41));
  cv::Mat mask = smooth >= cv::mean(smooth)[0];
  return mask;
}

struct Images {
  cv::Mat input = MakeMask();
  cv::Mat own = cv::Mat(kSide, kSide, CV_8U);
  cv::Mat other = cv::Mat(kSide, kSide, CV_8U);
};

Images& SharedImages() {
  static Images images;
  return images;
}

// The function leaves the pixels alone that do not pass: a caller who has no image to change clears
// one first.
enum class Output { kAsItIs, kCleared };

void Register(int size, KernelShape shape, int threads, Output output = Output::kAsItIs) {
  std::vector<int> offsets;
  processes::filters::SetupKernelSE(static_cast<float>(size), offsets, shape);
  const bool disc = shape == KernelShape::kDisc;
  const cv::Mat kernel =
      cv::getStructuringElement(disc ? cv::MORPH_ELLIPSE : cv::MORPH_RECT, cv::Size(size, size));
  const auto erode = [offsets, output](int teamSize) {
    Images& images = SharedImages();
    cv::setNumThreads(1);  // its idle threads would compete
    omp_set_num_threads(teamSize);
    if (output == Output::kCleared) std::memset(images.own.data, 0, images.own.total());
    processes::filters::MorphErosion(images.input.data, images.own.data, kSide, kSide, kInside,
                                     offsets);
  };
  const std::string name = std::string("erosion ") + (disc ? "disc " : "square ") +
                           std::to_string(size) + (output == Output::kCleared ? " cleared" : "") +
                           " threads " + std::to_string(threads);
  const std::size_t bytes = std::size_t{kSide} * kSide;
  Compare({name, "erode", bytes, [erode, threads] { erode(threads); },
           [kernel, threads] {
             Images& images = SharedImages();
             cv::setNumThreads(threads);
             cv::erode(images.input, images.other, kernel);
           }});
  if (threads > 1) {
    Compare(
        {name, "one thread", bytes, [erode, threads] { erode(threads); }, [erode] { erode(1); }});
  }
}

const bool kRegistered = [] {
  const int all = omp_get_max_threads();
  for (const int size : {3, 5, 9, 15, 31, 101}) {
    Register(size, KernelShape::kSquare, 1);
    if (size <= 31) Register(size, KernelShape::kDisc, 1);
    if (size == 3) {
      Register(size, KernelShape::kSquare, 1, Output::kCleared);
      Register(size, KernelShape::kDisc, 1, Output::kCleared);
    }
    if (size == 15 && all > 1) {
      Register(size, KernelShape::kSquare, all);
      Register(size, KernelShape::kDisc, all);
    }
  }
  return true;
}();

}  // namespace
}  // namespace zarn::bench
