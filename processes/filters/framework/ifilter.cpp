// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/ifilter.h"

namespace zarn::processes::filters {
namespace {

// Keeps the storage of `list`; safe when `values` points to the list itself.
void Replace(std::vector<double>& list, const std::vector<double>* values) {
  if (values == &list) return;
  list.clear();
  if (values != nullptr) list.insert(list.end(), values->begin(), values->end());
}

}  // namespace

IFilter::~IFilter() = default;

void IFilter::SetNoDataValues(const std::vector<double>* inputValues,
                              const std::vector<double>* outputValues) {
  Replace(inputNoData, inputValues);
  Replace(outputNoData, outputValues);
}

}  // namespace zarn::processes::filters
