// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/factories/removeblobfactory.h"

#include "processes/filters/neighbourhood/removeblob.h"

namespace zarn::processes::filters {

RemoveBlobFactory::RemoveBlobFactory(int size, double background)
    : kernelSize(size), noDataValue(background) {}

RemoveBlobFactory::RemoveBlobFactory(const RemoveBlobFactory& other) = default;
RemoveBlobFactory& RemoveBlobFactory::operator=(const RemoveBlobFactory& other) = default;
RemoveBlobFactory::~RemoveBlobFactory() = default;

IFilter* RemoveBlobFactory::GetCPUFilter() const {
  return new CPURemoveBlob(kernelSize, noDataValue);
}

}  // namespace zarn::processes::filters
