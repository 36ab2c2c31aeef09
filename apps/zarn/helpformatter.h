// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <CLI/CLI.hpp>
#include <string>

namespace zarn::app {

/// Fits the help pages to 80 columns: descriptions and the paragraphs of a footer are broken
/// between words. Indented lines stay as they are, so that an example can be copied.
class HelpFormatter : public CLI::Formatter {
 public:
  HelpFormatter();

  std::string make_description(const CLI::App* app) const override;
  std::string make_footer(const CLI::App* app) const override;
  std::string make_subcommand(const CLI::App* command) const override;
  std::string make_option_desc(const CLI::Option* option) const override;
};

}  // namespace zarn::app
