// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/reportpictures.h"

#include <cpl_error.h>
#include <cpl_string.h>
#include <cpl_vsi.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <numeric>
#include <type_traits>

#include "apps/zarn/anysampletype.h"
#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"
#include "apps/zarn/mosaic/reporttext.h"

namespace zarn::app {
namespace {

// Photographs of more pixels take several times as much as PNG.
constexpr std::size_t kMostExactPixels = 200'000;

Sampling EmptySampling(const PictureGrid& grid, std::size_t channels) {
  Sampling sampling;
  sampling.width = grid.Width();
  sampling.height = grid.Height();
  sampling.channels = channels >= 3 ? 3 : 1;
  sampling.values.resize(grid.Pixels() * sampling.channels);
  sampling.valid.resize(grid.Pixels());
  return sampling;
}

template <typename T>
void PasteScene(const SurveyedScene& scene, const Survey& survey, const PictureGrid& grid,
                std::size_t parts, Sampling& picture) {
  const T* const samples = reinterpret_cast<const T*>(scene.samples.data());
  const Window& area = scene.area;
  std::size_t pixel = 0;
  for (const std::int64_t mosaicRow : grid.Rows()) {
    const std::int64_t row = mosaicRow / survey.step - area.y;
    if (row < 0 || row >= area.height) {
      pixel += grid.Columns().size();
      continue;
    }
    for (const std::int64_t mosaicColumn : grid.Columns()) {
      const std::size_t target = pixel++;
      const std::int64_t column = mosaicColumn / survey.step - area.x;
      if (column < 0 || column >= area.width) continue;
      const auto source = static_cast<std::size_t>(row * area.width + column);
      if (scene.valid[source] == 0) continue;
      picture.valid[target] = 1;
      for (std::size_t c = 0; c < picture.channels; ++c) {
        picture.values[target * picture.channels + c] =
            static_cast<float>(samples[(source * survey.channels + c) * parts]);
      }
    }
  }
}

Rgb FromHue(double degrees, double saturation, double lightness) {
  const double range = saturation * std::min(lightness, 1 - lightness);
  Rgb colour{};
  for (const std::size_t i : {0, 1, 2}) {
    constexpr std::array<double, 3> kPhases{0, 8, 4};
    const double k = std::fmod(kPhases[i] + degrees / 30, 12);
    const double share = std::max(-1.0, std::min({k - 3, 9 - k, 1.0}));
    colour[i] = static_cast<std::uint8_t>(std::lround(255 * (lightness - range * share)));
  }
  return colour;
}

/// A file in memory that vanishes with its owner.
class MemoryFile {
 public:
  explicit MemoryFile(const std::string& extension)
      : name_("/vsimem/zarn-report-picture" + extension) {}
  ~MemoryFile() { VSIUnlink(name_.c_str()); }
  MemoryFile(const MemoryFile&) = delete;
  MemoryFile& operator=(const MemoryFile&) = delete;

  const std::string& Name() const { return name_; }
  std::string Contents() const {
    vsi_l_offset size = 0;
    const GByte* const bytes = VSIGetMemFileBuffer(name_.c_str(), &size, FALSE);
    return {reinterpret_cast<const char*>(bytes), static_cast<std::size_t>(size)};
  }

 private:
  std::string name_;
};

DatasetPtr AsDataset(const Picture& picture, int bands) {
  DatasetPtr dataset(GetGDALDriverManager()->GetDriverByName("MEM")->Create(
      "", picture.width, picture.height, bands, GDT_Byte, nullptr));
  constexpr std::array kMeanings{GCI_RedBand, GCI_GreenBand, GCI_BlueBand, GCI_AlphaBand};
  for (int i = 0; dataset && i < bands; ++i) {
    dataset->GetRasterBand(i + 1)->SetColorInterpretation(kMeanings[static_cast<std::size_t>(i)]);
  }
  const bool done =
      dataset && dataset->RasterIO(GF_Write, 0, 0, picture.width, picture.height,
                                   const_cast<std::uint8_t*>(picture.rgba.data()), picture.width,
                                   picture.height, GDT_Byte, bands, nullptr, 4,
                                   GSpacing{4} * picture.width, 1, nullptr) == CE_None;
  if (!done) throw RunError("cannot hold a picture for the report: " + LastGdalMessage());
  return dataset;
}

// Empty when GDAL has no such driver.
std::string Encoded(GDALDataset& picture, const char* format, const char* option) {
  GDALDriver* const driver = GetGDALDriverManager()->GetDriverByName(format);
  if (driver == nullptr) return {};
  CPLErrorReset();
  const MemoryFile file(std::string(".") + format);
  CPLStringList options;
  options.AddString(option);
  const DatasetPtr copy(
      driver->CreateCopy(file.Name().c_str(), &picture, FALSE, options.List(), nullptr, nullptr));
  if (!copy) throw RunError("cannot make a picture for the report: " + LastGdalMessage());
  copy->FlushCache();
  return file.Contents();
}

std::string AsUri(const std::string& type, const std::string& bytes) {
  const std::unique_ptr<char, decltype(&VSIFree)> text(
      CPLBase64Encode(static_cast<int>(bytes.size()), reinterpret_cast<const GByte*>(bytes.data())),
      VSIFree);
  return "data:image/" + type + ";base64," + text.get();
}

/// Draws lines where a picture of the sources has some.
class SeamDrawing {
 public:
  explicit SeamDrawing(const SourceTally& sources)
      : width_(sources.Grid().Width()),
        height_(sources.Grid().Height()),
        sources_(sources.Picture()) {}

  // Bit by bit, as an edge may run in and out.
  void Line(double x0, double y0, double x1, double y1) {
    constexpr double kBit = 3;
    const double length = std::hypot(x1 - x0, y1 - y0);
    const int bits = static_cast<int>(std::clamp(std::ceil(length / kBit), 1.0, 1e5));
    for (int i = 0; i < bits; ++i) {
      const auto at = [&](double part) {
        return std::array{x0 + (x1 - x0) * part / bits, y0 + (y1 - y0) * part / bits};
      };
      const auto [x, y] = at(i + 0.5);
      if (!LiesBetweenScenes(x, y)) {
        isDown_ = false;
        continue;
      }
      if (!isDown_) MoveTo(at(i));
      isDown_ = true;
      if (i + 1 == bits || !Continues(at(i + 1.5))) LineTo(at(i + 1));
    }
  }
  void Lift() { isDown_ = false; }

  std::string Take() { return std::move(path_); }

 private:
  bool Continues(const std::array<double, 2>& next) const {
    return LiesBetweenScenes(next[0], next[1]);
  }

  // Two scenes within a pixel or two: cutlines are simplified.
  bool LiesBetweenScenes(double x, double y) const {
    constexpr int kReach = 2;
    std::uint32_t found = 0;
    const auto column = static_cast<int>(std::clamp(std::floor(x), -10.0, width_ + 10.0));
    const auto row = static_cast<int>(std::clamp(std::floor(y), -10.0, height_ + 10.0));
    for (int j = std::max(row - kReach, 0); j <= std::min(row + kReach, height_ - 1); ++j) {
      for (int i = std::max(column - kReach, 0); i <= std::min(column + kReach, width_ - 1); ++i) {
        const std::uint32_t scene =
            sources_[static_cast<std::size_t>(j) * static_cast<std::size_t>(width_) +
                     static_cast<std::size_t>(i)];
        if (scene == 0 || scene == found) continue;
        if (found != 0) return true;
        found = scene;
      }
    }
    return false;
  }

  void MoveTo(const std::array<double, 2>& point) { Add('M', point); }
  void LineTo(const std::array<double, 2>& point) { Add('L', point); }
  void Add(char command, const std::array<double, 2>& point) {
    path_ += command + Fixed(point[0], 1) + ' ' + Fixed(point[1], 1);
  }

  int width_;
  int height_;
  const std::vector<std::uint32_t>& sources_;
  std::string path_;
  bool isDown_ = false;
};

// Whether an edge from `a` to `b`, of which one coordinate is given, lies on the frame of a picture
// that is so wide or high.
bool IsAlongFrame(double a, double b, double size) {
  return (a <= 0 && b <= 0) || (a >= size && b >= size);
}

}  // namespace

Sampling SamplePaste(const Survey& survey, const PictureGrid& grid) {
  Sampling picture = EmptySampling(grid, survey.channels);
  for (const SurveyedScene& scene : survey.scenes) {
    VisitAnySampleType(survey.type.code, [&]<typename T>(std::type_identity<T>, std::size_t parts) {
      PasteScene<T>(scene, survey, grid, parts, picture);
    });
  }
  return picture;
}

Sampling SampleMosaic(const std::string& file, const SourceTally& sources) {
  const RasterSource mosaic(file);
  Sampling picture = EmptySampling(sources.Grid(), mosaic.Channels().size());
  std::vector<int> bands(mosaic.Channels().begin(),
                         mosaic.Channels().begin() + static_cast<std::ptrdiff_t>(picture.channels));
  const auto pixel = static_cast<GSpacing>(picture.channels * sizeof(float));
  CPLErrorReset();
  if (mosaic.Dataset().RasterIO(GF_Read, 0, 0, mosaic.Width(), mosaic.Height(),
                                picture.values.data(), picture.width, picture.height, GDT_Float32,
                                static_cast<int>(bands.size()), bands.data(), pixel,
                                pixel * picture.width, sizeof(float), nullptr) != CE_None) {
    throw RunError("cannot read " + file + " for the report: " + LastGdalMessage(file));
  }
  if (mosaic.Type().IsSignedByte()) {
    for (float& value : picture.values) value = value > 127 ? value - 256 : value;
  }
  const std::vector<std::uint32_t>& numbers = sources.Picture();
  std::transform(numbers.begin(), numbers.end(), picture.valid.begin(),
                 [](std::uint32_t number) { return number == 0 ? 0 : 1; });
  return picture;
}

Stretch StretchFor(const Sampling& sampling) {
  constexpr double kLow = 0.02;
  constexpr double kHigh = 0.98;
  Stretch stretch;
  std::vector<float> values;
  for (std::size_t c = 0; c < sampling.channels; ++c) {
    values.clear();
    for (std::size_t i = 0; i < sampling.valid.size(); ++i) {
      const float value = sampling.values[i * sampling.channels + c];
      if (sampling.valid[i] != 0 && std::isfinite(value)) values.push_back(value);
    }
    stretch.emplace_back(0, 1);
    if (values.empty()) continue;
    const auto at = [&](double share) {
      const auto place =
          static_cast<std::ptrdiff_t>(share * static_cast<double>(values.size() - 1));
      std::nth_element(values.begin(), values.begin() + place, values.end());
      return static_cast<double>(values[static_cast<std::size_t>(place)]);
    };
    stretch.back() = {at(kLow), at(kHigh)};
  }
  return stretch;
}

Picture Render(const Sampling& sampling, const Stretch& stretch) {
  Picture picture{sampling.width, sampling.height, {}};
  picture.rgba.resize(sampling.valid.size() * 4);
  for (std::size_t i = 0; i < sampling.valid.size(); ++i) {
    if (sampling.valid[i] == 0) continue;
    std::uint8_t* const pixel = picture.rgba.data() + 4 * i;
    for (const std::size_t c : {0, 1, 2}) {
      const std::size_t channel = std::min(c, sampling.channels - 1);
      const auto& [low, high] = stretch[channel];
      const double value = sampling.values[i * sampling.channels + channel];
      // A channel of one value is neither black nor white.
      const double share = high > low ? (value - low) / (high - low) : 0.5;
      // (NaN as black)
      const double shade = share > 0 ? std::min(share, 1.0) : 0.0;
      pixel[c] = static_cast<std::uint8_t>(std::lround(255 * shade));
    }
    pixel[3] = 255;
  }
  return picture;
}

std::vector<Rgb> SceneColours(std::size_t count, const std::vector<SeamResidual>& seams) {
  constexpr double kGoldenAngle = 137.50776405003785;  // its multiples never meet again
  constexpr double kApart = 50;
  constexpr std::array<double, 3> kLightness{0.5, 0.66, 0.38};
  std::vector<std::vector<std::size_t>> neighbours(count);
  for (const SeamResidual& seam : seams) {
    neighbours[seam.first].push_back(seam.second);
    neighbours[seam.second].push_back(seam.first);
  }
  std::vector<std::size_t> free(count);
  std::iota(free.begin(), free.end(), std::size_t{0});
  std::vector<double> hues(count, -1);
  std::vector<Rgb> colours;
  for (std::size_t i = 0; i < count; ++i) {
    const auto distance = [&](std::size_t choice) {
      const double hue = std::fmod(static_cast<double>(choice) * kGoldenAngle, 360);
      double least = 180;
      for (const std::size_t neighbour : neighbours[i]) {
        if (hues[neighbour] < 0) continue;
        const double turn = std::abs(hues[neighbour] - hue);
        least = std::min(least, std::min(turn, 360 - turn));
      }
      return least;
    };
    auto chosen = std::find_if(free.begin(), free.end(),
                               [&](std::size_t choice) { return distance(choice) >= kApart; });
    if (chosen == free.end()) {
      chosen = std::max_element(free.begin(), free.end(), [&](std::size_t a, std::size_t b) {
        return distance(a) < distance(b);
      });
    }
    hues[i] = std::fmod(static_cast<double>(*chosen) * kGoldenAngle, 360);
    colours.push_back(FromHue(hues[i], 0.65, kLightness[*chosen % kLightness.size()]));
    free.erase(chosen);
  }
  return colours;
}

Picture RenderSources(const SourceTally& sources, const std::vector<Rgb>& colours) {
  Picture picture{sources.Grid().Width(), sources.Grid().Height(), {}};
  picture.rgba.resize(sources.Picture().size() * 4);
  for (std::size_t i = 0; i < sources.Picture().size(); ++i) {
    const std::uint32_t number = sources.Picture()[i];
    if (number == 0) continue;
    std::copy_n(colours[number - 1].begin(), 3, picture.rgba.begin() + static_cast<long>(4 * i));
    picture.rgba[4 * i + 3] = 255;
  }
  return picture;
}

std::string SeamPath(const MosaicPlan& plan, const SourceTally& sources) {
  constexpr double kLeastEdge = 0.5;
  const double scaleX = sources.Grid().ScaleX();
  const double scaleY = sources.Grid().ScaleY();
  SeamDrawing drawing(sources);
  for (const ScenePlan& scene : plan.scenes) {
    const std::vector<double>& v = scene.cutline.vertices;
    const std::vector<std::int32_t>& starts = scene.cutline.starts;
    for (std::size_t part = 0; part < starts.size(); ++part) {
      const auto begin = static_cast<std::size_t>(starts[part]);
      const std::size_t end =
          part + 1 < starts.size() ? static_cast<std::size_t>(starts[part + 1]) : v.size() / 2;
      drawing.Lift();
      double x = v[2 * begin] * scaleX;
      double y = v[2 * begin + 1] * scaleY;
      for (std::size_t i = begin + 1; i <= end; ++i) {
        const std::size_t vertex = i < end ? i : begin;
        const double nextX = v[2 * vertex] * scaleX;
        const double nextY = v[2 * vertex + 1] * scaleY;
        // Vertices may be much closer than pixels of the picture.
        if (i < end && std::hypot(nextX - x, nextY - y) < kLeastEdge) continue;
        if (IsAlongFrame(x, nextX, sources.Grid().Width()) ||
            IsAlongFrame(y, nextY, sources.Grid().Height())) {
          drawing.Lift();
        } else {
          drawing.Line(x, y, nextX, nextY);
        }
        x = nextX;
        y = nextY;
      }
    }
  }
  return drawing.Take();
}

std::string DataUri(const Picture& picture, PictureKind kind) {
  bool isOpaque = true;
  for (std::size_t i = 3; i < picture.rgba.size(); i += 4) isOpaque &= picture.rgba[i] == 255;
  const DatasetPtr dataset = AsDataset(picture, isOpaque ? 3 : 4);
  if (kind == PictureKind::kPhotograph && picture.rgba.size() / 4 > kMostExactPixels) {
    // JPEG has no holes.
    const std::string bytes = isOpaque ? Encoded(*dataset, "JPEG", "QUALITY=88")
                                       : Encoded(*dataset, "WEBP", "QUALITY=88");
    if (!bytes.empty()) return AsUri(isOpaque ? "jpeg" : "webp", bytes);
  }
  const std::string bytes = Encoded(*dataset, "PNG", "ZLEVEL=6");
  if (bytes.empty()) throw RunError("cannot make pictures: this GDAL has no driver for PNG");
  return AsUri("png", bytes);
}

}  // namespace zarn::app
