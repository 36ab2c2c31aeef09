// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/cutlinewriter.h"

#include <cpl_error.h>
#include <ogr_geometry.h>
#include <ogrsf_frmts.h>

#include <array>
#include <cmath>
#include <cstddef>
#include <memory>
#include <utility>

#include "apps/zarn/dataset.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/stagedoutput.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {
namespace {

using Ring = std::vector<std::array<double, 2>>;

bool Encloses(const Ring& ring, const std::array<double, 2>& p) {
  bool inside = false;
  for (std::size_t i = 0; i + 1 < ring.size(); ++i) {
    const auto& [x0, y0] = ring[i];
    const auto& [x1, y1] = ring[i + 1];
    if ((y0 > p[1]) != (y1 > p[1]) && p[0] < x0 + (x1 - x0) * (p[1] - y0) / (y1 - y0)) {
      inside = !inside;
    }
  }
  return inside;
}

// Each outer ring, followed by its holes.
std::vector<std::vector<const Ring*>> SortRings(const ScenePolygon& polygon) {
  std::vector<std::vector<const Ring*>> parts;
  for (const Ring& ring : polygon.rings) {
    if (RingArea(ring) > 0) parts.push_back({&ring});
  }
  for (const Ring& ring : polygon.rings) {
    if (RingArea(ring) > 0) continue;
    // Rings may touch in vertices, but not in the middle of an edge.
    const std::array<double, 2> middle{(ring[0][0] + ring[1][0]) / 2,
                                       (ring[0][1] + ring[1][1]) / 2};
    std::vector<const Ring*>* around = nullptr;
    for (auto& part : parts) {
      if (!Encloses(*part.front(), middle)) continue;
      if (around == nullptr || RingArea(*part.front()) < RingArea(*around->front())) around = &part;
    }
    if (around != nullptr) around->push_back(&ring);
  }
  return parts;
}

// Outer rings run anticlockwise on the map, holes clockwise.
OGRMultiPolygon ToMap(const ScenePolygon& polygon, const std::array<double, 6>& transform) {
  const bool isMirrored = transform[1] * transform[5] - transform[2] * transform[4] < 0;
  OGRMultiPolygon area;
  for (const auto& part : SortRings(polygon)) {
    auto map = std::make_unique<OGRPolygon>();
    for (const Ring* const ring : part) {
      auto line = std::make_unique<OGRLinearRing>();
      for (const auto& [column, row] : *ring) {
        line->addPoint(transform[0] + column * transform[1] + row * transform[2],
                       transform[3] + column * transform[4] + row * transform[5]);
      }
      // Clockwise as seen with y pointing down is anticlockwise in the numbers themselves.
      if (isMirrored) line->reversePoints();
      map->addRingDirectly(line.release());
    }
    area.addGeometryDirectly(map.release());
  }
  return area;
}

DatasetPtr CreateDataset(const std::string& file, const std::string& name) {
  GDALDriver* const driver = GetGDALDriverManager()->GetDriverByName("GPKG");
  if (driver == nullptr) FailWriting(name, "this GDAL has no driver for GeoPackage");
  CPLErrorReset();
  DatasetPtr dataset(driver->Create(file.c_str(), 0, 0, 0, GDT_Unknown, nullptr));
  if (!dataset) FailWriting(name, LastGdalMessage(name));
  return dataset;
}

OGRLayer& CreateLayer(GDALDataset& dataset, const OutputGrid& grid, const std::string& name) {
  OGRSpatialReference crs(grid.crs);
  crs.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
  CPLErrorReset();
  OGRLayer* const layer =
      dataset.CreateLayer("cutlines", crs.IsEmpty() ? nullptr : &crs, wkbMultiPolygon, nullptr);
  OGRFieldDefn scene("scene", OFTString);
  OGRFieldDefn order("order", OFTInteger);
  if (layer == nullptr || layer->CreateField(&scene) != OGRERR_NONE ||
      layer->CreateField(&order) != OGRERR_NONE) {
    FailWriting(name, LastGdalMessage(name));
  }
  return *layer;
}

}  // namespace

void WriteCutlines(const std::string& target, bool overwrite, const OutputGrid& grid,
                   const std::vector<std::string>& sceneNames,
                   const std::vector<ScenePolygon>& polygons) {
  RefuseReplacingInputs(target, {target});
  StagingFolder staging(target, overwrite);
  const std::string name = staging.Target().string();
  RenameInMessages(staging.StagedFile().string(), name);
  DatasetPtr dataset = CreateDataset(staging.StagedFile().string(), name);
  OGRLayer& layer = CreateLayer(*dataset, grid, name);
  // One transaction, which is many times faster than one per feature.
  dataset->StartTransaction();
  for (std::size_t i = 0; i < polygons.size(); ++i) {
    OGRFeature feature(layer.GetLayerDefn());
    feature.SetField("scene", sceneNames[i].c_str());
    feature.SetField("order", static_cast<int>(i) + 1);
    const OGRMultiPolygon area = ToMap(polygons[i], grid.transform);
    feature.SetGeometry(&area);
    CPLErrorReset();
    if (layer.CreateFeature(&feature) != OGRERR_NONE) FailWriting(name, LastGdalMessage(name));
  }
  if (dataset->CommitTransaction() != OGRERR_NONE) FailWriting(name, LastGdalMessage(name));
  CloseChecked(std::move(dataset), name);
  staging.Publish();
}

}  // namespace zarn::app
