// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/mosaicfile.h"

#include <cpl_error.h>

#include <array>
#include <utility>
#include <vector>

#include "apps/zarn/blockreader.h"
#include "apps/zarn/carryover.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/progress.h"
#include "apps/zarn/sourcemaptype.h"

namespace zarn::app {
namespace {

CPLErr MoveMap(GDALRWFlag direction, GDALDataset& dataset, const Window& window, const Plane& map,
               GDALDataType type) {
  return dataset.GetRasterBand(1)->RasterIO(
      direction, static_cast<int>(window.x), static_cast<int>(window.y),
      static_cast<int>(window.width), static_cast<int>(window.height),
      const_cast<std::byte*>(map.Data()), static_cast<int>(window.width),
      static_cast<int>(window.height), type, static_cast<GSpacing>(map.PixelBytes()),
      static_cast<GSpacing>(map.Stride()), nullptr);
}

GDALDataType TypeOfMap(const Plane& map) {
  return map.PixelBytes() == 1 ? GDT_Byte : map.PixelBytes() == 2 ? GDT_UInt16 : GDT_UInt32;
}

}  // namespace

RasterSource GridRaster(const std::string& name, const OutputGrid& grid, const SampleType& type) {
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName("VRT")->Create(
      "", grid.width, grid.height, 1, type.gdal, nullptr));
  if (!dataset) throw RunError("cannot describe " + name + ": " + LastGdalMessage());
  std::array<double, 6> transform = grid.transform;
  dataset->SetGeoTransform(transform.data());
  if (!grid.crs.IsEmpty()) dataset->SetSpatialRef(&grid.crs);
  return RasterSource(name, std::move(dataset));
}

void NameScenes(const MosaicPlan& plan, GDALDataset& map) {
  for (std::size_t i = 0; i < plan.scenes.size(); ++i) {
    map.SetMetadataItem(("SCENE_" + std::to_string(i + 1)).c_str(), plan.scenes[i].label.c_str());
  }
}

MosaicFile::MosaicFile(const MosaicPlan& plan, const RasterSource& like, const OutputGrid& grid,
                       const OutputOptions& image, const std::string& map)
    : image_(image, like, plan.noData, &grid, NeedsMask(like, plan.noData)),
      writer_(like, image_.Dataset(), image_.Name()) {
  if (map.empty()) return;
  const OutputOptions options{.target = map,
                              .format = {},
                              .creation = {},
                              .overwrite = image.overwrite,
                              .apartFromInputs = image.apartFromInputs};
  const RasterSource numbers =
      GridRaster(map, grid, SourceMapType(static_cast<std::int64_t>(plan.scenes.size())));
  map_.emplace(options, numbers, std::vector<double>{0}, &grid);
  NameScenes(plan, map_->Dataset());
}

void MosaicFile::Write(TileBuffers& tile, std::int64_t left, std::int64_t top) {
  Window& window = tile.image.window;
  window.x -= left;
  window.y -= top;
  writer_.Write(tile.image);
  if (map_) WriteMap(tile);
}

void MosaicFile::WriteMap(const TileBuffers& tile) {
  const GdalFailureWatch watch;
  CPLErrorReset();
  if (MoveMap(GF_Write, map_->Dataset(), tile.image.window, tile.map, TypeOfMap(tile.map)) !=
          CE_None ||
      !watch.First().empty()) {
    FailWriting(map_->Name(), LastGdalMessage());
  }
}

void MosaicFile::Annotate(const std::string& key, const std::string& value) {
  image_.Dataset().SetMetadataItem(key.c_str(), value.c_str());
  if (map_) map_->Dataset().SetMetadataItem(key.c_str(), value.c_str());
}

void MosaicFile::Publish(nspio::Counter& progress) {
  // The image last: once it is there, all is complete.
  if (map_) {
    SilentProgress silent;
    map_->Publish(silent);
  }
  image_.Publish(progress);
}

void ReadTile(const RasterSource& image, GDALDataset* map, const Window& window,
              TileBuffers& tile) {
  static const NoDataValues kNone;
  BlockReader reader(image, kNone, {.preparesOutput = false});
  const Window all{0, 0, window.width, window.height};
  reader.Read(all, nullptr, tile.image);
  std::swap(tile.image.samples, tile.image.output);
  tile.image.window = window;
  if (map == nullptr) return;
  tile.map.Shape(window.width, window.height,
                 static_cast<std::size_t>(
                     GDALGetDataTypeSizeBytes(map->GetRasterBand(1)->GetRasterDataType())));
  CPLErrorReset();
  if (MoveMap(GF_Read, *map, all, tile.map, TypeOfMap(tile.map)) != CE_None) {
    throw RunError("cannot read the map beside " + image.Name() + ": " + LastGdalMessage());
  }
}

}  // namespace zarn::app
