// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/comparisonoptions.h"

#include <CLI/CLI.hpp>

namespace zarn::app {

void AddGainLimitOptions(CLI::App& command, GainLimits& limits) {
  command
      .add_option("--damping", limits.damping,
                  "How strongly gains are held at 1, against the ratio of signal to noise "
                  "r^2 / (1 - r^2) of an overlap whose correlation is r; 0 leaves them free")
      ->check(CLI::Range(0.0, 1e9).description(""))
      ->type_name("D")
      ->capture_default_str();
  command
      .add_option("--contrast", limits.contrast,
                  "0: gains of least squares, which leave the smallest differences from REF; 1: "
                  "gains that give IN all the contrast of REF, also where the two differ")
      ->check(CLI::Range(0.0, 1.0).description(""))
      ->type_name("SHARE")
      ->capture_default_str();
}

void AddComparisonOptions(CLI::App& command, int& cell, std::string& srcNoData) {
  command
      .add_option("--cell", cell,
                  "Side in pixels of the cells whose means are compared; by default 8, or fewer "
                  "where the overlap is small")
      ->check(CLI::Range(1, 100000).description(""))
      ->type_name("N");
  command
      .add_option("--src-nodata", srcNoData,
                  "No-data value of the rasters, one for all bands or one for each, or 'none'; by "
                  "default each file's own")
      ->type_name("V[,V...]");
}

}  // namespace zarn::app
