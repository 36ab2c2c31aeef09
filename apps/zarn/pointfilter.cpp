// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/pointfilter.h"

#include <CLI/CLI.hpp>
#include <iostream>

#include "apps/zarn/errors.h"

namespace zarn::app {
namespace {

// Ends the parsing like --help does, so that IN and OUT are not asked for.
void PrintAndEnd(const std::string& text) {
  std::cout << text << std::flush;
  if (!std::cout) throw RunError("cannot write to the standard output");
  throw CLI::Success();
}

}  // namespace

CLI::Option& AddPointFilterOptions(CLI::App& command, PointFilterOptions& options,
                                   const PointFilterHelp& help) {
  CLI::Option& params =
      *command.add_option("--params", options.params, "JSON file of the parameters, see below")
           ->type_name("FILE");
  command.add_flag_callback(
      "--example", [text = help.exampleFile] { PrintAndEnd(text); },
      "Print a parameter file to start from, and do nothing else");
  AddImageFilterOptions(
      command, options.image,
      {.maskHelp = "Raster of the same size; pixels where it is 0 are not corrected and "
                   "become the no-data value of OUT, if it has one"});
  command.footer("Parameter file, with one object for all bands or one for each:\n" + help.schema +
                 "\nPixels that are no-data, NaN, transparent (alpha 0) or masked become the "
                 "no-data value of OUT,\nor stay as they are where it has none. " +
                 help.noData + "\n\nExample:\n  " + help.example);
  return params;
}

void RunPointFilter(const ImageFilterOptions& options, const PointFilterMaker& make,
                    const PointFilterCheck& check) {
  RunImageFilter(options,
                 {.probe = [&](const RasterSource& source) { return OnWindows(make(source), {}); },
                  .fit =
                      [&](const RasterSource& source, const NoDataValues& noData, nspio::Counter&) {
                        if (check) check(source, noData);
                        return FittedFilter{OnWindows(make(source), noData)};
                      }});
}

}  // namespace zarn::app
