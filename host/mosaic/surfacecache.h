// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <condition_variable>
#include <cstddef>
#include <functional>
#include <list>
#include <memory>
#include <vector>

#include "host/hostexport.h"
#include "host/mosaic/mosdodgingsurface.h"

/// Keeps surfaces in memory up to a number of bytes and drops those that were used least recently.
///
/// Locked and referenced surfaces stay whatever their size, and so does the one used last; the
/// budget is kept again as soon as they are released. Safe for concurrent use: a surface that
/// several threads ask for is loaded once, while others stay available. The cache must outlive its
/// sources, and the surfaces' users must have released them before it is destroyed.
class ZARN_HOST_EXPORT SurfaceCache {
 public:
  using Loader = std::function<std::unique_ptr<MOSDodgingSurface>()>;

  /// A surface of the cache, loaded with its loader whenever it is asked for and not there.
  class ZARN_HOST_EXPORT Source : public MOSDodgingSurfaceFactoryRef {
   public:
    Source(SurfaceCache& cache, Loader load);
    Source(const Source&) = delete;
    Source& operator=(const Source&) = delete;
    /// Forgets the surface; holds on it stay valid.
    ~Source() override;

    TCacheRef<MOSDodgingSurface> GetCacheRef() override;

   private:
    friend class SurfaceCache;

    SurfaceCache& cache_;
    Loader load_;
    std::shared_ptr<MOSDodgingSurface> surface_;  // null while it is not in the cache
    bool loading_ = false;
  };

  explicit SurfaceCache(std::size_t budget);
  SurfaceCache(const SurfaceCache&) = delete;
  SurfaceCache& operator=(const SurfaceCache&) = delete;
  ~SurfaceCache();

  /// Bytes of the surfaces that are in the cache now.
  std::size_t BytesInUse() const;

 private:
  friend class HCachable;

  // What was dropped, to be destroyed once the mutex is free.
  using Dropped = std::vector<std::shared_ptr<MOSDodgingSurface>>;

  // All with the mutex held.
  [[nodiscard]] Dropped Insert(Source& source, std::shared_ptr<MOSDodgingSurface> surface);
  std::shared_ptr<MOSDodgingSurface> Take(Source& source);
  void MoveToFront(const HCachable& surface);
  [[nodiscard]] Dropped DropToBudget();

  const std::size_t budget_;
  std::size_t bytes_ = 0;
  std::list<Source*> recent_;  // those in the cache, the most recently used first
  std::condition_variable loaded_;
};
