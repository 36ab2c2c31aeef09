// SPDX-License-Identifier: Apache-2.0
#include "processes/filters/framework/morphology.h"

#include <algorithm>
#include <bit>
#include <cstddef>
#include <vector>

#include "processes/filters/framework/bitrows.h"
#include "processes/filters/framework/kernelruns.h"
#include "processes/filters/framework/parallel.h"

namespace zarn::processes::filters {
namespace {

// Dilation writes where the pixel itself or a neighbour matches; erosion writes unless the pixel
// itself or a neighbour differs. So both ask where a pixel of one kind is near, 64 pixels at a
// time, and neighbours outside the image are never of that kind.

using bitrows::Word;

// Smaller images are done sooner than threads start.
constexpr std::ptrdiff_t kLeastParallelPixels = 1 << 16;

std::size_t WordsFor(std::ptrdiff_t pixels) {
  constexpr std::size_t kChunkBits = bitrows::kWordBits * bitrows::kChunk;
  return (static_cast<std::size_t>(pixels) + kChunkBits - 1) / kChunkBits * bitrows::kChunk;
}

struct Job {
  const std::uint8_t* input;
  std::uint8_t* output;
  std::ptrdiff_t width;
  std::ptrdiff_t height;
  std::uint8_t matchValue;
  std::uint8_t setValue;
  bool lookForMatches;  ///< the kind of pixel to look for
};

// What all bands of rows share.
struct Layout {
  Layout(const Job& job, const KernelRuns& kernel) : words(WordsFor(job.width)) {
    std::ptrdiff_t reach = 0;
    std::ptrdiff_t longest = 1;
    for (const KernelRun& run : kernel.runs) {
      reach = std::max({reach, -run.first, run.last});
      longest = std::max(longest, run.last - run.first + 1);
    }
    padding = WordsFor(reach + 1);
    levels = static_cast<std::size_t>(std::bit_width(static_cast<std::size_t>(longest)));
    ringRows = static_cast<std::size_t>(kernel.bottom - kernel.top + 1);
  }

  std::size_t PaddedWords() const { return words + 2 * padding; }
  std::size_t BandWords() const { return levels * PaddedWords() + words + ringRows * words; }

  std::size_t words;     // of a row
  std::size_t padding;   // words before and after it, as far as offsets reach
  std::size_t levels;    // lengths of runs that are powers of two
  std::size_t ringRows;  // rows of results that are not complete yet
};

// The rows of one thread. Rows of the input come in one by one, each is spread along the rows by
// every run of the kernel, and the result is merged into all rows that it belongs to.
class Band {
 public:
  Band(const Job& job, const KernelRuns& kernel, const Layout& layout, Word* scratch)
      : job_(job),
        kernel_(kernel),
        layout_(layout),
        levels_(scratch),
        spread_(levels_ + layout.levels * layout.PaddedWords()),
        ring_(spread_ + layout.words) {}

  void Run(std::ptrdiff_t firstRow, std::ptrdiff_t endRow) {
    const std::ptrdiff_t firstInput = std::max<std::ptrdiff_t>(firstRow + kernel_.top, 0);
    const std::ptrdiff_t endInput = std::min(endRow + kernel_.bottom, job_.height);
    std::ptrdiff_t nextOutput = firstRow;
    for (std::ptrdiff_t y = firstInput; y < endInput; ++y) {
      ReadRow(y);
      for (const KernelRun& run : kernel_.runs) {
        SpreadRow(run);
        for (const std::ptrdiff_t dy : run.rows) {
          const std::ptrdiff_t target = y - dy;
          if (target < firstRow || target >= endRow) continue;
          bitrows::Merge(spread_, layout_.words, RingRow(target));
        }
      }
      for (; nextOutput <= y - kernel_.bottom; ++nextOutput) WriteRow(nextOutput);
    }
    for (; nextOutput < endRow; ++nextOutput) WriteRow(nextOutput);
  }

 private:
  // Pixel x of level n is set where one of the pixels x .. x + 2^n - 1 of the input is.
  Word* Level(std::size_t n) { return levels_ + n * layout_.PaddedWords() + layout_.padding; }
  Word* RingRow(std::ptrdiff_t y) {
    return ring_ + static_cast<std::size_t>(y) % layout_.ringRows * layout_.words;
  }

  void ReadRow(std::ptrdiff_t y) {
    bitrows::Pack(job_.input + y * job_.width, static_cast<std::size_t>(job_.width),
                  job_.matchValue, job_.lookForMatches, Level(0));
    for (std::size_t n = 1; n < layout_.levels; ++n) {
      // Before the row as well: runs that begin there reach into it.
      bitrows::MergeShifted(Level(n - 1) - layout_.padding, 0, std::ptrdiff_t{1} << (n - 1),
                            layout_.padding + layout_.words, Level(n) - layout_.padding);
    }
  }

  // Any run is two, perhaps overlapping, of the power of two below its length.
  void SpreadRow(const KernelRun& run) {
    const auto length = static_cast<std::size_t>(run.last - run.first + 1);
    const auto n = static_cast<std::size_t>(std::bit_width(length)) - 1;
    bitrows::MergeShifted(Level(n), run.first, run.last + 1 - (std::ptrdiff_t{1} << n),
                          layout_.words, spread_);
  }

  void WriteRow(std::ptrdiff_t y) {
    Word* const row = RingRow(y);
    bitrows::WriteWhere(row, static_cast<std::size_t>(job_.width), job_.lookForMatches,
                        job_.setValue, job_.output + y * job_.width);
    std::fill_n(row, layout_.words, Word{0});
  }

  const Job& job_;
  const KernelRuns& kernel_;
  const Layout& layout_;
  Word* levels_;
  Word* spread_;
  Word* ring_;
};

void Morph(const Job& job, const std::vector<int>& offsets) {
  if (job.width <= 0 || job.height <= 0 || offsets.size() < 2) return;
  const KernelRuns kernel(offsets, job.width, job.height);
  const Layout layout(job, kernel);
  const std::ptrdiff_t bands =
      job.width * job.height < kLeastParallelPixels ? 1 : parallel::BandCount(job.height);
  std::vector<Word> scratch(static_cast<std::size_t>(bands) * layout.BandWords());
  parallel::ForEachRowBand(
      job.height, bands, [&](std::ptrdiff_t band, std::ptrdiff_t firstRow, std::ptrdiff_t endRow) {
        Word* const own = scratch.data() + static_cast<std::size_t>(band) * layout.BandWords();
        Band(job, kernel, layout, own).Run(firstRow, endRow);
      });
}

}  // namespace

void MorphDilation(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                   std::uint8_t matchValue, std::uint8_t setValue,
                   const std::vector<int>& offsets) {
  Morph({input, output, width, height, matchValue, setValue, true}, offsets);
}

void MorphDilation(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                   std::uint8_t value, const std::vector<int>& offsets) {
  MorphDilation(input, output, width, height, value, value, offsets);
}

void MorphErosion(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                  std::uint8_t matchValue, std::uint8_t setValue, const std::vector<int>& offsets) {
  Morph({input, output, width, height, matchValue, setValue, false}, offsets);
}

void MorphErosion(const std::uint8_t* input, std::uint8_t* output, int width, int height,
                  std::uint8_t value, const std::vector<int>& offsets) {
  MorphErosion(input, output, width, height, value, value, offsets);
}

}  // namespace zarn::processes::filters
