// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <memory>
#include <utility>

/// A hold on a cached object: it lives at least as long as the hold, even when the cache drops it
/// meanwhile. May be empty.
template <typename T>
class TCacheRef {
 public:
  TCacheRef() = default;
  explicit TCacheRef(std::shared_ptr<T> object) : object_(std::move(object)) {}

  T* Get() const { return object_.get(); }
  T* operator->() const { return object_.get(); }
  explicit operator bool() const { return object_ != nullptr; }

 private:
  std::shared_ptr<T> object_;
};

/// Where a cached object comes from; `Ref` is a `TCacheRef`.
template <typename Ref>
class TCacheFactoryRef {
 public:
  virtual ~TCacheFactoryRef() = default;

  /// The object, loaded if it is not in the cache. Safe for concurrent use; may throw what loading
  /// throws.
  virtual Ref GetCacheRef() = 0;
};
