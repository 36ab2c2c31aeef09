// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/colorbalance/dodgingcb.h"

#include <algorithm>
#include <cstddef>
#include <memory>

#include "host/core/exception.h"
#include "host/sys/vectorised.h"
#include "processes/filters/colorbalance/balanceblock.h"
#include "processes/filters/framework/extendtypedispatch.h"
#include "processes/filters/framework/includedpixels.h"

namespace zarn::processes::filters {
namespace {

// `a` is the sample after d4 and d5; `g` and `o` are the surfaces' samples.
double Shifted(double a, const MOSDodgingCoeffs& d, double o) { return a + (d.d1 + o); }
double Damped(double a, const MOSDodgingCoeffs& d, double o) {
  const double r = (d.d0 + d.d1) / (d.d0 - o);
  return r > 1.0 ? (r * a + a + (d.d1 + o)) * 0.5 : Shifted(a, d, o);
}
double Scaled(double a, const MOSDodgingCoeffs& d, double g, double o) {
  return (a - d.d0) * (d.d3 / d.d2 + 1.0) * g + d.d0 + (d.d1 + o);
}

/// A channel's part of a run, with the samples of the surfaces there.
ZARN_VECTORISED
void BalanceRun(double* values, std::size_t count, const MOSDodgingCoeffs& coeffs,
                MOSDodgingType type, const float* gains, const float* offsets) {
  const MOSDodgingCoeffs d = coeffs;
  const auto a = [&](std::size_t i) { return values[i] * d.d4 + d.d5; };
  switch (type) {
    case MOSDodgingType::kScaled:
      for (std::size_t i = 0; i < count; ++i) values[i] = Scaled(a(i), d, gains[i], offsets[i]);
      break;
    case MOSDodgingType::kDamped:
      for (std::size_t i = 0; i < count; ++i) values[i] = Damped(a(i), d, offsets[i]);
      break;
    default:
      for (std::size_t i = 0; i < count; ++i) values[i] = Shifted(a(i), d, offsets[i]);
  }
}

/// A surface that the cache must keep for the length of a call.
class SurfacePin {
 public:
  explicit SurfacePin(MOSDodgingSurfaceFactoryRef* factory) {
    if (factory == nullptr) return;
    ref_ = factory->GetCacheRef();
    if (!ref_) throw DataException("A dodging surface could not be loaded.");
    ref_->Lock();
    holder_ = ref_.Get();
    try {
      ref_->AddReference(&holder_);
    } catch (...) {
      ref_->Unlock();
      throw;
    }
  }
  SurfacePin(const SurfacePin&) = delete;
  SurfacePin& operator=(const SurfacePin&) = delete;
  ~SurfacePin() {
    if (!ref_) return;
    ref_->Unlock();
    ref_->RemoveReference(&holder_);
  }

  /// Null when there is no surface.
  MOSDodgingSurface* Get() const { return ref_.Get(); }
  void Promote() const {
    if (ref_) ref_->Promote();
  }

 private:
  TCacheRef<MOSDodgingSurface> ref_;
  HCachable* holder_ = nullptr;
};

/// One surface along the pixels of a run, or a constant where there is none.
class SurfaceSamples {
 public:
  SurfaceSamples(const MOSDodgingSurface* surface, std::size_t channels, float otherwise)
      : surface_(surface),
        samples_(kRunPixels * (surface == nullptr ? channels : surface->Channels()), otherwise) {}

  void Sample(std::uint32_t column, std::uint32_t row, std::size_t count) {
    if (surface_ == nullptr) return;
    surface_->GetBilinearRun(column, row, static_cast<unsigned>(count), samples_.data(),
                             kRunPixels);
  }
  const float* Channel(std::size_t c) const { return samples_.data() + c * kRunPixels; }

 private:
  const MOSDodgingSurface* surface_;
  std::vector<float> samples_;
};

class Dodging {
 public:
  Dodging(const std::vector<MOSDodgingCoeffs>& coeffs, MOSDodgingType type,
          const MOSDodgingSurface* gain, const MOSDodgingSurface* offset,
          const gobs::RasterInfo& block)
      : coeffs_(coeffs.data()),
        type_(type),
        gains_(gain, block.Channels(), 1.0F),
        offsets_(offset, block.Channels(), 0.0F),
        x0_(block.OriginX()),
        y0_(block.OriginY()) {}

  void Run(const PixelRun& run) {
    if (run.excluded == nullptr) return Balance(run, 0, run.count);
    ForEachIncluded(run.excluded, run.count,
                    [&](std::size_t begin, std::size_t end) { Balance(run, begin, end); });
  }

 private:
  void Balance(const PixelRun& run, std::size_t begin, std::size_t end) {
    const auto column = x0_ + static_cast<std::uint32_t>(run.column + begin);
    const auto row = y0_ + static_cast<std::uint32_t>(run.row);
    gains_.Sample(column, row, end - begin);
    offsets_.Sample(column, row, end - begin);
    for (std::size_t c = 0; c < run.channels; ++c) {
      BalanceRun(run.Channel(c) + begin, end - begin, coeffs_[c], type_, gains_.Channel(c),
                 offsets_.Channel(c));
    }
  }

  const MOSDodgingCoeffs* coeffs_;
  MOSDodgingType type_;
  SurfaceSamples gains_;
  SurfaceSamples offsets_;
  std::uint32_t x0_;
  std::uint32_t y0_;
};

bool Covers(const SurfacePin& surface, const gobs::RasterInfo& block) {
  return surface.Get() == nullptr || surface.Get()->Channels() >= block.Channels();
}

}  // namespace

namespace details {

template <typename T>
class CPUDodgingProc : public IDodgingProc {
 public:
  FilterResult Process(const gobs::Raster& input, gobs::Raster& output,
                       const std::vector<MOSDodgingCoeffs>& coeffs, MOSDodgingType type,
                       MOSDodgingSurfaceFactoryRef* gainSurface,
                       MOSDodgingSurfaceFactoryRef* offsetSurface, const std::uint8_t* inputMask,
                       const std::vector<double>& inputNoData,
                       const std::vector<double>& outputNoData) override {
    const std::vector<ChannelBounds> bounds =
        TypeBounds(gobs::GetDataTypeCode(input), input.Channels());
    const BalanceJob<T> job(input, output, inputNoData, outputNoData, inputMask,
                            MakeConverters<T>(bounds, outputNoData));
    const SurfacePin gain(gainSurface);
    const SurfacePin offset(offsetSurface);
    gain.Promote();
    offset.Promote();
    if (!Covers(gain, input) || !Covers(offset, input)) {
      return FilterResult::Failure(messages::kFewParameters);
    }
    Balance(job, ShareAlways(), Dodging(coeffs, type, gain.Get(), offset.Get(), input));
    return FilterResult::Success();
  }
};

}  // namespace details

FilterResult CPUDodgingCB::Process(const gobs::Raster& input, gobs::Raster& output,
                                   std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                   const std::uint8_t* inputMask) {
  using typedispatch::AllSampleTypes;
  const std::unique_ptr<details::IDodgingProc> processor(
      typedispatch::ExtendDispatchTypes<
          typedispatch::Factory1Template<details::CPUDodgingProc, details::IDodgingProc>, 1,
          AllSampleTypes, AllSampleTypes, typedispatch::NullDataType>::Dispatch({input.Type()},
                                                                                false));
  if (auto refusal = CheckBalanced(input, output, inputNoData, outputNoData, coeffs.size())) {
    return *refusal;
  }
  return processor->Process(input, output, coeffs, type, gainSurface, offsetSurface, inputMask,
                            inputNoData, outputNoData);
}

}  // namespace zarn::processes::filters
