// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <optional>

#include "host/datasources/basicwriter.h"
#include "host/datasources/irasterreader.h"
#include "processes/filters/enhancement/cellgrid.h"
#include "processes/filters/enhancement/glutparameters.h"

namespace zarn::processes::filters {

// A saved matrix is two rasters with a pixel for each cell: a byte that names its class (0 no data,
// 1 valid, 2 invalid, 3 masked), and floats with gain and offset of each channel in turn. The
// parameters are metadata of both.

/// The parameters as metadata, with classes and colours.
datasources::AuxiliaryData DescribeGrid(const GLUTParameters& parameters,
                                        const ogc::cs::GeocodingInfo& geocoding);
void WriteClasses(const CellGrid& grid, const datasources::AuxiliaryData& auxiliary,
                  datasources::BasicWriter& writer);
void WriteCoefficients(const CellGrid& grid, datasources::AuxiliaryData auxiliary,
                       datasources::BasicWriter& writer);

/// The parameters from metadata; nothing when some are missing or make no sense.
std::optional<GLUTParameters> ReadParameters(const datasources::IRasterReader& classes,
                                             const datasources::IRasterReader& coefficients);
/// Reads the cells of a grid of the same size. Exceptions of the readers pass through.
void ReadCells(datasources::IRasterReader& classes, datasources::IRasterReader& coefficients,
               CellGrid& grid);

}  // namespace zarn::processes::filters
