// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <atomic>
#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "host/core/exception.h"
#include "host/nspio/debugger.h"
#include "processes/filters/enhancement/glut.h"
#include "processes/filters/enhancement/trimmethod.h"

namespace zarn::processes::filters {
namespace {

using MatrixPtr = std::unique_ptr<IGeoLUTMatrix>;

GLUTParameters Grid(int rows, int columns, int channels, int depth = 8) {
  return {.tileWidth = 8,
          .tileHeight = 8,
          .gridRows = rows,
          .gridColumns = columns,
          .channelCount = channels,
          .pixelDepth = depth};
}

MatrixPtr Make(const GLUTParameters& parameters) {
  return MatrixPtr(GLUT::GetGLUTMatrix(parameters));
}

float GainOf(const IGeoLUTMatrix& matrix, int row, int column, int channel = 0) {
  float gain = -1;
  float offset = -1;
  matrix.GetCell(row, column, channel, gain, offset);
  return gain;
}

/// A raster in memory; `valid` is empty when all pixels are.
struct MemoryRaster : datasources::IRasterReader, datasources::BasicWriter {
  gobs::RasterInfo info{0, 0, 1, gobs::NativeDataTypeCode::kUInt8};
  std::vector<std::uint8_t> bytes;
  std::vector<std::uint8_t> valid;
  datasources::AuxiliaryData auxiliary;

  std::uint32_t Width() const override { return info.Width(); }
  std::uint32_t Height() const override { return info.Height(); }
  std::uint32_t Channels() const override { return info.Channels(); }
  gobs::NativeDataTypeCode DataTypeCode() const override { return gobs::GetDataTypeCode(info); }
  datasources::AuxiliaryData Auxiliary() const override { return auxiliary; }
  void Read(gobs::Raster& block, std::uint8_t* isValid) override {
    const std::size_t pixel = info.DescribedSize() / (std::size_t{Width()} * Height());
    for (std::size_t y = 0; y < block.Height(); ++y) {
      const std::size_t from = (block.OriginY() + y) * Width() + block.OriginX();
      const std::size_t to = y * block.Width();
      std::copy_n(bytes.data() + from * pixel, block.Width() * pixel,
                  static_cast<std::uint8_t*>(block.Data()) + to * pixel);
      for (std::size_t x = 0; x < block.Width(); ++x) {
        isValid[to + x] = valid.empty() ? 1 : valid[from + x];
      }
    }
  }
  void Write(const gobs::Raster& raster, const datasources::AuxiliaryData& data) override {
    info = raster;
    const auto* const first = static_cast<const std::uint8_t*>(raster.Data());
    bytes.assign(first, first + raster.DataSize());
    auxiliary = data;
  }
};

/// Makes an image whose sample is `level(x, y, channel)`.
template <typename T>
void FillImage(int width, int height, int channels, const std::function<int(int, int, int)>& level,
               MemoryRaster& image) {
  gobs::Raster raster(gobs::RasterInfo(
      static_cast<std::uint32_t>(width), static_cast<std::uint32_t>(height),
      static_cast<std::uint32_t>(channels),
      sizeof(T) == 1 ? gobs::NativeDataTypeCode::kUInt8 : gobs::NativeDataTypeCode::kUInt16));
  auto* sample = static_cast<T*>(raster.Data());
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      for (int c = 0; c < channels; ++c) *sample++ = static_cast<T>(level(x, y, c));
    }
  }
  image.Write(raster, {});
}

// The table as a list of three stretches, by the rule that the entry `j` levels above the first
// one that is not 0 is gain * j^power.
template <typename T>
std::vector<T> ReferenceTable(float gain, float offset, float power) {
  const double top = std::numeric_limits<T>::max();
  const auto clamped = [&](double value, double correction) {
    const double whole = std::isnan(value) ? 0 : std::clamp(std::trunc(value), -3e9, 3e9);
    return static_cast<std::size_t>(std::clamp(whole + correction, 0.0, top));
  };
  std::size_t low = clamped(offset, 1);
  std::size_t high = clamped(std::pow(static_cast<float>(top) / gain, 1.0F / power) + offset, -1);
  if (high < low) std::swap(low, high);
  std::vector<T> table(static_cast<std::size_t>(top) + 1, static_cast<T>(top));
  std::fill_n(table.begin(), low, T{0});
  for (std::size_t j = 0; low + j < high; ++j) {
    const float stretched = gain * (j == 0 ? 0.0F : std::pow(static_cast<float>(j), power));
    table[low + j] = std::isnan(stretched)
                         ? T{0}
                         : static_cast<T>(std::clamp(static_cast<double>(stretched), 0.0, top));
  }
  return table;
}

template <typename T>
void ExpectTables(int depth) {
  constexpr float kNaN = std::numeric_limits<float>::quiet_NaN();
  constexpr float kInf = std::numeric_limits<float>::infinity();
  for (const float power : {1.0F, 0.5F, 2.2F, 0.0F, -1.0F, kNaN}) {
    GLUTParameters parameters = Grid(2, 3, 2, depth);
    parameters.power = power;
    const MatrixPtr matrix = Make(parameters);
    for (const float gain : {1.0F, 0.01F, 37.5F, 0.0F, -2.0F, kNaN, kInf}) {
      for (const float offset : {9.6F, -0.5F, -1.0F, 300.2F, 1e20F, -1e20F, kNaN, kInf}) {
        matrix->SetCell(1, 2, 1, gain, offset);
        std::vector<T> table(static_cast<std::size_t>(matrix->GetLevelCount()), T{7});
        matrix->FillLUT(table.data(), 1, 2, 1);
        ASSERT_EQ(table, ReferenceTable<T>(gain, offset, power))
            << power << " " << gain << " " << offset;
      }
    }
  }
}

TEST(GeoLUTMatrix, FillsTablesForAnyCoefficients) {
  ExpectTables<std::uint8_t>(8);
  ExpectTables<std::uint16_t>(16);
  const MatrixPtr matrix = Make(Grid(1, 1, 1));
  matrix->SetCell(0, 0, 0, 1.0F, 9.6F);
  std::vector<std::uint8_t> table(256);
  matrix->FillLUT(table.data(), 0, 0, 0);
  EXPECT_EQ(table[9], 0);
  EXPECT_EQ(table[10], 0);
  EXPECT_EQ(table[30], 20);
  EXPECT_EQ(table[254], 244);
  EXPECT_EQ(table[255], 255);
}

TEST(GeoLUTMatrix, IsMadeForSensibleSizesOnly) {
  EXPECT_EQ(Make(Grid(2, 2, 1, 12)), nullptr);
  EXPECT_EQ(Make(Grid(-1, 2, 1)), nullptr);
  EXPECT_EQ(Make(Grid(2, -1, 1)), nullptr);
  EXPECT_EQ(Make(Grid(2, 2, -1)), nullptr);
  EXPECT_EQ(Make(Grid(1 << 30, 1 << 30, 1 << 30)), nullptr);
  ASSERT_NE(Make(Grid(0, 0, 0)), nullptr);
  const MatrixPtr matrix = Make(Grid(3, 4, 2, 16));
  EXPECT_EQ(matrix->GetLevelCount(), 65536);
  EXPECT_EQ(matrix->GridGeocoding({10, 2, 3, 20, 4, 5}),
            (ogc::cs::GeocodingInfo{10, 16, 24, 20, 32, 40}));
}

TEST(GeoLUTMatrix, IgnoresWhatIsOutsideOfTheGrid) {
  const MatrixPtr matrix = Make(Grid(2, 3, 1));
  for (const auto& [row, column] : {std::pair(-1, 0), {2, 0}, {0, -1}, {0, 3}}) {
    matrix->SetCell(row, column, 0, 5, 5);
    matrix->MarkMasked(row, column);
    matrix->MarkNoData(row, column);
    EXPECT_FALSE(matrix->IsMasked(row, column) || matrix->IsValid(row, column));
    std::vector<std::uint8_t> table(256, 7);
    matrix->FillLUT(table.data(), row, column, 0);
    EXPECT_EQ(table, std::vector<std::uint8_t>(256, 7));
  }
  matrix->SetCell(0, 0, 1, 5, 5);
  for (int row = 0; row < 2; ++row) {
    for (int column = 0; column < 3; ++column) {
      EXPECT_TRUE(matrix->IsValid(row, column));
      EXPECT_EQ(GainOf(*matrix, row, column), 0);
    }
  }
  matrix->MarkMasked(1, 2);
  EXPECT_TRUE(matrix->IsMasked(1, 2));
  EXPECT_FALSE(matrix->IsValid(1, 2));
}

/// Notices calls from two threads at once, and can cancel.
class WatchingCounter : public nspio::Counter {
 public:
  int calls = 0;
  int cancelAt = std::numeric_limits<int>::max();
  bool overlapped = false;
  double last = 0;
  std::vector<std::string> steps;

 protected:
  void Report(double fraction, const std::string& step) override {
    overlapped |= inside_.exchange(true);
    if (steps.empty() || steps.back() != step) steps.push_back(step);
    last = fraction;
    const bool cancels = ++calls == cancelAt;
    inside_ = false;
    if (cancels) throw Exception("cancelled");
  }

 private:
  std::atomic<bool> inside_ = false;
};

TEST(GeoLUTMatrix, ValidatesByMaximumGain) {
  const MatrixPtr matrix = Make(Grid(40, 5, 2));
  for (int row = 0; row < 40; ++row) {
    for (int column = 0; column < 5; ++column) {
      matrix->SetCell(row, column, 0, static_cast<float>(row), 0);
      matrix->SetCell(row, column, 1, static_cast<float>(column), 0);
    }
  }
  matrix->MarkNoData(39, 4);
  const float most[] = {20, 3};
  WatchingCounter counter;
  matrix->SetHostData(&counter);
  matrix->ValidateMaxGain(most);
  EXPECT_EQ(counter.calls, 40);
  EXPECT_EQ(counter.last, 1);
  EXPECT_FALSE(counter.overlapped);
  for (int row = 0; row < 40; ++row) {
    for (int column = 0; column < 5; ++column) {
      EXPECT_EQ(matrix->IsValid(row, column), row <= 20 && column <= 3) << row << " " << column;
    }
  }
  WatchingCounter cancelling;
  cancelling.cancelAt = 3;
  matrix->SetHostData(&cancelling);
  const float none[] = {-1, -1};
  EXPECT_THROW(matrix->ValidateMaxGain(none), Exception);
  EXPECT_EQ(cancelling.calls, 3);
  for (int i = 0; i < 200; ++i) EXPECT_FALSE(matrix->IsValid(i / 5, i % 5)) << i;
}

// Tiles of 8 x 8 pixels with levels from `low` on, 64 of them; what differs is told by the cell.
template <typename T>
void ExpectLoads(int depth, int spread) {
  GLUTParameters parameters = Grid(3, 4, 2, depth);
  parameters.leftTrim = parameters.rightTrim = 1e-6;  // from the first to the last level there is
  parameters.power = 0.7F;
  const auto level = [&](int x, int y, int c) {
    const int cell = (y / 8) * 4 + x / 8;
    const int within = (y % 8) * 8 + x % 8;
    if (cell == 5 && c == 1) return 99;  // flat in one channel
    return 10 * c + 7 * cell + within * spread;
  };
  MemoryRaster image;
  FillImage<T>(30, 21, 2, level, image);
  image.valid.assign(30 * 21, 1);
  for (int y = 0; y < 8; ++y) {
    for (int x = 8; x < 16; ++x) image.valid[static_cast<std::size_t>(y * 30 + x)] = x == y + 8;
    for (int x = 16; x < 24; ++x) image.valid[static_cast<std::size_t>(y * 30 + x)] = x + y == 16;
  }
  const MatrixPtr matrix = Make(parameters);
  matrix->MarkMasked(2, 0);
  WatchingCounter counter;
  matrix->SetHostData(&counter);
  matrix->LoadFromImage(image);
  EXPECT_EQ(counter.last, 1);
  EXPECT_TRUE(matrix->IsMasked(2, 0));
  EXPECT_FALSE(matrix->IsValid(1, 1)) << "a flat channel";
  EXPECT_TRUE(matrix->IsValid(0, 1)) << "8 valid pixels of 64";
  EXPECT_FALSE(matrix->IsValid(0, 2)) << "1 valid pixel";
  for (const auto& [row, column] : {std::pair(0, 0), {1, 2}, {0, 3}, {2, 3}}) {
    for (int c = 0; c < 2; ++c) {
      int low = std::numeric_limits<int>::max();
      int high = 0;
      for (int y = row * 8; y < std::min(21, row * 8 + 8); ++y) {
        for (int x = column * 8; x < std::min(30, column * 8 + 8); ++x) {
          low = std::min(low, level(x, y, c));
          high = std::max(high, level(x, y, c));
        }
      }
      std::vector<T> table(static_cast<std::size_t>(matrix->GetLevelCount()));
      matrix->FillLUT(table.data(), row, column, c);
      const auto at = [&](int i) { return static_cast<int>(table[static_cast<std::size_t>(i)]); };
      EXPECT_EQ(at(low), 0);
      EXPECT_GT(at(low + 1), 0);
      EXPECT_LT(at(high - 1), matrix->GetLevelCount() - 1);
      EXPECT_EQ(at(high), matrix->GetLevelCount() - 1) << row << " " << column << " " << c;
    }
  }
}

TEST(GeoLUTMatrix, LoadsStretchesFromTheTilesOfAnImage) {
  ExpectLoads<std::uint8_t>(8, 2);
  ExpectLoads<std::uint16_t>(16, 900);
}

// The levels of tiles lie together, so that most of a histogram is empty; some of the pixels have
// the lowest and the highest level.
template <typename T>
void ExpectTrimsTheWholeHistogram(int depth, int tile) {
  constexpr int kTop = std::numeric_limits<T>::max();
  const auto level = [&](int x, int y, int) {
    const int grain = (x * 31 + y * 57 + x * y) % 41;
    if (x >= tile && grain % 5 == 0) return x >= 2 * tile ? kTop : 0;
    return kTop / 3 + grain;
  };
  MemoryRaster image;
  FillImage<T>(3 * tile, tile, 1, level, image);
  for (const auto& [left, right] : {std::pair(0.02, 0.1),
                                    {0.0, 0.3},
                                    {0.7, 0.6},
                                    {1.0, 0.0},
                                    {0.0, 0.0},
                                    {-0.5, 0.2},
                                    {0.2, -0.5}}) {
    for (int choice = 0; choice < 8; ++choice) {
      GLUTParameters parameters = Grid(1, 3, 1, depth);
      parameters.tileWidth = parameters.tileHeight = tile;
      parameters.trimMethod = choice & 1;
      parameters.ignoreFirstBin = (choice & 2) != 0;
      parameters.ignoreLastBin = (choice & 4) != 0;
      parameters.leftTrim = left;
      parameters.rightTrim = right;
      const MatrixPtr matrix = Make(parameters);
      matrix->LoadFromImage(image);
      const TrimMethodPtr trim(CreateTrimMethod(static_cast<TrimMethod>(choice & 1)));
      for (int column = 0; column < 3; ++column) {
        std::vector<std::uint64_t> histogram(std::size_t{kTop} + 1);
        for (int i = 0; i < tile * tile; ++i) {
          ++histogram[static_cast<std::size_t>(level(column * tile + i % tile, i / tile, 0))];
        }
        int low = 0;
        int high = 0;
        trim->Trim(histogram.data(), left, right, kTop + 1U, parameters.ignoreFirstBin,
                   parameters.ignoreLastBin, -1, low, high);
        const bool hasRange = low >= 0 && low < high && high <= kTop;
        const auto gain = static_cast<float>(kTop / (high - low + 2.5));
        float found = 0;
        float offset = 0;
        matrix->GetCell(0, column, 0, found, offset);
        EXPECT_TRUE(matrix->IsValid(0, column) == hasRange &&
                    (!hasRange || (found == gain && offset == static_cast<float>(low - 1))))
            << column << ": " << low << " to " << high << ", trims " << left << " and " << right
            << ", choice " << choice;
      }
    }
  }
}

TEST(GeoLUTMatrix, TrimsTilesLikeTheirWholeHistograms) {
  for (const int tile : {8, 46}) {
    ExpectTrimsTheWholeHistogram<std::uint8_t>(8, tile);
    ExpectTrimsTheWholeHistogram<std::uint16_t>(16, tile);
  }
}

TEST(GeoLUTMatrix, RefusesImagesThatDoNotFit) {
  const auto flat = [](int, int, int) { return 1; };
  MemoryRaster bytes;
  FillImage<std::uint8_t>(9, 9, 1, flat, bytes);
  EXPECT_THROW(Make(Grid(2, 2, 1, 16))->LoadFromImage(bytes), ParameterException);
  EXPECT_THROW(Make(Grid(2, 2, 3))->LoadFromImage(bytes), ParameterException);
  GLUTParameters unknown = Grid(2, 2, 1);
  unknown.trimMethod = static_cast<std::int32_t>(TrimMethod::kUnknown);
  EXPECT_THROW(Make(unknown)->LoadFromImage(bytes), ParameterException);
  GLUTParameters empty = Grid(2, 2, 1);
  empty.tileHeight = 0;
  EXPECT_THROW(Make(empty)->LoadFromImage(bytes), ParameterException);
}

// A grid of gains that rise by a tenth over its width.
MatrixPtr SmoothMatrix(int rows, int columns) {
  MatrixPtr matrix = Make(Grid(rows, columns, 1));
  for (int row = 0; row < rows; ++row) {
    for (int column = 0; column < columns; ++column) {
      matrix->SetCell(row, column, 0,
                      2.0F + 0.2F * static_cast<float>(column) / static_cast<float>(columns), 10);
    }
  }
  return matrix;
}

TEST(GeoLUTMatrix, FiltersOutliersAmongNeighbours) {
  const MatrixPtr matrix = SmoothMatrix(9, 9);
  matrix->SetCell(4, 4, 0, 9.0F, 10);
  matrix->SetCell(0, 8, 0, 0.3F, 10);
  matrix->SetCell(7, 1, 0, 2.2F, 10);
  matrix->RunLocalFilter();
  for (int row = 0; row < 9; ++row) {
    for (int column = 0; column < 9; ++column) {
      const bool isOutlier = (row == 4 && column == 4) || (row == 0 && column == 8);
      EXPECT_EQ(matrix->IsValid(row, column), !isOutlier) << row << " " << column;
    }
  }
}

TEST(GeoLUTMatrix, FiltersAFewCellsFarFromAllOthers) {
  for (const int far : {3, 12}) {  // of 81: fewer and more than a tenth
    const MatrixPtr matrix = SmoothMatrix(9, 9);
    for (int i = 0; i < far; ++i) matrix->SetCell(i / 9 + 3, i % 9, 0, 30.0F, 10);
    matrix->RunGlobalFilter();
    int invalid = 0;
    for (int i = 0; i < 81; ++i) invalid += matrix->IsValid(i / 9, i % 9) ? 0 : 1;
    EXPECT_EQ(invalid, far == 3 ? 3 : 0);
    EXPECT_EQ(matrix->IsValid(3, 0), far != 3);
  }
}

TEST(GeoLUTMatrix, InterpolatesFromValidCells) {
  const MatrixPtr matrix = Make(Grid(1, 5, 1));
  for (int column = 0; column < 5; ++column) matrix->MarkNoData(0, column);
  EXPECT_THROW(matrix->InterpolateCells(true), DataException);
  MatrixPtr line = Make(Grid(1, 5, 1));
  line->SetCell(0, 0, 0, 1, 10);
  line->SetCell(0, 4, 0, 4, 40);
  line->MarkNoData(0, 1);
  line->MarkMasked(0, 2);
  line->MarkNoData(0, 3);
  line->InterpolateCells(false);
  EXPECT_FLOAT_EQ(GainOf(*line, 0, 1), (1 * 9 + 4 * 1) / 10.0F);
  EXPECT_FLOAT_EQ(GainOf(*line, 0, 3), (1 * 1 + 4 * 9) / 10.0F);
  EXPECT_EQ(GainOf(*line, 0, 2), 0) << "masked";
  EXPECT_FALSE(line->IsValid(0, 1));
  line->InterpolateCells(true);
  EXPECT_FLOAT_EQ(GainOf(*line, 0, 2), 2.5F);
}

TEST(GeoLUTMatrix, TellsOfCellsThatSeeNoValidOne) {
  const MatrixPtr matrix = Make(Grid(3, 3, 1));
  for (int i = 1; i < 9; ++i) matrix->MarkNoData(i / 3, i % 3);
  matrix->SetCell(0, 0, 0, 3, 1);
  std::vector<std::string> messages;
  const auto former =
      nspio::Debugger::SetSink([&](const std::string& text, int, const std::string&,
                                   const std::string&, int) { messages.push_back(text); });
  nspio::Debugger::moDebugLevel = 1;
  matrix->InterpolateCells(false);
  nspio::Debugger::moDebugLevel = 0;
  nspio::Debugger::SetSink(former);
  ASSERT_EQ(messages.size(), 2U);  // (1, 2) and (2, 1) lie on no ray
  EXPECT_EQ(messages[0],
            "There were no valid GeoLUTs found from point 2, 1. (Distance of closest Valid GeoLUT "
            "was 2.23607)");
  EXPECT_EQ(GainOf(*matrix, 1, 2), 3);
}

TEST(GeoLUTMatrix, RunsThePassesThatAreAskedForAndNamesThem) {
  const MatrixPtr matrix = SmoothMatrix(9, 9);
  matrix->SetCell(4, 4, 0, 9.0F, 10);
  WatchingCounter counter;
  matrix->SetHostData(&counter);
  matrix->Clean({.globalFilter = true, .localFilter = true, .interpolation = true});
  EXPECT_EQ(counter.steps,
            (std::vector<std::string>{"Running local filter", "Running global filter",
                                      "Running interpolation"}));
  EXPECT_NEAR(GainOf(*matrix, 4, 4), 2.09, 0.02);
  matrix->Clean({});
  EXPECT_EQ(counter.steps.size(), 3U);
}

TEST(GeoLUTMatrix, ComesBackFromItsDiagnosticRaster) {
  GLUTParameters parameters = Grid(2, 3, 2, 16);
  parameters.power = 0.7F;
  parameters.trimMethod = static_cast<std::int32_t>(TrimMethod::kMeanNSigma);
  parameters.leftTrim = 2.25;
  parameters.rightTrim = 1.0 / 3;
  const MatrixPtr matrix = Make(parameters);
  for (int i = 0; i < 6; ++i) {
    matrix->SetCell(i / 3, i % 3, 1, 0.1F * static_cast<float>(i), static_cast<float>(i));
  }
  matrix->MarkMasked(0, 1);
  matrix->MarkNoData(1, 2);
  const float most[] = {1, 0.25F};
  matrix->ValidateMaxGain(most);
  MemoryRaster classes;
  MemoryRaster coefficients;
  matrix->WriteDiagnosticRaster(classes, &coefficients, {});
  EXPECT_EQ(classes.bytes, (std::vector<std::uint8_t>{1, 3, 1, 2, 2, 0}));
  EXPECT_EQ(classes.auxiliary.classes[2], (datasources::RasterClass{"Invalid GeoLUTs", 255, 0, 0}));
  EXPECT_EQ(classes.auxiliary.metadata.at("GLUTTileSizes"), "8 8");
  EXPECT_EQ(classes.auxiliary.geocoding.xPerColumn, 8);

  const MatrixPtr again(GLUT::GetGLUTMatrix(&classes, &coefficients));
  ASSERT_NE(again, nullptr);
  MemoryRaster classesAgain;
  MemoryRaster coefficientsAgain;
  again->WriteDiagnosticRaster(classesAgain, &coefficientsAgain, {});
  EXPECT_EQ(classesAgain.bytes, classes.bytes);
  EXPECT_EQ(classesAgain.auxiliary, classes.auxiliary);
  EXPECT_EQ(coefficientsAgain.bytes, coefficients.bytes);

  EXPECT_EQ(GLUT::GetGLUTMatrix(&classes, nullptr), nullptr);
  EXPECT_EQ(GLUT::GetGLUTMatrix(&coefficients, &classes), nullptr);
  classes.auxiliary.metadata["GLUTTileSizes"] = "8";
  EXPECT_EQ(GLUT::GetGLUTMatrix(&classes, &coefficients), nullptr);
}

}  // namespace
}  // namespace zarn::processes::filters
