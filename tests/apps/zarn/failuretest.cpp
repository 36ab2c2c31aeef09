// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "tests/apps/zarn/image.h"
#include "tests/apps/zarn/program.h"

namespace zarn::testsupport {
namespace {

namespace fs = std::filesystem;
using Arguments = std::vector<std::string>;

// One of everything that can be wrong with an input.
void WriteInputs(const TemporaryFolder& folder) {
  Write(NoiseImage(60, 40, 3, GDT_Byte, {}, 1), folder / "good.tif");
  Write(NoiseImage(61, 40, 1, GDT_Byte, {}, 1), folder / "mask61.tif");
  Write(NoiseImage(60, 40, 1, GDT_Byte, {}, 1), folder / "moved.tif", {}, [](GDALDataset& dataset) {
    double transform[6] = {1000, 1, 0, 0, 0, -1};
    dataset.SetGeoTransform(transform);
  });
  Write(NoiseImage(60, 40, 1, GDT_Byte, {}, 1), folder / "placed.tif", {},
        [](GDALDataset& dataset) {
          double transform[6] = {0, 1, 0, 0, 0, -1};
          dataset.SetGeoTransform(transform);
        });
  Write(Image(6, 4, 1, GDT_CFloat32), folder / "complex.tif");
  Write(Image(6, 4, 1, GDT_Int64), folder / "int64.tif");
  Write(Image(6, 4, 1, GDT_Byte), folder / "palette.tif", {}, [](GDALDataset& dataset) {
    GDALColorTable table;
    const GDALColorEntry red{255, 0, 0, 255};
    table.SetColorEntry(1, &red);
    dataset.GetRasterBand(1)->SetColorTable(&table);
  });
  Write(NoiseImage(600, 400, 1, GDT_Byte, {}, 1), folder / "cut.tif", {"TILED=YES"});
  fs::resize_file(folder / "cut.tif", 200000);
  std::ofstream(folder / "text.tif") << "not a raster";
  std::ofstream(folder / "mixed.vrt")
      << "<VRTDataset rasterXSize='4' rasterYSize='4'><VRTRasterBand dataType='Byte' band='1'/>"
         "<VRTRasterBand dataType='Int16' band='2'/></VRTDataset>";
  std::ofstream(folder / "existing.tif") << "precious";
  // Rasters in places that belong to another output.
  Write(NoiseImage(30, 20, 1, GDT_Byte, {}, 1), folder / "good.tif.ovr");
  Write(NoiseImage(60, 40, 1, GDT_Byte, {}, 1), folder / "absent.tif.msk");
  fs::create_symlink("circle.tif", folder / "circle.tif");
}

TEST(WrongInput, EndsInOneLineAndLeavesNothing) {
  const TemporaryFolder folder;
  WriteInputs(folder);
  const std::set<std::string> before = folder.Names();
  const std::string good = folder / "good.tif";
  const std::string out = folder / "out.tif";
  struct Case {
    Arguments arguments;  ///< after "average"
    int status;
    std::string message;
  };
  const std::vector<Case> cases{
      {{folder / "missing.tif", out}, 1, "missing.tif: No such file"},
      {{folder / "text.tif", out}, 1, "not recognized"},
      {{folder / "cut.tif", out}, 1, "cannot read"},
      {{folder / "complex.tif", out},
       1,
       "band 1 is CFloat32: Unknown raster block data type for average filter."},
      {{folder / "int64.tif", out},
       1,
       "band 1 is Int64: Unknown raster block data type for average filter."},
      {{folder / "mixed.vrt", out}, 1, "band 1 is Byte, band 2 is Int16"},
      {{folder / "palette.tif", out}, 1, "-expand rgb"},
      {{good, folder / "existing.tif"}, 1, "--overwrite"},
      {{good, folder / "nowhere/out.tif"}, 1, "there is no folder"},
      {{"--overwrite", good, folder / "."}, 1, "not a regular file"},
      {{"--overwrite", good, good}, 2, "name another output"},
      {{"--overwrite", folder / "good.tif.ovr", good}, 2, "a file of the input"},
      {{"--mask", folder / "absent.tif.msk", good, folder / "absent.tif"},
       2,
       "would replace " + folder / "absent.tif.msk"},
      {{good, folder / "absent.tif"}, 1, "absent.tif.msk exists"},
      {{good, folder / "circle.tif"}, 1, "symbolic links"},
      {{good, "/dev/null"}, 1, "/dev/null is not a regular file"},
      // Here an open file without a name, otherwise a pipe or a terminal.
      {{good, "/dev/stdout"}, 1, "/dev/stdout is not a regular file"},
      {{"--mask", folder / "mask61.tif", good, out}, 1, "61 x 40"},
      {{"--mask", good, good, out}, 1, "3 bands"},
      {{"--mask", folder / "moved.tif", folder / "placed.tif", out}, 1, "elsewhere"},
      {{"--mask", folder / "missing.tif", good, out}, 1, "missing.tif"},
      {{"--overwrite", "--mask", folder / "placed.tif", good, folder / "placed.tif"},
       2,
       "is the mask file"},
      {{"--size", "abc", good, out}, 2, "'abc'"},
      {{"--size", "0", good, out}, 2, "at least 1"},
      {{"--size", "-3", good, out}, 2, "at least 1"},
      {{"--size", "2.5", good, out}, 2, "'2.5'"},
      {{"--size", "", good, out}, 2, "--size"},
      {{"--src-nodata", "1,2", good, out}, 2, "has 2 values, but"},
      {{"--dst-nodata", "1,2,3,4", good, out}, 2, "has 3 bands"},
      {{"--src-nodata", "water", good, out}, 2, "'water'"},
      {{"--src-nodata", "0,0,none", good, out}, 2, "--src-nodata: 'none' must stand alone"},
      {{"--dst-nodata", "none,0,0", good, out}, 2, "--dst-nodata: 'none' must stand alone"},
      {{"--background", "1,2,3", good, out}, 2, "--background"},
      {{"--window", "7", good, out}, 2, "COLSxROWS"},
      {{"--window", "0x7", good, out}, 2, "COLSxROWS"},
      {{"--threads", "-1", good, out}, 2, "--threads"},
      {{"--of", "NOSUCH", good, out}, 2, "NOSUCH"},
      {{"--of", "VRT", good, out}, 2, "VRT"},
      {{good, folder / "out.vrt"}, 2, "VRT"},
      {{"--of", "PNG", folder / "complex.tif", out}, 1, "CFloat32"},
      {{"--co", "COMPRESS", good, out}, 2, "KEY=VALUE"},
      {{"--co", "COMPRES=LZW", good, out}, 2, "COMPRES"},
      {{"--memory", "1", "--size", "5001", folder / "cut.tif", out}, 1, "--memory"},
      {{"--src-nodata", "", good, out}, 2, "--src-nodata: it is empty"},
      {{"--dst-nodata", "", good, out}, 2, "--dst-nodata: it is empty"},
      {{"--background", "", good, out}, 2, "--background: it is empty"},
      {{"--mask", "", good, out}, 2, "--mask: it is empty"},
      {{"--of", "", good, out}, 2, "--of: it is empty"},
      {{"", out}, 2, "IN: it is empty"},
      {{good, ""}, 2, "OUT: it is empty"},
      {{good}, 2, "OUT is required"},
      {{}, 2, "IN is required"},
      {{good, out, out}, 2, "not expected"},
      {{"--sise", "3", good, out}, 2, "--sise"},
  };
  for (const Case& c : cases) {
    Arguments arguments{"average"};
    arguments.insert(arguments.end(), c.arguments.begin(), c.arguments.end());
    std::string line;
    for (const std::string& argument : arguments) line += argument + " ";
    SCOPED_TRACE(line);
    ExpectOneLine(RunProgram(arguments), c.status, c.message);
    EXPECT_EQ(folder.Names(), before);
  }
  ExpectOneLine(RunProgram({}), 2, "--help");
  ExpectOneLine(RunProgram({"avrage", good, out}), 2, "no command 'avrage'");
  ExpectOneLine(RunProgram({"sample", ""}), 2, "DIR: it is empty");
  EXPECT_EQ(fs::file_size(folder / "existing.tif"), 8U);
}

TEST(WrongInput, HelpAndVersionSucceed) {
  EXPECT_EQ(RunProgram({"--version"}).out.substr(0, 5), "zarn ");
  const Outcome help = RunProgram({"average", "--help"});
  EXPECT_EQ(help.status, 0);
  EXPECT_NE(help.out.find("zarn average --size 5 "), std::string::npos) << help.out;
}

TEST(WrongInput, HelpFitsATerminal) {
  for (const Arguments& page : std::vector<Arguments>{{}, {"average"}, {"sample"}}) {
    Arguments arguments = page;
    arguments.emplace_back("--help");
    std::istringstream help(RunProgram(arguments).out);
    for (std::string line; std::getline(help, line);) EXPECT_LE(line.size(), 80U) << line;
  }
}

TEST(FullDisk, IsReportedAndLeavesTheExistingOutput) {
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
  GTEST_SKIP() << "the limit on file sizes also hits the thread sanitizer's own mappings";
#endif
#endif
  const TemporaryFolder folder;
  Write(NoiseImage(700, 500, 1, GDT_Float32, {}, 1), folder / "in.tif");
  for (const Arguments& format : std::vector<Arguments>{{},
                                                        {"--co", "COMPRESS=NONE"},
                                                        {"--of", "COG"},
                                                        {"--of", "ENVI"},
                                                        {"--of", "HFA"},
                                                        {"--of", "AAIGrid"}}) {
    std::ofstream(folder / "out.tif") << "precious";
    Arguments arguments{"average", "--overwrite", folder / "in.tif", folder / "out.tif"};
    arguments.insert(arguments.begin() + 1, format.begin(), format.end());
    SCOPED_TRACE(format.empty() ? "default" : format.back());
    ExpectOneLine(RunProgram(arguments, 100000), 1, "larger than files may become");
    EXPECT_EQ(folder.Names(), (std::set<std::string>{"in.tif", "out.tif"}));
    EXPECT_EQ(fs::file_size(folder / "out.tif"), 8U);
  }
  ExpectOneLine(RunProgram({"sample", folder / "new"}, 100000), 1, "larger than files may become");
  EXPECT_EQ(folder.Names(), (std::set<std::string>{"in.tif", "out.tif"}));
}

TEST(FullDisk, IsNoticedDownToTheLastByte) {
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
  GTEST_SKIP() << "the limit on file sizes also hits the thread sanitizer's own mappings";
#endif
#endif
  const TemporaryFolder folder;
  Write(NoiseImage(200, 150, 1, GDT_UInt16, {}, 1), folder / "in.tif");
  // Some of these drivers do not look whether their last bytes were taken.
  for (const std::string format :
       {"GTiff", "COG", "PNG", "ENVI", "HFA", "PCIDSK", "AAIGrid", "XYZ"}) {
    SCOPED_TRACE(format);
    const Arguments arguments{"average",         "--overwrite",      "--of", format,
                              folder / "in.tif", folder / "out.tif", "-q"};
    ASSERT_EQ(RunProgram(arguments).status, 0);
    const std::uint64_t size = fs::file_size(folder / "out.tif");
    for (const std::uint64_t missing : {1U, 100U, 5000U}) {
      ExpectOneLine(RunProgram(arguments, size - missing), 1, "larger than files may become");
      EXPECT_EQ(fs::file_size(folder / "out.tif"), size);
    }
  }
}

TEST(Interruption, LeavesNothingAndKeepsTheExistingOutput) {
  const TemporaryFolder folder;
  // Empty tiles take no space in the input, but keep the program busy for long enough.
  GDALAllRegister();
  const char* const sparse[] = {"SPARSE_OK=TRUE", "TILED=YES", "BIGTIFF=YES", nullptr};
  GDALClose(GetGDALDriverManager()->GetDriverByName("GTiff")->Create(
      (folder / "in.tif").c_str(), 100000, 100000, 1, GDT_Byte, const_cast<char**>(sparse)));
  for (const int number : {SIGINT, SIGTERM}) {
    std::ofstream(folder / "out.tif") << "precious";
    Program program({"average", "--overwrite", folder / "in.tif", folder / "out.tif"});
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(20);
    while (folder.Names().size() < 3 && std::chrono::steady_clock::now() < deadline) {
      std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    ASSERT_EQ(folder.Names().size(), 3U) << "the program writes beside its output";
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    program.Signal(number);
    ExpectOneLine(program.Wait(), 1, "interrupted");
    EXPECT_EQ(folder.Names(), (std::set<std::string>{"in.tif", "out.tif"}));
    EXPECT_EQ(fs::file_size(folder / "out.tif"), 8U);
  }
}

}  // namespace
}  // namespace zarn::testsupport
