// SPDX-License-Identifier: Apache-2.0
#include "tests/apps/zarn/image.h"

#include <cpl_string.h>

#include <algorithm>
#include <cmath>
#include <sstream>
#include <stdexcept>

#include "tests/support/randomnumbers.h"

namespace zarn::testsupport {
namespace {

double Noise(RandomNumbers& random, GDALDataType type) {
  switch (type) {
    case GDT_Byte:
      return random.Below(120);  // also within a signed byte
    case GDT_UInt16:
      return random.Below(65536);
    case GDT_Int16:
      return static_cast<double>(random.Below(65536)) - 32768;
    case GDT_UInt32:
      return random.Below(4294967295U);
    case GDT_Int32:
      return static_cast<double>(random.Below(4294967295U)) - 2147483648.0;
    default:
      return random.Fraction() * 1024;
  }
}

void CheckedIO(GDALDataset& dataset, GDALRWFlag direction, Image& image) {
  const auto sample = static_cast<GSpacing>(sizeof(double));
  if (dataset.RasterIO(direction, 0, 0, image.width, image.height, image.values.data(), image.width,
                       image.height, GDT_Float64, image.bands, nullptr, sample * image.bands,
                       sample * image.bands * image.width, sample, nullptr) != CE_None) {
    throw std::runtime_error(CPLGetLastErrorMsg());
  }
}

bool IsSignedByte(GDALDataset& dataset) {
  const char* const type =
      dataset.GetRasterBand(1)->GetMetadataItem("PIXELTYPE", "IMAGE_STRUCTURE");
  return type != nullptr && EQUAL(type, "SIGNEDBYTE");
}

}  // namespace

OpenDataset OpenImage(const std::string& file) {
  GDALAllRegister();
  OpenDataset dataset(GDALDataset::Open(file.c_str(), GDAL_OF_RASTER));
  if (!dataset) throw std::runtime_error("cannot open " + file);
  return dataset;
}

bool Image::AllBands(int x, int y, double value) const {
  for (int band = 0; band < bands; ++band) {
    if (At(x, y, band) != value) return false;
  }
  return true;
}

Image NoiseImage(int width, int height, int bands, GDALDataType type, std::optional<double> patch,
                 std::uint64_t seed) {
  RandomNumbers random(seed);
  Image image(width, height, bands, type);
  for (double& value : image.values) value = Noise(random, type);
  for (int y = 0; y < height && patch; ++y) {
    for (int x = 0; x < width; ++x) {
      const bool collar = x < 3 + y / 4 || (x / 7 + y / 5) % 6 == 0 || random.Percent(3);
      if (collar) {
        for (int band = 0; band < bands; ++band) image.At(x, y, band) = *patch;
      } else if (random.Percent(5)) {
        image.At(x, y, 0) = *patch;
      }
    }
  }
  return image;
}

void Write(const Image& image, const std::string& file, const std::vector<std::string>& options,
           const Decorate& decorate) {
  GDALAllRegister();
  CPLStringList list;
  for (const std::string& option : options) list.AddString(option.c_str());
  if (image.signedByte) list.AddString("PIXELTYPE=SIGNEDBYTE");
  OpenDataset dataset(GetGDALDriverManager()->GetDriverByName("GTiff")->Create(
      file.c_str(), image.width, image.height, image.bands, image.type, list.List()));
  if (!dataset) throw std::runtime_error("cannot create " + file);
  if (decorate) decorate(*dataset);
  Image copy = image;
  if (image.signedByte) {
    for (double& value : copy.values) value += value < 0 ? 256 : 0;
  }
  CheckedIO(*dataset, GF_Write, copy);
}

Decorate DeclareNoData(double value) {
  return [value](GDALDataset& dataset) { dataset.GetRasterBand(1)->SetNoDataValue(value); };
}

Image Read(const std::string& file) {
  const OpenDataset dataset = OpenImage(file);
  Image image(dataset->GetRasterXSize(), dataset->GetRasterYSize(), dataset->GetRasterCount(),
              dataset->GetRasterBand(1)->GetRasterDataType());
  CheckedIO(*dataset, GF_Read, image);
  image.signedByte = IsSignedByte(*dataset);
  if (image.signedByte) {
    for (double& value : image.values) value -= value > 127 ? 256 : 0;
  }
  return image;
}

Image ReferenceMean(const Image& image, int size, const std::function<bool(int x, int y)>& isValid,
                    std::optional<double> avoided) {
  Image result = image;
  const int half = size / 2;
  for (int y = 0; y < image.height; ++y) {
    for (int x = 0; x < image.width; ++x) {
      if (!isValid(x, y)) continue;
      for (int band = 0; band < image.bands; ++band) {
        double sum = 0;
        int count = 0;
        for (int ny = std::max(0, y - half); ny <= std::min(image.height - 1, y + half); ++ny) {
          for (int nx = std::max(0, x - half); nx <= std::min(image.width - 1, x + half); ++nx) {
            if (!isValid(nx, ny)) continue;
            sum += image.At(nx, ny, band);
            ++count;
          }
        }
        double mean = sum / count;
        if (image.type == GDT_Float32) mean = static_cast<float>(mean);
        if (GDALDataTypeIsInteger(image.type) != FALSE) {
          mean = std::nearbyint(mean);
          if (avoided && mean == *avoided) mean += 1;
        }
        result.At(x, y, band) = mean;
      }
    }
  }
  return result;
}

std::string Difference(const Image& expected, const Image& actual) {
  std::ostringstream text;
  text.precision(17);
  if (expected.width != actual.width || expected.height != actual.height ||
      expected.bands != actual.bands || expected.type != actual.type ||
      expected.signedByte != actual.signedByte) {
    text << "other size, bands or type: " << actual.width << " x " << actual.height << " x "
         << actual.bands << " " << GDALGetDataTypeName(actual.type);
    return text.str();
  }
  for (int y = 0; y < expected.height; ++y) {
    for (int x = 0; x < expected.width; ++x) {
      for (int band = 0; band < expected.bands; ++band) {
        const double a = expected.At(x, y, band);
        const double b = actual.At(x, y, band);
        if (a == b || (std::isnan(a) && std::isnan(b))) continue;
        text << "pixel (" << x << ", " << y << ") band " << band << ": expected " << a << ", is "
             << b;
        return text.str();
      }
    }
  }
  return {};
}

}  // namespace zarn::testsupport
