// SPDX-License-Identifier: Apache-2.0
#include "host/sys/memory.h"

#include <cstdlib>

namespace zarn::sys {

void* HMalloc(std::size_t size) { return std::malloc(size); }

void* HCalloc(std::size_t count, std::size_t size) { return std::calloc(count, size); }

void HFree(void* memory) { std::free(memory); }

}  // namespace zarn::sys
