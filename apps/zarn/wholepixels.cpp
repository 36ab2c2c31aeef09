// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/wholepixels.h"

#include <algorithm>

#include "apps/zarn/errors.h"
#include "processes/filters/factories/directcopyrsfactory.h"

namespace zarn::app {

WholePixels::WholePixels(const RasterSource& source, int columns, int rows)
    : image_{0, 0, source.Width(), source.Height()},
      columns_(columns),
      rows_(rows),
      filter_(processes::filters::DirectCopyRSFactory(columns, rows).GetCPUFilter()) {}

Window WholePixels::SourceOf(const Window& part) const {
  const std::int64_t left = std::max<std::int64_t>(part.x + columns_, 0);
  const std::int64_t top = std::max<std::int64_t>(part.y + rows_, 0);
  const std::int64_t right = std::min(part.x + part.width + columns_, image_.width);
  const std::int64_t bottom = std::min(part.y + part.height + rows_, image_.height);
  if (left >= right || top >= bottom) return {};
  return {left, top, right - left, bottom - top};
}

void WholePixels::Move(const gobs::Raster& source, const std::uint8_t* mask,
                       const std::vector<double>& fill, gobs::Raster& output,
                       std::uint8_t* covered) {
  filter_->SetNoDataValues(nullptr, &fill);
  const auto result = filter_->Process(source, output, 0, 0, nullptr);
  if (!result.Ok()) throw RunError("cannot shift: " + result.message);
  const std::int64_t left = std::int64_t{source.OriginX()} - columns_ - output.OriginX();
  const std::int64_t top = std::int64_t{source.OriginY()} - rows_ - output.OriginY();
  const std::int64_t first = std::clamp<std::int64_t>(left, 0, output.Width());
  const std::int64_t end = std::clamp<std::int64_t>(left + source.Width(), first, output.Width());
  for (std::int64_t row = 0; row < output.Height(); ++row, covered += output.Width()) {
    std::fill_n(covered, output.Width(), std::uint8_t{0});
    if (row < top || row >= top + source.Height()) continue;
    if (mask == nullptr) {
      std::fill(covered + first, covered + end, std::uint8_t{1});
      continue;
    }
    const std::uint8_t* const valid = mask + (row - top) * source.Width() - left;
    std::transform(valid + first, valid + end, covered + first,
                   [](std::uint8_t flag) { return static_cast<std::uint8_t>(flag != 0); });
  }
}

}  // namespace zarn::app
