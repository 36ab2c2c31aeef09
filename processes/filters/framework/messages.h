// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace zarn::processes::filters::messages {

// Texts that more than one family returns.
inline constexpr const char* kSizesDiffer =
    "Input and output rasters must be the same size (excluding margins).";
inline constexpr const char* kMarginsTooSmall = "Raster Margins are too small.";
inline constexpr const char* kTypesDiffer =
    "Input and output rasters must have the same data type and number of channels.";
inline constexpr const char* kFewNoDataValues = "Fewer no-data values than channels.";
inline constexpr const char* kFewParameters = "Fewer parameters than channels.";
inline constexpr const char* kInconsistentBlock =
    "Raster block has no data or an inconsistent size.";
inline constexpr const char* kUnknownBalancedType =
    "Unknown raster block data type for color balancing";
inline constexpr const char* kUnknownMedianType =
    "Unknown raster block data type for median filter.";
inline constexpr const char* kOverlap = "Input and output rasters overlap.";

}  // namespace zarn::processes::filters::messages
