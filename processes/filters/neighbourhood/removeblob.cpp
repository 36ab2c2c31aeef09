// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/neighbourhood/removeblob.h"

#include <algorithm>
#include <bit>
#include <cstddef>
#include <type_traits>

#include "processes/filters/framework/bitrows.h"
#include "processes/filters/framework/blockchecks.h"
#include "processes/filters/framework/channelconverters.h"
#include "processes/filters/framework/sampletypes.h"
#include "processes/filters/neighbourhood/openingrows.h"
#include "processes/filters/neighbourhood/windowbands.h"
#include "processes/filters/neighbourhood/windowjob.h"
#if ZARN_SIMD
#include "processes/filters/framework/samplerows_simd.h"
#endif

namespace zarn::processes::filters {
namespace {

using bitrows::Word;

constexpr const char* kUnknownType = "Unknown raster block data type.";

template <typename T>
struct BlobJob : WindowJob<T> {
  T removed;  ///< what the samples of blobs become
};

// One band of rows on its way through the filter. With D the data, the background B is all that is
// not D; E = not (B grown by the square) is where the square fits; what survives is E grown.
template <typename T>
class BlobBand {
 public:
  static std::size_t ScratchBytes(const BitRowLayout& layout) {
    return (2 * SquareUnion::Words(layout) + (layout.taps + 3) * layout.words) * sizeof(Word) +
           FlagBytes(layout);
  }

  BlobBand(const BlobJob<T>& job, const BitRowLayout& layout, std::byte* scratch)
      : job_(job),
        layout_(layout),
        words_(reinterpret_cast<Word*>(scratch)),
        background_(layout, true, Take(SquareUnion::Words(layout))),
        fits_(layout, false, Take(SquareUnion::Words(layout))),
        candidates_(Take(layout.taps * layout.words)),
        noData_(Take(layout.words)),
        masked_(Take(layout.words)),
        matches_(Take(layout.words)),
        flags_(reinterpret_cast<std::uint8_t*>(words_)) {}

  void Run(std::ptrdiff_t begin, std::ptrdiff_t end) {
    // A row of output needs the data of as many rows below and above as two squares reach.
    const std::ptrdiff_t half = job_.half;
    for (std::ptrdiff_t y = begin - 2 * half; y < end + 2 * half; ++y) {
      const Word* const unfit = PushRow(y);
      if (y < begin) continue;
      const Word* const survives = PushFits(y - half, unfit);
      if (y >= begin + 2 * half) WriteRow(y - 2 * half, survives);
    }
  }

 private:
  // Flags of whole vectors may be written.
  static std::size_t FlagBytes(const BitRowLayout& layout) {
    return layout.words * bitrows::kWordBits + 64;
  }
  Word* Take(std::size_t words) {
    Word* const place = words_;
    words_ += words;
    return place;
  }
  bool Inside(std::ptrdiff_t y) const { return y >= 0 && y < job_.output.Height(); }
  /// The pixels of row y that blobs are made of, kept until the row is written.
  Word* Candidates(std::ptrdiff_t y) {
    return candidates_ + static_cast<std::size_t>(y) % layout_.taps * layout_.words;
  }
  Word LastBits() const {
    const std::size_t bits = layout_.width % bitrows::kWordBits;
    return bits == 0 ? ~Word{0} : (Word{1} << bits) - 1;
  }
  std::size_t UsedWords() const {
    return (layout_.width + bitrows::kWordBits - 1) / bitrows::kWordBits;
  }

  // The pixels of a row that equal the value in all channels.
  void PackEqual(const T* row, const T* value, Word* bits) {
    const auto channels = static_cast<std::size_t>(job_.input.Channels());
    if constexpr (sizeof(T) == 1) {
      if (channels == 1) {
        bitrows::Pack(reinterpret_cast<const std::uint8_t*>(row), layout_.width,
                      static_cast<std::uint8_t>(*value), true, bits);
        return;
      }
    }
#if ZARN_SIMD
    FlagEqual(row, layout_.width, channels, value, flags_);
#else
    for (std::size_t x = 0; x < layout_.width; ++x) {
      flags_[x] = PixelEquals(row + x * channels, value, channels) ? 1 : 0;
    }
#endif
    bitrows::Pack(flags_, layout_.width, 1, true, bits);
  }

  const Word* PushRow(std::ptrdiff_t y) {
    if (!Inside(y)) return background_.PushOutside();
    const WindowRules<T>& rules = job_.rules;
    const T* const row = job_.input.Pixel(0, y);
    const std::size_t used = UsedWords();
    if (rules.mask() != nullptr) {
      bitrows::Pack(job_.mask.Pixel(0, y), layout_.width, 0, true, masked_);
    } else {
      std::fill_n(masked_, used, Word{0});
    }
    PackEqual(row, rules.background().data(), matches_);
    if (rules.HasInputNoData()) {
      PackEqual(row, rules.inputNoData().data(), noData_);
    } else {
      std::fill_n(noData_, used, Word{0});
    }
    const Word countsNoData = rules.HasOutputNoData() ? ~Word{0} : 0;
    Word* const candidates = Candidates(y);
    Word* const isBackground = background_.Row();
    for (std::size_t w = 0; w < used; ++w) {
      candidates[w] = ~(masked_[w] | noData_[w] | matches_[w]);
      isBackground[w] = ~(candidates[w] | (noData_[w] & ~masked_[w] & countsNoData));
    }
    candidates[used - 1] &= LastBits();
    isBackground[used - 1] |= ~LastBits();
    return background_.Push();
  }

  const Word* PushFits(std::ptrdiff_t y, const Word* unfit) {
    if (!Inside(y)) return fits_.PushOutside();
    Word* const fits = fits_.Row();
    const std::size_t used = UsedWords();
    for (std::size_t w = 0; w < used; ++w) fits[w] = ~unfit[w];
    fits[used - 1] &= LastBits();
    return fits_.Push();
  }

  void WriteRow(std::ptrdiff_t y, const Word* survives) {
    const auto channels = static_cast<std::size_t>(job_.input.Channels());
    T* const out = job_.output.Pixel(0, y);
    std::copy_n(job_.input.Pixel(0, y), layout_.width * channels, out);
    const Word* const candidates = Candidates(y);
    for (std::size_t w = 0; w < UsedWords(); ++w) {
      Word removed = candidates[w] & ~survives[w];
      T* pixels = out + w * bitrows::kWordBits * channels;
      while (removed != 0) {
        const auto skipped = static_cast<std::size_t>(std::countr_zero(removed));
        const auto run = static_cast<std::size_t>(std::countr_one(removed >> skipped));
        std::fill_n(pixels + skipped * channels, run * channels, job_.removed);
        if (skipped + run == bitrows::kWordBits) break;
        removed = removed >> (skipped + run) << (skipped + run);
      }
    }
  }

  const BlobJob<T>& job_;
  const BitRowLayout& layout_;
  Word* words_;
  SquareUnion background_;
  SquareUnion fits_;
  Word* candidates_;
  Word* noData_;
  Word* masked_;
  Word* matches_;
  std::uint8_t* flags_;
};

template <typename T>
void RemoveBlobs(const BlobJob<T>& job) {
  if (job.output.Width() == 0 || job.output.Channels() == 0) return;
  const BitRowLayout layout(static_cast<std::size_t>(job.output.Width()),
                            static_cast<std::size_t>(job.half));
  ForEachWindowBand(job.output.Height(), BlobBand<T>::ScratchBytes(layout),
                    [&](std::ptrdiff_t begin, std::ptrdiff_t end, std::byte* scratch) {
                      BlobBand<T>(job, layout, scratch).Run(begin, end);
                    });
}

}  // namespace

FilterResult CPURemoveBlob::Process(const gobs::Raster& input, gobs::Raster& output,
                                    std::uint32_t /*blockX*/, std::uint32_t /*blockY*/,
                                    const std::uint8_t* inputMask) {
  const gobs::NativeDataTypeCode code = gobs::GetDataTypeCode(input);
  RequireTypeLimits(code, input.Channels());
  return VisitSampleType(code, kUnknownType, [&]<typename T>(std::type_identity<T>) {
    if (auto refusal = blockchecks::CheckSameSize(input, output)) return *refusal;
    if (auto refusal = blockchecks::CheckMargins(input, HalfWindow(kernelSize))) return *refusal;
    if (auto refusal = blockchecks::CheckBlocks(input, output, inputNoData, outputNoData,
                                                blockchecks::Aliasing::kForbidden)) {
      return *refusal;
    }
    RemoveBlobs(
        BlobJob<T>{{input, output, inputNoData, outputNoData, noDataValue, inputMask, kernelSize},
                   TruncateToSample<T>(noDataValue)});
    return FilterResult::Success();
  });
}

}  // namespace zarn::processes::filters
