// SPDX-License-Identifier: Apache-2.0
#include "host/gobs/raster.h"

#include <algorithm>
#include <cstdint>
#include <limits>
#include <new>
#include <utility>

#include "host/core/exception.h"
#include "host/sys/memory.h"

namespace zarn::gobs {
namespace {

constexpr std::uint64_t kMaxBytes = std::numeric_limits<std::uint32_t>::max();

// The product of the factors, or nothing once it passes 2^32 - 1. A zero factor makes it zero
// however large the others are.
std::uint32_t CheckedSize(std::uint64_t fullWidth, std::uint64_t fullHeight, std::uint64_t channels,
                          std::uint64_t bytes) {
  std::uint64_t size = 1;
  if (fullWidth == 0 || fullHeight == 0 || channels == 0 || bytes == 0) size = 0;
  for (const std::uint64_t factor : {fullWidth, fullHeight, channels, bytes}) {
    size *= factor;
    if (size > kMaxBytes || factor > kMaxBytes) {
      throw DataException("Raster block of more than 4294967295 bytes.");
    }
  }
  return static_cast<std::uint32_t>(size);
}

}  // namespace

RasterInfo::RasterInfo(std::uint32_t width, std::uint32_t height, std::uint32_t channels,
                       const DataType& type, const BlockFrame& frame)
    : width_(width),
      height_(height),
      channels_(channels),
      type_(type),
      frame_(frame),
      describedSize_(CheckedSize(std::uint64_t{width} + 2 * std::uint64_t{frame.marginX},
                                 std::uint64_t{height} + 2 * std::uint64_t{frame.marginY}, channels,
                                 type.BytesPerSample())) {}

RasterInfo::RasterInfo(std::uint32_t width, std::uint32_t height, std::uint32_t channels,
                       NativeDataTypeCode code, const BlockFrame& frame)
    : RasterInfo(width, height, channels, NativeDataType(code).Description(), frame) {}

RasterInfo::~RasterInfo() = default;

NativeDataTypeCode GetDataTypeCode(const RasterInfo& info) { return CodeOf(info.Type()); }

Raster::Raster(const RasterInfo& info) : RasterInfo(info) {
  if (DescribedSize() == 0) return;
  data_ = sys::HCalloc(DescribedSize(), 1);
  if (data_ == nullptr) throw std::bad_alloc();
  dataSize_ = DescribedSize();
  ownsData_ = true;
}

Raster::Raster(const RasterInfo& info, void* data, std::size_t dataSize)
    : RasterInfo(info),
      data_(data),
      dataSize_(static_cast<std::uint32_t>(std::min<std::uint64_t>(dataSize, kMaxBytes))) {
  const std::uint32_t alignment = std::max<std::uint32_t>(info.Type().bits / 8, 1);
  if (reinterpret_cast<std::uintptr_t>(data) % alignment != 0) {
    throw DataException("Raster memory is not aligned to its sample type.");
  }
}

const Raster Raster::WrapConst(const RasterInfo& info, const void* data, std::size_t dataSize) {
  // The result is const, so nobody can write through it.
  return Raster(info, const_cast<void*>(data), dataSize);
}

Raster::Raster(Raster&& other) noexcept
    : RasterInfo(other),
      data_(std::exchange(other.data_, nullptr)),
      dataSize_(std::exchange(other.dataSize_, 0)),
      ownsData_(std::exchange(other.ownsData_, false)) {}

Raster& Raster::operator=(Raster&& other) noexcept {
  if (this != &other) {
    Release();
    RasterInfo::operator=(other);
    data_ = std::exchange(other.data_, nullptr);
    dataSize_ = std::exchange(other.dataSize_, 0);
    ownsData_ = std::exchange(other.ownsData_, false);
  }
  return *this;
}

Raster::~Raster() { Release(); }

void Raster::Release() {
  if (ownsData_) sys::HFree(data_);
}

}  // namespace zarn::gobs
