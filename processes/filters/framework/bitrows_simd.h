// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

#include "processes/filters/framework/bitrows.h"

namespace zarn::processes::filters::bitrows {

/// `Pack` and `WriteWhere` for `words` * 64 pixels. They return how many words they did: none
/// where the machine has no vectors.
std::size_t PackWords(const std::uint8_t* pixels, std::size_t words, std::uint8_t value, bool equal,
                      Word* bits);
std::size_t WriteWords(const Word* bits, std::size_t words, bool wanted, std::uint8_t value,
                       std::uint8_t* pixels);

/// `Merge` and `MergeShifted` for whole chunks of words; false: nothing done, no vectors.
bool MergeWords(const Word* from, std::size_t words, Word* to);
bool MergeShiftedWords(const Shifted& a, const Shifted& b, std::size_t words, Word* to);

}  // namespace zarn::processes::filters::bitrows
