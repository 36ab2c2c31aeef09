// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <map>
#include <string>

namespace zarn::app {

/// A number with that many decimals, whatever the locale; never "-0".
std::string Fixed(double value, int decimals);

/// A number with as few digits as tell it from all others.
std::string Shortest(double value);

/// Any text as the contents of an element or of an attribute in double quotes. What is not UTF-8
/// and what has no place in a page becomes U+FFFD.
std::string Escaped(const std::string& text);

/// `text` with "{{name}}" replaced by the value of that name. Values are taken as they are.
std::string Filled(const std::string& text, const std::map<std::string, std::string>& values);

}  // namespace zarn::app
