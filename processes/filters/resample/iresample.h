// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/utils/resampleinfo.h"
#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {

/// A filter that brings a block onto another pixel grid; a mosaicking pipeline selects it by its
/// method.
class IResample : public IFilter {
 public:
  virtual utils::ResampleMethod GetResampleMethod() const = 0;
};

}  // namespace zarn::processes::filters
