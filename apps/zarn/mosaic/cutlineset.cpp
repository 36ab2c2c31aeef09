// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/cutlineset.h"

#include <cpl_error.h>
#include <ogrsf_frmts.h>

#include <filesystem>
#include <map>
#include <set>
#include <utility>

#include "apps/zarn/cutlinefile.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"

namespace zarn::app {
namespace {

std::string Quoted(const std::string& text, char quote) {
  std::string quoted(1, quote);
  for (const char c : text) quoted += c == quote ? std::string(2, quote) : std::string(1, c);
  return quoted + quote;
}

// The values of the field, each once.
std::set<std::string> ValuesOf(const std::string& file, const std::string& field) {
  CPLErrorReset();
  const DatasetPtr dataset(
      GDALDataset::Open(file.c_str(), GDAL_OF_VECTOR | GDAL_OF_READONLY | GDAL_OF_VERBOSE_ERROR));
  if (!dataset) throw RunError("cannot open " + file + ": " + LastGdalMessage(file));
  if (dataset->GetLayerCount() != 1) {
    throw RunError(file + " has " + std::to_string(dataset->GetLayerCount()) +
                   " layers; give cutlines as a file of one (ogr2ogr cutlines.gpkg " + file +
                   " LAYER)");
  }
  OGRLayer& layer = *dataset->GetLayer(0);
  const int index = layer.GetLayerDefn()->GetFieldIndex(field.c_str());
  if (index < 0) {
    std::string fields;
    const OGRFeatureDefn& known = *layer.GetLayerDefn();
    for (int i = 0; i < known.GetFieldCount(); ++i) {
      fields += (i == 0 ? "" : ", ") + std::string(known.GetFieldDefn(i)->GetNameRef());
    }
    throw UsageError(file + " has no field '" + field +
                     "' that says which scene a cutline is for; name it with --cutline-id" +
                     (fields.empty() ? "" : ": " + fields));
  }
  std::set<std::string> values;
  for (const auto& feature : layer) values.insert(feature->GetFieldAsString(index));
  return values;
}

Polygon PolygonOf(const processes::filters::PolygonParam& param) {
  Polygon polygon;
  polygon.vertices.assign(param.vertices, param.vertices + std::size_t{2} * param.vertexCount);
  polygon.starts = {0};
  if (param.parts != nullptr) {
    polygon.starts.assign(param.parts + 1, param.parts + 1 + param.parts[0]);
  }
  return polygon;
}

// Whether a polygon has to do with the pixels of a window: one of its edges runs through them, or
// they lie inside altogether.
bool Reaches(const Polygon& polygon, const Window& window) {
  // Edges that run along the border from outside do not count.
  constexpr double kInset = 0.25;
  const double left = static_cast<double>(window.x) + kInset;
  const double top = static_cast<double>(window.y) + kInset;
  const double right = static_cast<double>(window.x + window.width) - kInset;
  const double bottom = static_cast<double>(window.y + window.height) - kInset;
  OGRLinearRing border;
  for (const auto& [x, y] : {std::pair{left, top}, {right, top}, {right, bottom}, {left, bottom}}) {
    border.addPoint(x, y);
  }
  border.closeRings();
  OGRPolygon pixels;
  pixels.addRing(&border);
  const OGRPoint corner(left, top);
  bool inside = false;
  for (std::size_t i = 0; i < polygon.starts.size(); ++i) {
    const auto begin = static_cast<std::size_t>(polygon.starts[i]);
    const std::size_t end = i + 1 < polygon.starts.size()
                                ? static_cast<std::size_t>(polygon.starts[i + 1])
                                : polygon.vertices.size() / 2;
    OGRLinearRing ring;
    for (std::size_t k = begin; k < end; ++k) {
      ring.addPoint(polygon.vertices[2 * k], polygon.vertices[2 * k + 1]);
    }
    ring.closeRings();
    OGRLineString edges;
    edges.addSubLineString(&ring);
    if (edges.Intersects(&pixels) != FALSE) return true;
    inside ^= ring.isPointInRing(&corner) != FALSE;
  }
  return inside;
}

[[noreturn]] void RefuseShared(const std::string& file, const std::string& name,
                               const std::string& one, const std::string& other) {
  throw RunError("the cutline '" + name + "' in " + file + " may be that of " + one + " or of " +
                 other + "; name them by their paths");
}

[[noreturn]] void RefuseMissing(const std::string& file, const std::string& key,
                                const ScenePlan& scene) {
  throw RunError(file + " has no cutline for " + scene.File() + ": none whose " + key + " is '" +
                 scene.label + "'; add one, or leave the scene out");
}

}  // namespace

void AssignCutlines(const std::string& file, const std::string& field, const RasterSource& mosaic,
                    bool partial, std::vector<ScenePlan>& scenes) {
  const std::string key = field.empty() ? "scene" : field;
  const std::set<std::string> values = ValuesOf(file, key);
  std::map<std::string, std::string> owners;
  for (ScenePlan& scene : scenes) {
    std::string where;
    for (const std::string& name :
         {scene.label, std::filesystem::path(scene.File()).filename().string(), scene.File()}) {
      if (!values.contains(name)) continue;
      const auto [other, fresh] = owners.emplace(name, scene.File());
      if (!fresh) {
        RefuseShared(file, name, other->second, scene.File());
      }
      where = Quoted(key, '"') + " = " + Quoted(name, '\'');
      break;
    }
    if (where.empty()) {
      RefuseMissing(file, key, scene);
    }
    const RasterPolygon polygon = LoadCutline({.file = file, .layer = {}, .where = where}, mosaic);
    scene.cutline = PolygonOf(polygon.Param());
    if (!partial && !Reaches(scene.cutline, scene.covers)) {
      throw RunError("the cutline of " + scene.File() + " in " + file +
                     " misses it; compare their extents with gdalinfo and ogrinfo, or leave the "
                     "scene out");
    }
  }
}

}  // namespace zarn::app
