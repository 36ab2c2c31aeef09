// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <vector>

#include "host/hostexport.h"

class SurfaceCache;

/// An object that a cache may drop when memory is needed and it is neither locked nor referred to.
///
/// All operations are safe for concurrent use. They also work on an object that belongs to no
/// cache, where they have no effect on its life.
class ZARN_HOST_EXPORT HCachable {
 public:
  HCachable() = default;
  HCachable(const HCachable&) = delete;
  HCachable& operator=(const HCachable&) = delete;
  virtual ~HCachable();

  /// Bytes that count against the cache's budget.
  virtual std::size_t ByteSize() const = 0;

  /// Keeps the object in the cache until as many calls of `Unlock`.
  void Lock();
  void Unlock();
  /// Notes that `*holder` points to this object. The object stays in the cache until the holder is
  /// removed; when it dies before, `*holder` becomes null.
  void AddReference(HCachable** holder);
  void RemoveReference(HCachable** holder);
  /// Marks the object as used just now: the last one to be dropped.
  void Promote();

 private:
  friend class SurfaceCache;

  bool Pinned() const { return locks_ > 0 || !holders_.empty(); }

  // Guarded by the mutex of all cachable objects.
  SurfaceCache* cache_ = nullptr;
  std::size_t locks_ = 0;
  std::vector<HCachable**> holders_;
};
