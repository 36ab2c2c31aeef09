// SPDX-License-Identifier: Apache-2.0
#include "host/mosaic/surfacecache.h"

#include <algorithm>
#include <exception>
#include <iterator>
#include <mutex>
#include <utility>
#include <vector>

namespace {

// One mutex for all cachable objects: it is held for moments only, never while a surface is loaded
// or read, and an object's cache may go away at any time.
std::mutex& CacheMutex() {
  static std::mutex mutex;
  return mutex;
}

}  // namespace

HCachable::~HCachable() {
  const std::lock_guard lock(CacheMutex());
  for (HCachable** const holder : holders_) *holder = nullptr;
}

void HCachable::Lock() {
  const std::lock_guard lock(CacheMutex());
  ++locks_;
}

void HCachable::Unlock() {
  SurfaceCache::Dropped dropped;
  const std::lock_guard lock(CacheMutex());
  if (locks_ > 0) --locks_;
  if (cache_ != nullptr) dropped = cache_->DropToBudget();
}

void HCachable::AddReference(HCachable** holder) {
  const std::lock_guard lock(CacheMutex());
  holders_.push_back(holder);
}

void HCachable::RemoveReference(HCachable** holder) {
  SurfaceCache::Dropped dropped;
  const std::lock_guard lock(CacheMutex());
  const auto found = std::find(holders_.begin(), holders_.end(), holder);
  if (found != holders_.end()) holders_.erase(found);
  if (cache_ != nullptr) dropped = cache_->DropToBudget();
}

void HCachable::Promote() {
  const std::lock_guard lock(CacheMutex());
  if (cache_ != nullptr) cache_->MoveToFront(*this);
}

SurfaceCache::Source::Source(SurfaceCache& cache, Loader load)
    : cache_(cache), load_(std::move(load)) {}

SurfaceCache::Source::~Source() {
  std::shared_ptr<MOSDodgingSurface> last;
  const std::lock_guard lock(CacheMutex());
  if (surface_) last = cache_.Take(*this);
}

TCacheRef<MOSDodgingSurface> SurfaceCache::Source::GetCacheRef() {
  Dropped dropped;
  std::unique_lock lock(CacheMutex());
  cache_.loaded_.wait(lock, [&] { return !loading_; });
  if (surface_) {
    cache_.MoveToFront(*surface_);
    return TCacheRef<MOSDodgingSurface>(surface_);
  }
  loading_ = true;
  lock.unlock();
  std::shared_ptr<MOSDodgingSurface> surface;
  std::exception_ptr failure;
  try {
    surface = load_();
  } catch (...) {
    failure = std::current_exception();
  }
  lock.lock();
  loading_ = false;
  cache_.loaded_.notify_all();
  if (failure) std::rethrow_exception(failure);
  if (surface) dropped = cache_.Insert(*this, surface);
  return TCacheRef<MOSDodgingSurface>(std::move(surface));
}

SurfaceCache::SurfaceCache(std::size_t budget) : budget_(budget) {}

SurfaceCache::~SurfaceCache() {
  const std::lock_guard lock(CacheMutex());
  for (Source* const source : recent_) source->surface_->cache_ = nullptr;
  recent_.clear();
}

std::size_t SurfaceCache::BytesInUse() const {
  const std::lock_guard lock(CacheMutex());
  return bytes_;
}

SurfaceCache::Dropped SurfaceCache::Insert(Source& source,
                                           std::shared_ptr<MOSDodgingSurface> surface) {
  surface->cache_ = this;
  bytes_ += surface->ByteSize();
  source.surface_ = std::move(surface);
  recent_.push_front(&source);
  return DropToBudget();
}

std::shared_ptr<MOSDodgingSurface> SurfaceCache::Take(Source& source) {
  source.surface_->cache_ = nullptr;
  bytes_ -= source.surface_->ByteSize();
  recent_.remove(&source);
  return std::exchange(source.surface_, nullptr);
}

void SurfaceCache::MoveToFront(const HCachable& surface) {
  const auto found = std::find_if(recent_.begin(), recent_.end(), [&](const Source* source) {
    return source->surface_.get() == &surface;
  });
  recent_.splice(recent_.begin(), recent_, found);
}

SurfaceCache::Dropped SurfaceCache::DropToBudget() {
  Dropped dropped;
  while (bytes_ > budget_) {
    // The one used last stays: it is about to be used again.
    const auto oldest = std::find_if(recent_.rbegin(), std::prev(recent_.rend()),
                                     [](const Source* s) { return !s->surface_->Pinned(); });
    if (oldest == std::prev(recent_.rend())) break;
    dropped.push_back(Take(**oldest));
  }
  return dropped;
}
