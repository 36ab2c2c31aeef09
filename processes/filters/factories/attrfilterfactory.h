// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "processes/filters/factories/iattrfilterfactory.h"
#include "processes/filters/framework/structuringkernel.h"

namespace zarn::processes::filters {

/// Makes the three attribute filters over one kernel. Include attribute/iattributefilter.h to use
/// them.
class ZARN_FILTERS_EXPORT AttrFilterFactory : public IAttrFilterFactory {
 public:
  /// Size and shape of the kernel as `SetupKernelSE` has them; nothing is validated here.
  AttrFilterFactory(int size, KernelShape shape);
  AttrFilterFactory(const AttrFilterFactory& other);
  AttrFilterFactory& operator=(const AttrFilterFactory& other);
  ~AttrFilterFactory() override;

  IAttributeFilter* GetFilter(FILTERALGO eType) const override;
  /// Throws `ParameterException` for a value without a name, and `std::length_error` for a size
  /// above `kMaxKernelSize`.
  IAttributeFilter* GetCPUFilter(FILTERALGO eType) const override;
  /// There is no GPU code: says so at debug level 1 and returns `GetCPUFilter(eType)`.
  IAttributeFilter* GetCUDAFilter(FILTERALGO eType) const override;

 private:
  int kernelSize;
  KernelShape kernelShape;
};

}  // namespace zarn::processes::filters
