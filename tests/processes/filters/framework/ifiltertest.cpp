// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <vector>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {
namespace {

class OpenFilter : public IFilter {
 public:
  using IFilter::inputNoData;
  using IFilter::outputNoData;
  FilterResult Process(const gobs::Raster&, gobs::Raster&, std::uint32_t, std::uint32_t,
                       const std::uint8_t*) override {
    return FilterResult::Success();
  }
};

using List = std::vector<double>;

TEST(IFilter, CopiesNoDataValuesAndClearsForNull) {
  OpenFilter filter;
  EXPECT_TRUE(filter.inputNoData.empty());
  EXPECT_TRUE(filter.outputNoData.empty());

  List input = {1, 2, 3};
  const List output = {4.5};
  filter.SetNoDataValues(&input, &output);
  input[0] = 99;
  EXPECT_EQ(filter.inputNoData, (List{1, 2, 3}));
  EXPECT_EQ(filter.outputNoData, (List{4.5}));

  filter.SetNoDataValues(nullptr, &output);
  EXPECT_EQ(filter.inputNoData, List{});
  EXPECT_EQ(filter.outputNoData, (List{4.5}));

  filter.SetNoDataValues(&input, nullptr);
  EXPECT_EQ(filter.inputNoData, (List{99, 2, 3}));
  EXPECT_EQ(filter.outputNoData, List{});

  const List nothing;
  filter.SetNoDataValues(&nothing, &nothing);
  EXPECT_EQ(filter.inputNoData, List{});

  filter.SetNoDataValues(&input, &output);
  filter.SetNoDataValues(nullptr, nullptr);
  EXPECT_EQ(filter.inputNoData, List{});
  EXPECT_EQ(filter.outputNoData, List{});
}

TEST(IFilter, TakesItsOwnListsAndKeepsTheirStorage) {
  OpenFilter filter;
  const List input = {1, 2, 3};
  const List output = {4, 5, 6};
  filter.SetNoDataValues(&input, &output);
  filter.SetNoDataValues(&filter.inputNoData, &filter.outputNoData);
  EXPECT_EQ(filter.inputNoData, input);
  EXPECT_EQ(filter.outputNoData, output);

  const double* const storage = filter.inputNoData.data();
  filter.SetNoDataValues(nullptr, &filter.outputNoData);
  filter.SetNoDataValues(&output, nullptr);
  EXPECT_EQ(filter.inputNoData.data(), storage);
}

}  // namespace
}  // namespace zarn::processes::filters
