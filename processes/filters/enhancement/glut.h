// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "host/datasources/irasterreader.h"
#include "processes/filters/enhancement/glutparameters.h"
#include "processes/filters/enhancement/igeolutmatrix.h"
#include "processes/filters/filtersexport.h"

// NOLINTNEXTLINE(readability-identifier-naming): hosts know it by this name
namespace zarn::processes::filters::GLUT {

/// A new matrix, which the caller owns. Null when the pixel depth is neither 8 nor 16, when a size
/// of the grid or the channel count is negative, or when the cells would take more than 4 GiB.
ZARN_FILTERS_EXPORT IGeoLUTMatrix* GetGLUTMatrix(const GLUTParameters& parameters);

/// A new matrix with the cells that `IGeoLUTMatrix::WriteDiagnosticRaster` wrote. Null when either
/// raster is missing or the two are not such a pair; exceptions of the readers pass through.
ZARN_FILTERS_EXPORT IGeoLUTMatrix* GetGLUTMatrix(datasources::IRasterReader* classes,
                                                 datasources::IRasterReader* coefficients);

}  // namespace zarn::processes::filters::GLUT
