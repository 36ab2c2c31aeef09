// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "apps/zarn/errors.h"
#include "apps/zarn/windows.h"

namespace zarn::app {
namespace {

constexpr std::size_t kMebibyte = 1 << 20;

struct PlanCase {
  const char* name;
  WindowRequest request;
  std::int64_t columns;  ///< expected columns of windows
};

const std::vector<PlanCase> kCases{
    {"one full-width column", {{20000, 20000}, {256, 256}, 2, 1, 1, 3, 256 * kMebibyte, {}}, 1},
    {"still one column when wide",
     {{100000, 100000}, {256, 256}, 2, 1, 1, 3, 256 * kMebibyte, {}},
     1},
    {"columns when too wide", {{100000, 3000}, {256, 256}, 2, 12, 1, 3, 256 * kMebibyte, {}}, 8},
    {"small image", {{5, 3}, {256, 256}, 0, 1, 0, 3, 256 * kMebibyte, {}}, 1},
    {"halo larger than the image", {{70, 30}, {70, 30}, 70, 3, 1, 3, 256 * kMebibyte, {}}, 1},
    {"strips", {{4000, 1000}, {4000, 1}, 3, 1, 1, 3, 1 * kMebibyte, {}}, 1},
    {"one block as tall as the image", {{300, 50000}, {300, 50000}, 1, 4, 1, 3, kMebibyte, {}}, 1},
    {"forced", {{100, 60}, {256, 256}, 2, 1, 1, 3, kMebibyte, WindowSize{7, 5}}, 15},
};

TEST(WindowPlan, CoversTheImageOnceWithinItsMemory) {
  for (const PlanCase& c : kCases) {
    SCOPED_TRACE(c.name);
    const WindowRequest& request = c.request;
    const WindowPlan plan(request);
    std::int64_t x = 0;
    std::int64_t y = 0;
    std::int64_t columns = 0;
    for (std::size_t i = 0; i < plan.Count(); ++i) {
      const Window window = plan.At(i);
      if (!plan.ContinuesColumn(i)) {
        ASSERT_EQ(y, i == 0 ? 0 : request.image.height);
        x = i == 0 ? 0 : x;
        y = 0;
        ++columns;
      }
      ASSERT_EQ(window.x, x);
      ASSERT_EQ(window.y, y);
      ASSERT_GT(window.width, 0);
      ASSERT_GT(window.height, 0);
      y += window.height;
      if (y == request.image.height) x += window.width;
    }
    EXPECT_EQ(x, request.image.width);
    EXPECT_EQ(columns, c.columns);

    const WindowSize size = plan.Size();
    const auto full = static_cast<std::size_t>((size.width + 2 * request.halo) *
                                               (size.height + 2 * request.halo));
    EXPECT_LE(
        request.slots * (full * (request.sampleBytes + request.sideBytes) +
                         static_cast<std::size_t>(size.width * size.height) * request.sampleBytes),
        request.memory);
    if (request.forced || request.outputBlock.height > 1024) continue;
    // Blocks of the output are written whole.
    EXPECT_TRUE(size.width % request.outputBlock.width == 0 || columns == 1);
    EXPECT_TRUE(size.height % request.outputBlock.height == 0 ||
                size.height == request.image.height);
  }
}

TEST(WindowPlan, WorksThroughALargeHaloInTallWindows) {
  const WindowPlan plan({{20000, 20000}, {256, 256}, 500, 1, 1, 3, 512 * kMebibyte, {}});
  EXPECT_GE(plan.Size().height, 1000) << "most of a block would be margin";
}

TEST(WindowPlan, RefusesWhatCannotFit) {
  const auto messageOf = [](const WindowRequest& request) -> std::string {
    try {
      const WindowPlan plan(request);
    } catch (const RunError& error) {
      return error.what();
    }
    return {};
  };
  EXPECT_NE(
      messageOf({{20000, 20000}, {256, 256}, 20000, 1, 1, 3, 256 * kMebibyte, {}}).find("--memory"),
      std::string::npos);
  // A block has 32 bits for its size, however much memory there is.
  EXPECT_NE(messageOf({{50000, 50000}, {256, 256}, 50000, 1, 1, 3, std::size_t{1} << 50, {}})
                .find("4095 MiB"),
            std::string::npos);
  EXPECT_NE(
      messageOf(
          {{2147483647, 2147483647}, {256, 256}, 2147483647, 8, 1, 3, std::size_t{1} << 62, {}})
          .find("4095 MiB"),
      std::string::npos);
}

}  // namespace
}  // namespace zarn::app
