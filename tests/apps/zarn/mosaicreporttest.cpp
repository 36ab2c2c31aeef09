// SPDX-License-Identifier: Apache-2.0
#include <cpl_string.h>
#include <cpl_vsi.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <map>
#include <nlohmann/json.hpp>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

namespace fs = std::filesystem;
using Arguments = std::vector<std::string>;
using Row = std::vector<std::string>;

/// A page of HTML, as far as it is looked at here.
class Page {
 public:
  explicit Page(const std::string& file) {
    std::ifstream stream(file, std::ios::binary);
    std::ostringstream text;
    text << stream.rdbuf();
    text_ = text.str();
    Scan();
  }

  const std::string& Text() const { return text_; }
  const std::string& Fault() const { return fault_; }  ///< the first tag out of place
  const std::multimap<std::string, std::string>& Attributes() const { return attributes_; }
  /// The cells of a table's body without their tags.
  std::vector<Row> Rows(const std::string& id) const {
    const std::string table = Between("<table id=\"" + id + "\">", "</table>");
    std::vector<Row> rows;
    static const std::regex kRow("<tr[^>]*>(.*?)</tr>");
    static const std::regex kCell("<t[hd][^>]*>(.*?)</t[hd]>");
    static const std::regex kTag("<[^>]*>");
    const std::string body = Flat(table.substr(table.find("<tbody>")));
    for (std::sregex_iterator row(body.begin(), body.end(), kRow), end; row != end; ++row) {
      const std::string cells = (*row)[1];
      rows.emplace_back();
      for (std::sregex_iterator c(cells.begin(), cells.end(), kCell); c != end; ++c) {
        rows.back().push_back(std::regex_replace((*c)[1].str(), kTag, ""));
      }
    }
    return rows;
  }
  std::string Between(const std::string& begin, const std::string& end) const {
    const std::size_t start = text_.find(begin);
    if (start == std::string::npos) return {};
    const std::size_t from = start + begin.size();
    return text_.substr(from, text_.find(end, from) - from);
  }

 private:
  static std::string Flat(std::string text) {
    std::replace(text.begin(), text.end(), '\n', ' ');
    return text;
  }

  void Scan() {
    static const std::set<std::string> kVoid{"meta", "link", "img", "input"};
    std::vector<std::string> open;
    std::size_t at = 0;
    while ((at = text_.find('<', at)) != std::string::npos) {
      std::size_t end = at + 1;
      for (bool quoted = false; end < text_.size() && (quoted || text_[end] != '>'); ++end) {
        if (text_[end] == '"') quoted = !quoted;
      }
      const std::string tag = text_.substr(at + 1, end - at - 1);
      at = end;
      if (tag.starts_with("!")) continue;
      const std::string name = tag.substr(0, tag.find_first_of(" \n/", 1));
      if (name.front() == '/') {
        if (open.empty() || "/" + open.back() != name) return void(fault_ = "<" + tag + ">");
        open.pop_back();
        continue;
      }
      TakeAttributes(tag);
      if (kVoid.contains(name) || tag.back() == '/') continue;
      open.push_back(name);
      // Their contents are no tags.
      if (name == "style" || name == "script") at = text_.find("</" + name, at);
    }
    if (!open.empty()) fault_ = "<" + open.back() + "> stays open";
  }

  void TakeAttributes(const std::string& tag) {
    for (std::size_t at = tag.find("=\""); at != std::string::npos; at = tag.find("=\"", at)) {
      const std::size_t name = tag.find_last_of(" \n", at) + 1;
      const std::size_t end = tag.find('"', at + 2);
      attributes_.emplace(tag.substr(name, at - name), tag.substr(at + 2, end - at - 2));
      at = end;
    }
  }

  std::string text_;
  std::string fault_;
  std::multimap<std::string, std::string> attributes_;
};

/// An embedded picture as its pixels, with its kind.
struct Embedded {
  std::string kind;
  Image pixels;
};

Embedded Decode(const std::string& uri) {
  const std::size_t comma = uri.find(',');
  std::string text = uri.substr(comma + 1);
  const int size = CPLBase64DecodeInPlace(reinterpret_cast<GByte*>(text.data()));
  const std::string file = "/vsimem/embedded";
  VSIFCloseL(VSIFileFromMemBuffer(file.c_str(), reinterpret_cast<GByte*>(text.data()),
                                  static_cast<vsi_l_offset>(size), FALSE));
  Embedded embedded{uri.substr(0, comma), Read(file)};
  VSIUnlink(file.c_str());
  return embedded;
}

constexpr int kWidth = 130;
constexpr int kHeight = 90;
constexpr int kShift = 47;  // of the second scene, to the right

class MosaicReport : public testing::Test {
 protected:
  MosaicReport() {
    const Decorate place = [](GDALDataset& dataset) { Place(dataset, 0); };
    const Decorate shifted = [](GDALDataset& dataset) { Place(dataset, kShift); };
    Write(scenes_[0], names_[0], {}, place);
    Write(scenes_[1], names_[1], {}, shifted);
  }

  static void Place(GDALDataset& dataset, int column) {
    double transform[] = {5000 + 2.0 * column, 2, 0, 8000, 0, -2};
    dataset.SetGeoTransform(transform);
    DeclareNoData(0)(dataset);
  }

  // Land under another light, with a collar.
  static Image MakeScene(int left, double gain, double offset) {
    Image image(kWidth, kHeight, 3, GDT_Byte);
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < kWidth; ++x) {
        if (x < 4 || x + y / 9 > 126 || y < 3) continue;
        for (int band = 0; band < 3; ++band) {
          const double land = 110 + 45 * std::sin(0.09 * (x + left) + 1.3 * band) +
                              15 * std::cos(0.21 * y) + (x * 5 + y * 11 + band) % 7;
          image.At(x, y, band) = std::round(gain * land + offset * (band + 1));
        }
      }
    }
    return image;
  }

  // The value of a scene at a pixel of the mosaic, or none.
  const double* At(std::size_t scene, int column, int row) const {
    const int x = column - (scene == 0 ? 0 : kShift);
    const bool inside = x >= 0 && x < kWidth && row >= 0 && row < kHeight;
    if (!inside || scenes_[scene].AllBands(x, row, 0)) return nullptr;
    return &scenes_[scene].values[static_cast<std::size_t>((row * kWidth + x) * 3)];
  }

  Outcome Make(Arguments options) {
    options.insert(options.begin(), "mosaic");
    options.insert(options.end(), {names_[0], names_[1], folder_ / "out.tif"});
    return RunProgram(options);
  }
  Page MakePage(Arguments options) {
    options.insert(options.end(), {"--overwrite", "--report", folder_ / "report", "--source-map",
                                   folder_ / "map.tif"});
    const Outcome outcome = Make(options);
    EXPECT_EQ(outcome.status, 0) << outcome.err;
    return Page(folder_ / "report/index.html");
  }

  TemporaryFolder folder_;
  std::vector<Image> scenes_{MakeScene(0, 1, 0), MakeScene(kShift, 0.8, 9)};
  // The second name is to be shown as it is.
  std::vector<std::string> names_{folder_ / "plain.tif", folder_ / "<b>&\"{{name}}.tif"};
};

TEST_F(MosaicReport, IsAPageThatNeedsNothingElse) {
  const Page page = MakePage({"--balance", "gain-offset", "--feather", "5"});
  EXPECT_EQ(page.Fault(), "");
  EXPECT_EQ(page.Text().find("://"), std::string::npos);
  EXPECT_EQ(page.Text().find("url("), std::string::npos);
  std::set<std::string> ids;
  int references = 0;
  for (const auto& [name, value] : page.Attributes()) {
    if (name == "id") {
      EXPECT_TRUE(ids.insert(value).second) << value;
    }
  }
  for (const auto& [name, value] : page.Attributes()) {
    if (name == "for" || name == "aria-labelledby") {
      EXPECT_TRUE(ids.contains(value)) << value;
    }
    if (name != "src" && name != "href") continue;
    ++references;
    const bool isInside = value.starts_with("#") && ids.contains(value.substr(1));
    EXPECT_TRUE(isInside || value.starts_with("data:")) << value.substr(0, 60);
  }
  EXPECT_GE(references, 5);
  EXPECT_EQ(page.Rows("scenes")[1][1], "&lt;b&gt;&amp;&quot;{{name}}");
  EXPECT_EQ(page.Text().find("<b>"), std::string::npos);
}

TEST_F(MosaicReport, NumbersAreThoseOfTheScenes) {
  const std::string cutlines = folder_ / "cutlines.csv";
  std::ofstream(cutlines) << "WKT,scene\n"
                             "\"POLYGON((4000 9000,5170 9000,5170 7900,5141 7000,4000 7000))\","
                             "plain\n\"POLYGON((5170 9000,6000 9000,6000 7000,5141 7000,5170 "
                             "7900))\",\"<b>&\"\"{{name}}\"\n";
  for (const Arguments& seams :
       {Arguments{"--seams", "path"}, Arguments{"--seams", "none"},
        Arguments{"--cutlines", cutlines}, Arguments{"--cutlines", cutlines, "--fill-gaps"}}) {
    SCOPED_TRACE(seams.back());
    Arguments options{"--balance", "gain-offset", "--overwrite"};
    options.insert(options.end(), seams.begin(), seams.end());
    const Page page = MakePage(options);
    const Image map = Read(folder_ / "map.tif");

    Arguments plan{"mosaic", "plan", "-o", folder_ / "plan.json"};
    plan.insert(plan.end(), options.begin(), options.end());
    plan.insert(plan.end(), {names_[0], names_[1], folder_ / "out.tif"});
    ASSERT_EQ(RunProgram(plan).status, 0);
    const auto json = nlohmann::json::parse(std::ifstream(folder_ / "plan.json"));
    const auto& second = json["scenes"][1];
    const auto corrected = [&](double value, std::size_t band) {
      return value * second["gains"][band].get<double>() + second["offsets"][band].get<double>();
    };

    // By the map of sources: its edges, and the pixels across up to two of them.
    int length = 0;
    std::set<std::pair<int, int>> beside;
    for (int y = 0; y < map.height; ++y) {
      for (int x = 0; x < map.width; ++x) {
        for (const auto& [dx, dy] : {std::pair{1, 0}, {0, 1}}) {
          if (x + dx >= map.width || y + dy >= map.height) continue;
          if (map.At(x, y, 0) + map.At(x + dx, y + dy, 0) != 3) continue;
          if (map.At(x, y, 0) * map.At(x + dx, y + dy, 0) != 2) continue;
          ++length;
          for (int i = -1; i <= 2; ++i) beside.insert({x + i * dx, y + i * dy});
        }
      }
    }
    ASSERT_GT(length, 50);
    const std::vector<Row> residuals = page.Rows("residuals");
    ASSERT_EQ(residuals.size(), 3U);
    EXPECT_EQ(std::stoi(residuals[0][1]), length);
    for (std::size_t band = 0; band < 3; ++band) {
      std::vector<double> sums(4);
      double count = 0;
      for (const auto& [x, y] : beside) {
        const double* const a = At(0, x, y);
        const double* const b = At(1, x, y);
        if (a == nullptr || b == nullptr) continue;
        ++count;
        const double before = b[band] - a[band];
        const double after = corrected(b[band], band) - a[band];
        sums = {sums[0] + before, sums[1] + before * before, sums[2] + after,
                sums[3] + after * after};
      }
      const Row& row = residuals[band];
      for (std::size_t i = 0; i < 4; ++i) {
        const double mean = sums[i] / count;
        EXPECT_NEAR(std::stod(row[row.size() - 4 + i]), i % 2 == 0 ? mean : std::sqrt(mean), 0.0051)
            << "band " << band << ", number " << i;
      }
    }

    const std::vector<Row> scenes = page.Rows("scenes");
    for (std::size_t i = 0; i < 3; ++i) {
      const double number = i < 2 ? static_cast<double>(i + 1) : 0;
      EXPECT_EQ(std::stol(scenes[i][3]), std::count(map.values.begin(), map.values.end(), number));
    }
  }
}

TEST_F(MosaicReport, CommonPixelsAreThoseOfAnotherScene) {
  const Page page = MakePage({});
  const std::string card = page.Between("id=\"scene-2\"", "</article>");
  for (int band = 0; band < 3; ++band) {
    std::vector<double> own;
    double others = 0;
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < kWidth + kShift; ++x) {
        if (At(0, x, y) == nullptr || At(1, x, y) == nullptr) continue;
        own.push_back(At(1, x, y)[band]);
        others += At(0, x, y)[band];
      }
    }
    const auto count = static_cast<double>(own.size());
    double mean = 0;
    double squares = 0;
    for (const double value : own) mean += value / count;
    for (const double value : own) squares += (value - mean) * (value - mean);
    const auto text = [](double value) {
      char digits[32];
      std::snprintf(digits, sizeof digits, "<td>%.2f</td>", value);
      return std::string(digits);
    };
    const std::string expected =
        text(mean) + text(std::sqrt(squares / count)) + text(others / count);
    EXPECT_NE(card.find(expected), std::string::npos) << expected << "\n" << card;
  }
}

TEST_F(MosaicReport, PicturesShowPasteMosaicAndSources) {
  const Page page = MakePage({"--balance", "gain-offset", "--feather", "8"});
  const Image map = Read(folder_ / "map.tif");
  const Image mosaic = Read(folder_ / "out.tif");
  const Image before = Decode(page.Between("<img src=\"", "\"")).pixels;
  const Image after = Decode(page.Between("<image id=\"after\" href=\"", "\"")).pixels;
  const Image sources =
      Decode("data:" + page.Between("<div class=\"stage fine\"><img src=\"data:", "\"")).pixels;
  ASSERT_EQ(before.width, kWidth + kShift);
  ASSERT_EQ(sources.height, kHeight);
  for (int band = 0; band < 3; ++band) {
    std::vector<double> values;
    const auto pasted = [&](int x, int y) { return At(1, x, y) ? At(1, x, y) : At(0, x, y); };
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < before.width; ++x) {
        if (pasted(x, y) != nullptr) values.push_back(pasted(x, y)[band]);
      }
    }
    std::sort(values.begin(), values.end());
    const auto last = static_cast<double>(values.size() - 1);
    const double low = values[static_cast<std::size_t>(0.02 * last)];
    const double high = values[static_cast<std::size_t>(0.98 * last)];
    const auto shade = [&](double value) {
      return std::clamp((value - low) / (high - low) * 255, 0.0, 255.0);
    };
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < before.width; ++x) {
        ASSERT_EQ(before.At(x, y, 3), pasted(x, y) ? 255 : 0) << x << " " << y;
        ASSERT_EQ(after.At(x, y, 3), map.At(x, y, 0) > 0 ? 255 : 0) << x << " " << y;
        ASSERT_EQ(sources.At(x, y, 3), after.At(x, y, 3));
        if (map.At(x, y, 0) == 0) continue;
        ASSERT_NEAR(before.At(x, y, band), shade(pasted(x, y)[band]), 0.51) << x << " " << y;
        ASSERT_NEAR(after.At(x, y, band), shade(mosaic.At(x, y, band)), 0.51) << x << " " << y;
      }
    }
  }
  // The colours of the list.
  const std::regex swatch("<tr><th><span class=\"swatch\" style=\"background:#([0-9a-f]{6})");
  std::vector<double> colours;
  for (std::sregex_iterator i(page.Text().begin(), page.Text().end(), swatch), end; i != end; ++i) {
    colours.push_back(static_cast<double>(std::stol((*i)[1], nullptr, 16)));
  }
  ASSERT_EQ(colours.size(), 2U);
  for (int y = 0; y < kHeight; ++y) {
    for (int x = 0; x < map.width; ++x) {
      if (map.At(x, y, 0) == 0) continue;
      const double colour =
          sources.At(x, y, 0) * 65536 + sources.At(x, y, 1) * 256 + sources.At(x, y, 2);
      ASSERT_EQ(colour, colours[static_cast<std::size_t>(map.At(x, y, 0)) - 1]) << x << " " << y;
    }
  }
}

TEST_F(MosaicReport, OfALargeMosaicIsSmall) {
  const int width = 2600;
  const int height = 1700;
  Image noise = NoiseImage(width, height, 1, GDT_UInt16, {}, 3);
  for (double& value : noise.values) value = std::max(value, 1.0);
  Write(noise, names_[0], {}, [](GDALDataset& dataset) { Place(dataset, 0); });
  for (double& value : noise.values) value = 65536 - value;
  Write(noise, names_[1], {}, [](GDALDataset& dataset) { Place(dataset, 1); });
  const Page page = MakePage({"--seams", "none", "--tile-size", "496"});
  EXPECT_EQ(page.Fault(), "");
  EXPECT_LT(page.Text().size(), 5'000'000U);
  const Embedded after = Decode(page.Between("<image id=\"after\" href=\"", "\""));
  EXPECT_EQ(after.kind, "data:image/jpeg;base64");
  EXPECT_EQ(after.pixels.width, 1200);
  EXPECT_EQ(after.pixels.height, 784);
  const Image map = Read(folder_ / "map.tif");
  EXPECT_EQ(std::stol(page.Rows("scenes")[1][3]),
            std::count(map.values.begin(), map.values.end(), 2.0));
}

TEST_F(MosaicReport, IsRefusedBeforeTheWorkBegins) {
  std::ofstream(folder_ / "file") << "x";
  fs::create_directory(folder_ / "old");
  std::ofstream(folder_ / "old/index.html") << "old";
  const std::set<std::string> names = folder_.Names();
  ExpectOneLine(Make({"--report", folder_ / "file"}), 1, folder_ / "file");
  ExpectOneLine(Make({"--report", folder_ / "file/deeper"}), 1, "cannot create the folder");
  ExpectOneLine(Make({"--report", folder_ / "old"}), 1, "index.html exists");
  // What is wrong with the rest leaves no folder behind.
  ExpectOneLine(Make({"--report", folder_ / "new/deep/", "--te", "1", "0", "0", "1"}), 2, "--te");
  EXPECT_EQ(folder_.Names(), names);
  EXPECT_EQ(Make({"--report", folder_ / "new/deep/"}).status, 0);
  EXPECT_TRUE(fs::exists(folder_ / "new/deep/index.html"));
}

}  // namespace
}  // namespace zarn::testsupport
