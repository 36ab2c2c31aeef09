// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gdal_priv.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace zarn::testsupport {

struct CloseDataset {
  void operator()(GDALDataset* dataset) const { GDALClose(dataset); }
};
using OpenDataset = std::unique_ptr<GDALDataset, CloseDataset>;

/// Opens a raster; fails the test with an exception when it cannot.
OpenDataset OpenImage(const std::string& file);

/// A small raster in memory. Doubles hold every sample type that the program accepts.
struct Image {
  int width = 0;
  int height = 0;
  int bands = 1;
  GDALDataType type = GDT_Byte;
  bool signedByte = false;
  std::vector<double> values = {};  ///< pixel-interleaved

  Image(int columns, int rows, int bandCount, GDALDataType sampleType)
      : width(columns), height(rows), bands(bandCount), type(sampleType) {
    values.resize(static_cast<std::size_t>(columns) * static_cast<std::size_t>(rows) *
                  static_cast<std::size_t>(bandCount));
  }

  double& At(int x, int y, int band) { return values[Index(x, y, band)]; }
  double At(int x, int y, int band) const { return values[Index(x, y, band)]; }
  bool AllBands(int x, int y, double value) const;

 private:
  std::size_t Index(int x, int y, int band) const {
    return (static_cast<std::size_t>(y) * static_cast<std::size_t>(width) +
            static_cast<std::size_t>(x)) *
               static_cast<std::size_t>(bands) +
           static_cast<std::size_t>(band);
  }
};

/// Noise over most of the sample type's range (for floats, numbers whose sums are exact), with
/// patches in which all bands are `patch` and pixels in which only the first is.
Image NoiseImage(int width, int height, int bands, GDALDataType type, std::optional<double> patch,
                 std::uint64_t seed);

/// Adds to a dataset what the pixels alone do not say.
using Decorate = std::function<void(GDALDataset&)>;

/// Writes a GeoTIFF.
void Write(const Image& image, const std::string& file,
           const std::vector<std::string>& options = {}, const Decorate& decorate = nullptr);
Decorate DeclareNoData(double value);

/// All bands of a raster; signed bytes come out signed.
Image Read(const std::string& file);

/// The mean over the valid pixels of the window around each valid pixel, clipped at the edge, moved
/// off `avoided`; other pixels are copied. Sums run row by row.
Image ReferenceMean(const Image& image, int size, const std::function<bool(int x, int y)>& isValid,
                    std::optional<double> avoided = std::nullopt);

/// The first pixel in which the images differ (NaN equals NaN), or an empty text.
std::string Difference(const Image& expected, const Image& actual);

}  // namespace zarn::testsupport
