// SPDX-License-Identifier: Apache-2.0
#include <signal.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <exception>
#include <memory>
#include <new>
#include <string>

#include "apps/zarn/average.h"
#include "apps/zarn/blend.h"
#include "apps/zarn/compare.h"
#include "apps/zarn/dodge.h"
#include "apps/zarn/enhance.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/estimate/fitdodging.h"
#include "apps/zarn/estimate/fitgainoffset.h"
#include "apps/zarn/estimate/fithotspot.h"
#include "apps/zarn/gainoffset.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/helpformatter.h"
#include "apps/zarn/hotspot.h"
#include "apps/zarn/interruption.h"
#include "apps/zarn/lut.h"
#include "apps/zarn/median.h"
#include "apps/zarn/minmaxlut.h"
#include "apps/zarn/morph.h"
#include "apps/zarn/mosaic/mosaic.h"
#include "apps/zarn/noisefilter.h"
#include "apps/zarn/polynomial.h"
#include "apps/zarn/removeblobs.h"
#include "apps/zarn/resample.h"
#include "apps/zarn/sample.h"
#include "apps/zarn/segmentfilter.h"
#include "apps/zarn/shift.h"

namespace {

constexpr int kRunFailed = 1;
constexpr int kWrongUsage = 2;

int Fail(int status, std::string text) {
  std::replace(text.begin(), text.end(), '\n', ' ');
  std::fprintf(stderr, "zarn: %s\n", text.c_str());
  return status;
}

std::string CommandOf(const CLI::App& app) {
  const auto parsed = app.get_subcommands();
  return app.get_name() + (parsed.empty() ? "" : " " + CommandOf(*parsed.front()));
}

void AddCommands(CLI::App& app) {
  app.set_version_flag("--version", "zarn " ZARN_VERSION);
  app.require_subcommand(1);
  app.footer(
      "'zarn COMMAND --help' shows the options of a command.\n\n"
      "Example:\n  zarn average --size 5 scene.tif smooth.tif");
  zarn::app::AddAverageCommand(app);
  zarn::app::AddEnhanceCommand(app);
  zarn::app::AddBlendCommand(app);
  zarn::app::AddCompareCommand(app);
  zarn::app::AddFitDodgingCommand(app);
  zarn::app::AddFitGainOffsetCommand(app);
  zarn::app::AddFitHotSpotCommand(app);
  zarn::app::AddGainOffsetCommand(app);
  zarn::app::AddLutCommand(app);
  zarn::app::AddMedianCommand(app);
  zarn::app::AddMinMaxLutCommand(app);
  zarn::app::AddMorphCommand(app);
  zarn::app::AddMosaicCommand(app);
  zarn::app::AddNoiseCommand(app);
  zarn::app::AddPolynomialCommand(app);
  zarn::app::AddDodgeCommand(app);
  zarn::app::AddHotSpotCommand(app);
  zarn::app::AddRemoveBlobsCommand(app);
  zarn::app::AddResampleCommand(app);
  zarn::app::AddShiftCommand(app);
  zarn::app::AddSampleCommand(app);
  zarn::app::AddSegmentFilterCommand(app);
}

// A variable of a script that was never set must not silently stand for "not given".
void RefuseEmptyValues(CLI::App& app) {
  const CLI::Validator notEmpty(
      [](const std::string& text) {
        return text.empty() ? "it is empty; give a value or leave it out" : std::string();
      },
      "");
  for (CLI::App* const command : app.get_subcommands({})) {
    for (CLI::Option* const option : command->get_options()) option->check(notEmpty);
    RefuseEmptyValues(*command);
  }
}

int RunCommand(int argc, char** argv) {
  CLI::App app("Filters rasters of any size, in the manner of the GDAL tools.", "zarn");
  app.formatter(std::make_shared<zarn::app::HelpFormatter>());
  AddCommands(app);
  RefuseEmptyValues(app);
  const zarn::app::GdalRuntime gdal;
  try {
    app.parse(argc, argv);
    return 0;
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) return app.exit(error);
    const bool unknownCommand = app.get_subcommands().empty() && app.remaining_size() > 0;
    const std::string reason = unknownCommand
                                   ? "there is no command '" + app.remaining().front() + "'"
                                   : std::string(error.what());
    return Fail(kWrongUsage, reason + " (see " + CommandOf(app) + " --help)");
  } catch (const zarn::app::UsageError& error) {
    return Fail(kWrongUsage, error.what());
  } catch (const std::bad_alloc&) {
    return Fail(kRunFailed, "out of memory; try a smaller --memory");
  } catch (const std::exception& error) {
    return Fail(kRunFailed, error.what());
  }
}

}  // namespace

int main(int argc, char** argv) {
  try {
    zarn::app::HandleInterruptions();
    // A file that grows past a limit is to end in an error message, not in a killed process.
    signal(SIGXFSZ, SIG_IGN);
    // Whatever escapes a thread still must not leave half an output behind.
    std::set_terminate([] { zarn::app::AbandonAndExit("stopped by an internal error"); });
    return RunCommand(argc, argv);
  } catch (...) {
    std::fputs("zarn: stopped by an internal error\n", stderr);
    return kRunFailed;
  }
}
