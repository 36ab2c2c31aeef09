// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/helpformatter.h"

#include <CLI/CLI.hpp>
#include <cstddef>
#include <sstream>

namespace zarn::app {
namespace {

constexpr std::size_t kColumns = 80;
constexpr std::size_t kDescriptionColumn = 25;

std::string Wrapped(const std::string& paragraph, std::size_t columns) {
  std::istringstream words(paragraph);
  std::string text;
  std::size_t used = 0;
  for (std::string word; words >> word;) {
    const bool breaks = used > 0 && used + 1 + word.size() > columns;
    if (used > 0) text += breaks ? '\n' : ' ';
    used = (used > 0 && !breaks ? used + 1 : 0) + word.size();
    text += word;
  }
  return text;
}

std::string WrappedParagraphs(const std::string& text) {
  std::istringstream lines(text);
  std::string result;
  std::string paragraph;
  const auto endParagraph = [&] {
    if (!paragraph.empty()) result += Wrapped(paragraph, kColumns) + '\n';
    paragraph.clear();
  };
  for (std::string line; std::getline(lines, line);) {
    if (line.empty() || line.front() == ' ') {
      endParagraph();
      result += line + '\n';
    } else {
      paragraph += line + ' ';
    }
  }
  endParagraph();
  return result;
}

}  // namespace

HelpFormatter::HelpFormatter() { column_width(kDescriptionColumn); }

std::string HelpFormatter::make_description(const CLI::App* app) const {
  return WrappedParagraphs(Formatter::make_description(app));
}

std::string HelpFormatter::make_footer(const CLI::App* app) const {
  return WrappedParagraphs(Formatter::make_footer(app));
}

std::string HelpFormatter::make_subcommand(const CLI::App* command) const {
  std::ostringstream text;
  CLI::detail::format_help(text, command->get_display_name(true),
                           Wrapped(command->get_description(), kColumns - get_column_width()),
                           get_column_width());
  return text.str();
}

std::string HelpFormatter::make_option_desc(const CLI::Option* option) const {
  return Wrapped(Formatter::make_option_desc(option), kColumns - get_column_width());
}

}  // namespace zarn::app
