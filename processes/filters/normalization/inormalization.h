// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// The kinds of normalisation.
enum class NormalizationKind : std::int32_t {
  kHotSpot = 0,
  kAdaptive = 1,
  kOrder = 2,
};

/// A filter that a mosaicking pipeline selects by its kind of normalisation.
class INormalization : public IFilter {
 public:
  virtual NormalizationKind Kind() const = 0;
};

}  // namespace zarn::processes::filters
