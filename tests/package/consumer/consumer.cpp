// SPDX-License-Identifier: Apache-2.0
#include <host/gobs/raster.h>
#include <processes/filters/factories/averagefilterfactory.h>

#include <cstdint>
#include <iostream>
#include <memory>
#include <vector>

namespace gobs = zarn::gobs;
namespace filters = zarn::processes::filters;

int main() {
  // A block of 3 x 2 pixels with the margin of one pixel that a 3 x 3 window needs; 0 is no-data.
  std::vector<std::uint8_t> samples = {
      10, 10, 10, 40, 40,  //
      10, 10, 20, 40, 40,  //
      10, 0,  20, 40, 40,  //
      10, 10, 30, 40, 40,  //
  };
  const gobs::BlockFrame frame{.marginX = 1, .marginY = 1};
  const gobs::RasterInfo shape(3, 2, 1, gobs::NativeDataTypeCode::kUInt8, frame);
  const gobs::Raster input(shape, samples.data(), samples.size());  // wrapped, not copied
  gobs::Raster output(gobs::RasterInfo(3, 2, 1, gobs::NativeDataTypeCode::kUInt8));

  const std::unique_ptr<filters::IFilter> filter(filters::AverageFilterFactory(3).GetCPUFilter());
  const std::vector<double> noData = {0};
  filter->SetNoDataValues(&noData, &noData);
  const filters::FilterResult result = filter->Process(input, output, 0, 0, nullptr);
  if (!result.Ok()) {
    std::cerr << result.message << '\n';
    return 1;
  }
  const auto* means = static_cast<const std::uint8_t*>(output.Data());
  for (int y = 0; y < 2; ++y, means += 3) {
    std::cout << int{means[0]} << ' ' << int{means[1]} << ' ' << int{means[2]} << '\n';
  }
}
