// SPDX-License-Identifier: Apache-2.0
#include "host/vector/gdbgeometryif.h"

GDBGeometryIF::~GDBGeometryIF() = default;

void GDBGeometryIF::FillShape(GDBShape& /*shape*/) const {}

void ConvertGeometryToGDBShape(const GDBGeometryIF* geometry, GDBShape* shape) {
  geometry->FillShape(*shape);
}
