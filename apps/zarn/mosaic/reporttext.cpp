// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/reporttext.h"

#include <cpl_string.h>

#include <array>
#include <charconv>
#include <cstddef>

namespace zarn::app {

std::string Fixed(double value, int decimals) {
  // As long as the largest number is.
  std::array<char, 400> text;
  const auto [end, error] = std::to_chars(text.data(), text.data() + text.size(), value,
                                          std::chars_format::fixed, decimals);
  std::string number(text.data(), end);
  const bool isZero = number.find_first_not_of("-0.") == std::string::npos;
  if (isZero && number.front() == '-') number.erase(0, 1);
  return number;
}

std::string Shortest(double value) {
  std::array<char, 32> text;
  const auto [end, error] = std::to_chars(text.data(), text.data() + text.size(), value);
  return {text.data(), end};
}

std::string Escaped(const std::string& text) {
  constexpr const char* kUnknown = "\xEF\xBF\xBD";
  const bool isUtf8 = CPLIsUTF8(text.c_str(), static_cast<int>(text.size())) != FALSE;
  std::string escaped;
  for (const char c : text) {
    const auto code = static_cast<unsigned char>(c);
    switch (c) {
      case '&':
        escaped += "&amp;";
        break;
      case '<':
        escaped += "&lt;";
        break;
      case '>':
        escaped += "&gt;";
        break;
      case '"':
        escaped += "&quot;";
        break;
      default:
        escaped +=
            code < 0x20 || code == 0x7F || (code >= 0x80 && !isUtf8) ? kUnknown : std::string(1, c);
    }
  }
  return escaped;
}

std::string Filled(const std::string& text, const std::map<std::string, std::string>& values) {
  std::string filled;
  std::size_t done = 0;
  for (std::size_t open = text.find("{{"); open != std::string::npos;
       open = text.find("{{", done)) {
    const std::size_t close = text.find("}}", open);
    filled.append(text, done, open - done);
    filled += values.at(text.substr(open + 2, close - open - 2));
    done = close + 2;
  }
  return filled.append(text, done);
}

}  // namespace zarn::app
