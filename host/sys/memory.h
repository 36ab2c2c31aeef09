// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

#include "host/hostexport.h"

namespace zarn::sys {

/// The host's allocator. Both return null when memory runs out; the caller releases the memory with
/// `HFree` (or `free`).
ZARN_HOST_EXPORT void* HMalloc(std::size_t size);
/// Zeroed memory for `count` items of `size` bytes.
ZARN_HOST_EXPORT void* HCalloc(std::size_t count, std::size_t size);
/// Null is allowed.
ZARN_HOST_EXPORT void HFree(void* memory);

}  // namespace zarn::sys
