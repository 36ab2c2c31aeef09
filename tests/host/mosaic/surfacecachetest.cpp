// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <stdexcept>
#include <thread>
#include <vector>

#include "host/mosaic/surfacecache.h"

namespace {

class Sized : public MOSDodgingSurface {
 public:
  explicit Sized(std::size_t bytes) : bytes_(bytes) {}
  std::size_t ByteSize() const override { return bytes_; }
  unsigned Channels() const override { return 1; }
  void GetBilinearValue(unsigned, unsigned, float* values) const override { values[0] = 1.0F; }

 private:
  std::size_t bytes_;
};

/// A source of a surface of 100 bytes that counts how often it is loaded.
struct Counted {
  explicit Counted(SurfaceCache& cache)
      : source(cache, [this] {
          ++loads;
          return std::make_unique<Sized>(100);
        }) {}
  std::atomic<int> loads = 0;
  SurfaceCache::Source source;
};

TEST(SurfaceCache, DropsTheLeastRecentlyUsed) {
  SurfaceCache cache(250);
  Counted a(cache);
  Counted b(cache);
  Counted c(cache);
  a.source.GetCacheRef();
  b.source.GetCacheRef();
  a.source.GetCacheRef()->Promote();
  c.source.GetCacheRef();  // b goes
  EXPECT_EQ(cache.BytesInUse(), 200U);
  a.source.GetCacheRef();
  EXPECT_EQ(a.loads, 1);
  b.source.GetCacheRef();
  EXPECT_EQ(b.loads, 2);
}

TEST(SurfaceCache, KeepsWhatIsPinnedAndTheLastOne) {
  SurfaceCache cache(50);
  Counted a(cache);
  Counted b(cache);
  Counted c(cache);
  const auto locked = a.source.GetCacheRef();
  locked->Lock();
  const auto held = b.source.GetCacheRef();
  HCachable* holder = held.Get();
  held->AddReference(&holder);
  c.source.GetCacheRef();
  EXPECT_EQ(cache.BytesInUse(), 300U);
  locked->Unlock();
  EXPECT_EQ(cache.BytesInUse(), 200U);
  held->RemoveReference(&holder);
  EXPECT_EQ(cache.BytesInUse(), 100U);
  c.source.GetCacheRef();
  EXPECT_EQ(c.loads, 1);
  // A hold keeps the surface itself alive, in the cache or not.
  float value = 0;
  locked->GetBilinearValue(0, 0, &value);
  EXPECT_EQ(value, 1.0F);
}

TEST(SurfaceCache, ClearsHoldersOfSurfacesThatDie) {
  HCachable* holder = nullptr;
  {
    Sized surface(1);
    holder = &surface;
    surface.AddReference(&holder);
  }
  EXPECT_EQ(holder, nullptr);
}

TEST(SurfaceCache, LoadsOnceForManyThreadsAndAgainAfterAFailure) {
  SurfaceCache cache(1000);
  std::atomic<int> loads = 0;
  std::atomic<bool> fails = true;
  SurfaceCache::Source source(cache, [&] {
    ++loads;
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    if (fails) throw std::runtime_error("no such file");
    return std::make_unique<Sized>(100);
  });
  EXPECT_THROW(source.GetCacheRef(), std::runtime_error);
  fails = false;
  {
    std::vector<std::jthread> threads;
    for (int i = 0; i < 8; ++i) threads.emplace_back([&] { EXPECT_TRUE(source.GetCacheRef()); });
  }
  EXPECT_EQ(loads, 2);
}

}  // namespace
