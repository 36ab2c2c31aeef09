// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/errors.h"

namespace zarn::app {

/// One entry for each channel of `source`: `list` as it is, or its only entry for all of them.
/// Throws `UsageError` for any other length, calling the list `name` and its entries `entries`.
template <typename T>
std::vector<T> OnePerChannel(const RasterSource& source, const std::string& name,
                             const std::string& entries, const std::vector<T>& list) {
  const std::size_t channels = source.Channels().size();
  if (list.size() == channels) return list;
  if (list.size() == 1) return std::vector<T>(channels, list.front());
  throw UsageError(name + " has " + std::to_string(list.size()) + " " + entries + ", but " +
                   source.Name() + " has " + std::to_string(channels) +
                   (channels == 1 ? " band" : " bands") +
                   (source.Alphas().empty() ? "" : " besides alpha") +
                   "; give one for all bands or one for each");
}

}  // namespace zarn::app
