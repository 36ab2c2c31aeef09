// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/neighborhoodcbfactory.h"

#include "host/core/exception.h"
#include "processes/filters/colorbalance/neighborhoodcb.h"

namespace zarn::processes::filters {

namespace {

constexpr const char* kSource = "processes/filters/factories/neighborhoodcbfactory";

}  // namespace

NeighborhoodCBFactory::NeighborhoodCBFactory(const std::vector<std::vector<double>>& oCoeff,
                                             const std::vector<double>& oBias)
    : oCoeff_(oCoeff), oBias_(oBias) {
  if (oBias.empty()) throw ParameterException("", "oBias", 8, kSource, __func__, __LINE__);
  if (oCoeff.size() != oBias.size()) {
    throw ParameterException("oCoeff and oBias must have same length.", "oCoeff", 1, kSource,
                             __func__, __LINE__);
  }
  for (const std::vector<double>& row : oCoeff) {
    if (row.size() == oCoeff.front().size()) continue;
    throw ParameterException(
        "There must be same number of coefficients for all channels in Neighborhood color "
        "balancing.",
        "oCoeff", 1, kSource, __func__, __LINE__);
  }
}

NeighborhoodCBFactory::NeighborhoodCBFactory(const NeighborhoodCBFactory& other) = default;
NeighborhoodCBFactory& NeighborhoodCBFactory::operator=(const NeighborhoodCBFactory& other) =
    default;
NeighborhoodCBFactory::~NeighborhoodCBFactory() = default;

IFilter* NeighborhoodCBFactory::GetCPUFilter() const {
  return new CPUNeighborhoodCB(oCoeff_, oBias_);
}

}  // namespace zarn::processes::filters
