// SPDX-License-Identifier: Apache-2.0
// Output converters on vectors of doubles, compiled once per vector target: see pixelvectors_simd.h
// for how to include it.

#if defined(ZARN_FRAMEWORK_OUTPUTCONVERTER_SIMD_H) == defined(HWY_TARGET_TOGGLE)
#ifdef ZARN_FRAMEWORK_OUTPUTCONVERTER_SIMD_H
#undef ZARN_FRAMEWORK_OUTPUTCONVERTER_SIMD_H
#else
#define ZARN_FRAMEWORK_OUTPUTCONVERTER_SIMD_H
#endif

#include <hwy/highway.h>

#include <limits>
#include <type_traits>

#include "processes/filters/framework/converterconstants.h"

HWY_BEFORE_NAMESPACE();
namespace zarn::processes::filters::HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

/// The converters of as many neighbouring samples as there are lanes of double.
template <typename T, class D>
struct ConverterVectors {
  /// The same converter for all lanes.
  HWY_INLINE ConverterVectors(D tag, const ConverterConstants<T>& constants)
      : d(tag),
        low(hn::Set(d, constants.low)),
        high(hn::Set(d, constants.high)),
        noData(hn::Set(d, constants.noData)),
        replacement(hn::Set(d, constants.replacement)),
        avoids(constants.avoids) {}
  HWY_INLINE ConverterVectors(D tag, hn::Vec<D> lows, hn::Vec<D> highs, hn::Vec<D> noDatas,
                              hn::Vec<D> replacements, bool anyAvoids)
      : d(tag),
        low(lows),
        high(highs),
        noData(noDatas),
        replacement(replacements),
        avoids(anyAvoids) {}

  HWY_INLINE void Store(hn::Vec<D> v, T* to) const {
    const hn::Rebind<T, D> dt;
    if constexpr (std::is_floating_point_v<T>) {
      v = hn::IfThenElse(hn::Lt(v, low), low, hn::IfThenElse(hn::Gt(v, high), high, v));
      if constexpr (std::is_same_v<T, double>) {
        hn::StoreU(Avoid(v), dt, to);
      } else {
        auto narrow = hn::DemoteTo(dt, v);
        if (avoids) {
          // A wider tolerance covers the rounding of the difference; the exact test is rare.
          const auto distance = hn::Abs(hn::Sub(narrow, hn::DemoteTo(dt, noData)));
          if (HWY_UNLIKELY(!hn::AllFalse(dt, hn::Lt(distance, hn::Set(dt, 2e-5F))))) {
            narrow = hn::DemoteTo(dt, Avoid(hn::PromoteTo(d, narrow)));
          }
        }
        hn::StoreU(narrow, dt, to);
      }
    } else {
      // NaN fails the comparison and becomes the low bound.
      v = hn::IfThenElse(hn::Ge(v, low), v, low);
      v = hn::IfThenElse(hn::Gt(v, high), high, v);
      // The sum rounds to the nearest integer, ties to even, which its low bits then hold.
      v = hn::Add(v, hn::Set(d, kIntegersInLowBits));
      if (avoids) v = hn::IfThenElse(hn::Eq(v, noData), replacement, v);
      using Bits = std::make_unsigned_t<T>;
      const hn::Rebind<Bits, D> du;
      hn::StoreU(hn::TruncateTo(du, hn::BitCast(hn::RebindToUnsigned<D>(), v)), du,
                 reinterpret_cast<Bits*>(to));
    }
  }

  D d;
  hn::Vec<D> low;
  hn::Vec<D> high;
  hn::Vec<D> noData;
  hn::Vec<D> replacement;
  bool avoids;

 private:
  HWY_INLINE hn::Vec<D> Avoid(hn::Vec<D> v) const {
    if (!avoids) return v;
    const auto touches = hn::Lt(hn::Abs(hn::Sub(v, noData)), hn::Set(d, 1e-5));
    return hn::IfThenElse(touches, replacement, v);
  }
};

}  // namespace zarn::processes::filters::HWY_NAMESPACE
HWY_AFTER_NAMESPACE();

#endif
