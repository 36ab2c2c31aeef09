// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/sourcelocator.h"

#include <cpl_error.h>
#include <cpl_string.h>
#include <gdal_alg.h>

#include <cmath>
#include <limits>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/wkt.h"

namespace zarn::app {
namespace {

// GDAL counts failures of single points as errors of its own, which would reach the terminal.
class QuietGdal {
 public:
  QuietGdal() { CPLPushErrorHandler(CPLQuietErrorHandler); }
  ~QuietGdal() { CPLPopErrorHandler(); }
  QuietGdal(const QuietGdal&) = delete;
  QuietGdal& operator=(const QuietGdal&) = delete;
};

// The system of the coordinates that the source itself refers to.
OGRSpatialReference CrsOf(GDALDataset& source) {
  OGRSpatialReference crs;
  if (source.GetSpatialRef() != nullptr) {
    crs = *source.GetSpatialRef();
  } else if (source.GetGCPCount() > 0 && source.GetGCPSpatialRef() != nullptr) {
    crs = *source.GetGCPSpatialRef();
  } else if (source.GetMetadata("RPC") != nullptr || source.GetMetadata("GEOLOCATION") != nullptr) {
    crs.SetWellKnownGeogCS("WGS84");
  }
  return crs;
}

// GDAL would take places for pixels, or coordinates of one system for those of another.
void RequirePlace(const RasterSource& source, bool needsCrs) {
  GDALDataset& dataset = source.Dataset();
  double transform[6];
  if (dataset.GetGeoTransform(transform) != CE_None && dataset.GetGCPCount() == 0 &&
      dataset.GetMetadata("RPC") == nullptr && dataset.GetMetadata("GEOLOCATION") == nullptr) {
    throw RunError("cannot resample " + source.Name() +
                   ": it does not say where it lies; give it an extent (gdal_edit.py -a_ullr) or "
                   "control points (gdal_translate -gcp)");
  }
  if (needsCrs && CrsOf(dataset).IsEmpty()) {
    throw RunError("cannot resample " + source.Name() +
                   ": it names no coordinate system to come from; give it one with gdal_edit.py "
                   "-a_srs");
  }
}

}  // namespace

void SourceLocator::Destroyer::operator()(void* transformer) const {
  GDALDestroyGenImgProjTransformer(transformer);
}

SourceLocator::SourceLocator(const RasterSource& source, const OGRSpatialReference* crs,
                             const std::string& rpcDem)
    : source_(source), crs_(crs == nullptr ? CrsOf(source.Dataset()) : *crs) {
  RequirePlace(source, crs != nullptr);
  crs_.SetAxisMappingStrategy(OAMS_TRADITIONAL_GIS_ORDER);
  CPLStringList options;
  if (crs != nullptr) options.SetNameValue("DST_SRS", WktOf(crs_).c_str());
  if (!rpcDem.empty()) {
    if (source.Dataset().GetMetadata("RPC") == nullptr) {
      throw UsageError("--rpc-dem: " + source.Name() + " has no RPC model that would need heights");
    }
    OpenRaster(rpcDem);
    options.SetNameValue("METHOD", "RPC");
    options.SetNameValue("RPC_DEM", rpcDem.c_str());
  }
  CPLErrorReset();
  transformer_.reset(GDALCreateGenImgProjTransformer2(&source.Dataset(), nullptr, options.List()));
  if (!transformer_) {
    throw RunError("cannot resample " + source.Name() + ": " + LastGdalMessage(source.Name()));
  }
}

OutputGrid SourceLocator::SuggestGrid() const {
  OutputGrid grid;
  double extent[4];
  CPLErrorReset();
  if (GDALSuggestedWarpOutput2(&source_.Dataset(), GDALGenImgProjTransform, transformer_.get(),
                               grid.transform.data(), &grid.width, &grid.height, extent,
                               0) != CE_None) {
    throw RunError("cannot tell which area " + source_.Name() +
                   " covers in the wanted coordinate system: " + LastGdalMessage(source_.Name()));
  }
  grid.crs = crs_;
  return grid;
}

void SourceLocator::SetGrid(const OutputGrid& grid) {
  GDALSetGenImgProjTransformerDstGeoTransform(transformer_.get(), grid.transform.data());
}

void SourceLocator::Locate(std::vector<double>& x, std::vector<double>& y) const {
  const QuietGdal quiet;
  std::vector<double> z(x.size(), 0.0);
  std::vector<int> found(x.size(), FALSE);
  GDALGenImgProjTransform(transformer_.get(), TRUE, static_cast<int>(x.size()), x.data(), y.data(),
                          z.data(), found.data());
  for (std::size_t i = 0; i < x.size(); ++i) {
    if (found[i] != FALSE && std::isfinite(x[i]) && std::isfinite(y[i])) continue;
    x[i] = y[i] = std::numeric_limits<double>::quiet_NaN();
  }
}

}  // namespace zarn::app
