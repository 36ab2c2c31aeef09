// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/wkt.h"

#include <cpl_conv.h>

namespace zarn::app {

std::string WktOf(const OGRSpatialReference& crs) {
  if (crs.IsEmpty()) return {};
  char* text = nullptr;
  const char* const options[] = {"FORMAT=WKT2_2018", nullptr};
  if (crs.exportToWkt(&text, options) != OGRERR_NONE) return {};
  std::string wkt = text;
  CPLFree(text);
  return wkt;
}

}  // namespace zarn::app
