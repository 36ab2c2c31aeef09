// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/sample.h"

#include <cpl_conv.h>
#include <cpl_json.h>
#include <gdal_priv.h>
#include <ogrsf_frmts.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <system_error>
#include <vector>

#include "apps/zarn/dataset.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/landscape.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/scene.h"
#include "apps/zarn/stagedoutput.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {
namespace fs = std::filesystem;
namespace {

constexpr std::uint32_t kDefaultSeed = 3;

// The upper left corner of the landscape, UTM zone 33 north; a pixel is one metre.
constexpr int kEpsg = 32633;
constexpr double kEasting = 512000.0;
constexpr double kNorthing = 5391000.0;

enum File : std::size_t {
  kTruthBytes,
  kTruthWords,
  kFirstBytes,
  kFirstWords,
  kSecondBytes,
  kSecondWords,
  kCutline,
  kParameters,
  kFiles,
};

struct FileEntry {
  const char* name;
  const char* purpose;
};

constexpr std::array<FileEntry, kFiles> kEntries{{
    {"truth_u8.tif", "the whole area, undisturbed, 8 bits"},
    {"truth_u16.tif", "the same, 12 of 16 bits"},
    {"scene1_u8.tif", "left scene: hazy, hot spot, outliers, no-data collar, 8 bits"},
    {"scene1_u16.tif", "the same, 12 of 16 bits"},
    {"scene2_u8.tif", "right scene, overlapping: other colours, hot spot, 8 bits"},
    {"scene2_u16.tif", "the same, 12 of 16 bits"},
    {"cutline.gpkg", "polygon through which scene 2 is pasted onto scene 1"},
    {"sample.json", "what disturbs the scenes: gain, offset, hot spot, noise"},
}};

struct SampleOptions {
  std::string folder;
  std::uint32_t seed = kDefaultSeed;
  bool overwrite = false;
  bool quiet = false;
};

// The folder for the sample. One that did not exist before goes again unless it is kept.
class TargetFolder {
 public:
  explicit TargetFolder(const fs::path& path) {
    std::error_code error;
    for (fs::path folder = fs::absolute(path);
         !fs::exists(folder, error) && folder.has_relative_path(); folder = folder.parent_path()) {
      created_ = folder;
    }
    fs::create_directories(path, error);
    if (error || !fs::is_directory(path)) {
      throw RunError("cannot create the folder " + path.string() + ": " +
                     (error ? error.message() : "it is a file") + "; name another");
    }
    if (!created_.empty()) removal_.emplace(created_);
  }
  ~TargetFolder() {
    std::error_code error;
    if (!created_.empty()) fs::remove_all(created_, error);
  }
  TargetFolder(const TargetFolder&) = delete;
  TargetFolder& operator=(const TargetFolder&) = delete;

  void Keep() {
    removal_.reset();
    created_.clear();
  }

 private:
  fs::path created_;  // the outermost folder that had to be created
  std::optional<RemoveWhenInterrupted> removal_;
};

DatasetPtr Create(const char* driver, const StagingFolder& file, const Window& size, int bands,
                  GDALDataType type, const CPLStringList& options) {
  CPLErrorReset();
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName(driver)->Create(
      file.StagedFile().c_str(), static_cast<int>(size.width), static_cast<int>(size.height), bands,
      type, options.List()));
  if (!dataset) FailWriting(file.Target().string(), LastGdalMessage(file.StagedFile().string()));
  return dataset;
}

OGRSpatialReference Projection() {
  OGRSpatialReference projection;
  CPLErrorReset();
  if (projection.importFromEPSG(kEpsg) != OGRERR_NONE) {
    throw RunError("cannot look up EPSG:" + std::to_string(kEpsg) + ": " + LastGdalMessage());
  }
  projection.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
  return projection;
}

template <typename T>
void WriteRaster(const StagingFolder& file, const Window& window, std::vector<T>& samples,
                 bool hasNoData) {
  constexpr int kBands = 3;
  constexpr GDALDataType kType = sizeof(T) == 1 ? GDT_Byte : GDT_UInt16;
  CPLStringList options;
  options.SetNameValue("TILED", "YES");
  options.SetNameValue("COMPRESS", "DEFLATE");
  options.SetNameValue("ZLEVEL", "1");
  options.SetNameValue("PREDICTOR", "2");
  options.SetNameValue("PHOTOMETRIC", "RGB");
  const std::string name = file.Target().string();
  DatasetPtr dataset = Create("GTiff", file, window, kBands, kType, options);

  std::array<double, 6> transform{kEasting + static_cast<double>(window.x),  1.0, 0.0,
                                  kNorthing - static_cast<double>(window.y), 0.0, -1.0};
  const OGRSpatialReference projection = Projection();
  CPLErr state =
      std::max(dataset->SetGeoTransform(transform.data()), dataset->SetSpatialRef(&projection));
  constexpr std::array<const char*, kBands> kNames{"red", "green", "blue"};
  for (int band = 1; band <= kBands; ++band) {
    GDALRasterBand& target = *dataset->GetRasterBand(band);
    target.SetDescription(kNames[static_cast<std::size_t>(band - 1)]);
    if (hasNoData) state = std::max(state, target.SetNoDataValue(0.0));
  }
  const auto width = static_cast<int>(window.width);
  const auto height = static_cast<int>(window.height);
  constexpr GSpacing kSample = sizeof(T);
  state = std::max(state, dataset->RasterIO(GF_Write, 0, 0, width, height, samples.data(), width,
                                            height, kType, kBands, nullptr, kBands * kSample,
                                            kBands * kSample * width, kSample, nullptr));
  if (state != CE_None) FailWriting(name, LastGdalMessage(file.StagedFile().string()));
  CloseChecked(std::move(dataset), name);
}

void WriteCutline(const StagingFolder& file, const std::vector<Vec>& ring) {
  // Without a fixed date no two files would be alike.
  const CPLConfigOptionSetter date("OGR_CURRENT_DATE", "2000-01-01T00:00:00.000Z", false);
  const std::string name = file.Target().string();
  DatasetPtr dataset = Create("GPKG", file, {}, 0, GDT_Unknown, {});
  const auto require = [&](bool done) {
    if (!done) FailWriting(name, LastGdalMessage(file.StagedFile().string()));
  };
  OGRSpatialReference projection = Projection();
  OGRLayer* const layer = dataset->CreateLayer("cutline", &projection, wkbPolygon);
  require(layer != nullptr);
  OGRFieldDefn field("scene", OFTString);
  require(layer->CreateField(&field) == OGRERR_NONE);

  auto exterior = std::make_unique<OGRLinearRing>();
  for (const Vec vertex : ring) exterior->addPoint(kEasting + vertex.x, kNorthing - vertex.y);
  OGRPolygon polygon;
  polygon.addRingDirectly(exterior.release());
  OGRFeature feature(layer->GetLayerDefn());
  feature.SetField("scene", "scene2");
  require(feature.SetGeometry(&polygon) == OGRERR_NONE);
  require(layer->CreateFeature(&feature) == OGRERR_NONE);
  CloseChecked(std::move(dataset), name);
}

CPLJSONArray ToJson(const Color& color, double scale) {
  CPLJSONArray array;
  for (const double value : color) array.Add(value * scale);
  return array;
}

CPLJSONArray ToJson(double first, double second) {
  CPLJSONArray array;
  array.Add(first);
  array.Add(second);
  return array;
}

CPLJSONObject Describe(const Radiometry& radiometry, const char* file, double scale) {
  CPLJSONObject object;
  object.Add("file", file);
  object.Add("gain", ToJson(radiometry.gain, 1.0));
  object.Add("offset", ToJson(radiometry.offset, scale));
  const HotSpot& spot = radiometry.hotSpot;
  CPLJSONObject hotSpot;
  hotSpot.Add("centre", ToJson(kEasting + spot.centre.x, kNorthing - spot.centre.y));
  hotSpot.Add("radii", ToJson(spot.radii.x, spot.radii.y));
  hotSpot.Add("strength", ToJson(spot.strength, scale));
  object.Add("hot_spot", hotSpot);
  object.Add("noise_deviation", radiometry.noise * scale);
  return object;
}

void WriteParameters(const StagingFolder& file, std::uint32_t seed,
                     const std::array<Scene, 2>& scenes) {
  CPLJSONDocument document;
  CPLJSONObject root = document.GetRoot();
  root.Add("seed", static_cast<GInt64>(seed));
  root.Add("model",
           "scene = gain * truth + offset + strength * (1 - r^2) + noise, per channel "
           "(red, green, blue); r^2 = ((x - centre_x) / radius_x)^2 + ((y - centre_y) / "
           "radius_y)^2, x and y being map coordinates of the pixel's centre. Outliers, at most "
           "one in every 16 x 16 pixels, replace all channels.");
  CPLJSONArray list;
  list.Add(Describe(scenes[0].Radiometry(), kEntries[kFirstBytes].name, 1.0));
  list.Add(Describe(scenes[0].Radiometry(), kEntries[kFirstWords].name, kWordScale));
  list.Add(Describe(scenes[1].Radiometry(), kEntries[kSecondBytes].name, 1.0));
  list.Add(Describe(scenes[1].Radiometry(), kEntries[kSecondWords].name, kWordScale));
  root.Add("scenes", list);
  CPLErrorReset();
  if (!document.Save(file.StagedFile().string())) {
    FailWriting(file.Target().string(), LastGdalMessage(file.StagedFile().string()));
  }
}

void PublishAll(const std::vector<std::unique_ptr<StagingFolder>>& files) try {
  for (const auto& file : files) file->Publish();
} catch (...) {
  for (const auto& file : files) file->Withdraw();
  throw;
}

void WriteSample(const SampleOptions& options) {
  if (options.quiet) SilenceWarnings();
  SetGdalThreads(0);
  const fs::path folder(options.folder);
  TargetFolder target(folder);
  std::vector<std::unique_ptr<StagingFolder>> files;
  files.reserve(kFiles);
  for (const FileEntry& entry : kEntries) {
    files.push_back(std::make_unique<StagingFolder>(folder / entry.name, options.overwrite));
  }

  TerminalProgress progress(options.quiet);
  progress.Update(0.0);
  const Landscape landscape(options.seed);
  const std::array<Scene, 2> scenes = MakeScenes(options.seed);
  progress.Update(0.1);
  const Land land = RenderLand(landscape, {0, 0, Landscape::kWidth, Landscape::kHeight});
  progress.Update(0.4);

  const auto write = [&](File bytes, File words, Picture picture, bool hasNoData, double done) {
    WriteRaster(*files[bytes], picture.window, picture.bytes, hasNoData);
    WriteRaster(*files[words], picture.window, picture.words, hasNoData);
    progress.Update(done);
  };
  write(kTruthBytes, kTruthWords, RenderTruth(land), false, 0.6);
  write(kFirstBytes, kFirstWords, RenderScene(scenes[0], land, scenes[0].Extent()), true, 0.8);
  write(kSecondBytes, kSecondWords, RenderScene(scenes[1], land, scenes[1].Extent()), true, 0.95);
  WriteCutline(*files[kCutline], MakeCutline(options.seed, scenes));
  WriteParameters(*files[kParameters], options.seed, scenes);

  {
    const HoldInterruptions untilAllAreInPlace;
    PublishAll(files);
    files.clear();
    target.Keep();
  }
  progress.Update(1.0);
}

void PrintFiles(const fs::path& folder) {
  for (const FileEntry& entry : kEntries) {
    std::printf("%-24s %s\n", (folder / entry.name).c_str(), entry.purpose);
  }
}

}  // namespace

void AddSampleCommand(CLI::App& app) {
  CLI::App& command =
      *app.add_subcommand("sample", "Writes generated aerial scenes to try the other commands on");
  const auto options = std::make_shared<SampleOptions>();
  command.add_option("DIR", options->folder, "Folder to write to; created if missing")->required();
  command.add_option("--seed", options->seed, "Number from which the landscape is made")
      ->check(
          CLI::Range(std::uint32_t{0}, std::numeric_limits<std::uint32_t>::max()).description("N"))
      ->capture_default_str();
  command.add_flag("--overwrite", options->overwrite, "Replace the files if they exist");
  command.add_flag("-q,--quiet", options->quiet, "No progress, no list of files, no warnings");
  command.callback([options] {
    WriteSample(*options);
    if (!options->quiet) PrintFiles(options->folder);
  });
  std::string footer =
      "Two overlapping scenes of the same farmland, each with its own colours, a hot spot, "
      "outliers, noise and a no-data collar (0), with the undisturbed truth beside them. The same "
      "seed gives the same pixels everywhere.\n\nFiles:\n";
  for (const FileEntry& entry : kEntries) {
    footer += "  " + std::string(entry.name) +
              std::string(16 - std::string(entry.name).size(), ' ') + entry.purpose + "\n";
  }
  command.footer(footer + "\nExample:\n  zarn sample demo");
}

}  // namespace zarn::app
