// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/mosaicreport.h"

#include <fstream>
#include <system_error>

#include "apps/zarn/errors.h"
#include "apps/zarn/mosaic/reportpage.h"
#include "apps/zarn/stagedoutput.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

std::string MakePage(const MosaicOptions& options, const Planning& planning,
                     const SourceTally& sources) {
  ReportContents contents;
  contents.width = sources.Grid().Width();
  contents.height = sources.Grid().Height();
  contents.pixels = sources.Counts();
  contents.figures = MeasureAgreement(planning);
  contents.colours = SceneColours(planning.plan.scenes.size(), contents.figures.before.seams);
  contents.map = DataUri(RenderSources(sources, contents.colours), PictureKind::kDrawing);
  contents.seams = SeamPath(planning.plan, sources);
  const Sampling before = SamplePaste(*planning.survey, sources.Grid());
  const Stretch stretch = StretchFor(before);
  contents.before = DataUri(Render(before, stretch), PictureKind::kPhotograph);
  contents.after = DataUri(Render(SampleMosaic(options.output.target, sources), stretch),
                           PictureKind::kPhotograph);
  return ReportPage(options, planning, contents);
}

}  // namespace

fs::path ReportFile(const std::string& folder) { return fs::path(folder) / "index.html"; }

MosaicReport::NewFolders::NewFolders(const fs::path& folder) {
  std::error_code error;
  for (fs::path path = fs::absolute(folder); !fs::exists(path, error) && path.has_relative_path();
       path = path.parent_path()) {
    // (a trailing slash makes an empty name)
    if (path.has_filename()) created_.push_back(path);
  }
  fs::create_directories(folder, error);
  if (fs::is_directory(folder)) return;
  throw RunError("cannot create the folder " + folder.string() +
                 " for the report: " + (error ? error.message() : "there is a file of this name"));
}

MosaicReport::NewFolders::~NewFolders() {
  std::error_code error;
  for (const fs::path& path : created_) fs::remove(path, error);
}

MosaicReport::MosaicReport(const MosaicOptions& options)
    : options_(options),
      folders_(options.report),
      staging_(ReportFile(options.report), options.output.overwrite) {}

void MosaicReport::Begin(const MosaicPlan& plan) {
  sources_.emplace(plan.grid, plan.scenes.size());
}

void MosaicReport::Take(const TilePlan& tile, const TileBuffers& buffers) {
  sources_->Take(tile.window, buffers.map);
}

void MosaicReport::Publish(const Planning& planning) {
  const std::string page = MakePage(options_, planning, *sources_);
  std::ofstream file(staging_.StagedFile(), std::ios::binary);
  file << page;
  file.close();
  if (!file) FailWriting(staging_.Target().string(), "");
  staging_.Publish();
}

}  // namespace zarn::app
