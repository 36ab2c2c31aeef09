// SPDX-License-Identifier: Apache-2.0
#include <gdal.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <set>
#include <string>

#include "apps/zarn/errors.h"
#include "apps/zarn/stagingfolder.h"

namespace zarn::app {
namespace {

namespace fs = std::filesystem;

class StagingFolderTest : public testing::Test {
 protected:
  void SetUp() override {
    GDALAllRegister();
    std::string name = (fs::temp_directory_path() / "zarnstaging-XXXXXX").string();
    ASSERT_NE(mkdtemp(name.data()), nullptr);
    root_ = name;
  }
  void TearDown() override { fs::remove_all(root_); }

  static void Put(const fs::path& file, const std::string& text) { std::ofstream(file) << text; }
  static std::string Contents(const fs::path& file) {
    std::ifstream stream(file);
    return {std::istreambuf_iterator<char>(stream), {}};
  }
  std::set<std::string> Names() const {
    std::set<std::string> names;
    for (const auto& entry : fs::directory_iterator(root_)) names.insert(entry.path().filename());
    return names;
  }

  fs::path root_;
};

TEST_F(StagingFolderTest, NeverReplacesAFileThatAppearedMeanwhile) {
  // The file itself, one that the format writes beside it, and one that would be read with it.
  for (const char* const late : {"out.img", "out.hdr", "out.img.msk"}) {
    SCOPED_TRACE(late);
    {
      StagingFolder staging(root_ / "out.img", false);
      Put(staging.StagedFile(), "new");
      Put(staging.StagedFile().replace_extension("hdr"), "new");
      Put(root_ / late, "late");
      EXPECT_THROW(staging.Publish(), RunError);
    }
    EXPECT_EQ(Names(), std::set<std::string>{late});
    EXPECT_EQ(Contents(root_ / late), "late");
    fs::remove(root_ / late);
  }
}

TEST_F(StagingFolderTest, WithdrawsWhatItCreatedButNotWhatItReplaced) {
  for (const bool overwrite : {false, true}) {
    StagingFolder staging(root_ / "out.tif", overwrite);
    Put(staging.StagedFile(), "new");
    staging.Publish();
    EXPECT_EQ(Contents(root_ / "out.tif"), "new");
    staging.Withdraw();
    EXPECT_EQ(fs::exists(root_ / "out.tif"), overwrite);
  }
}

TEST_F(StagingFolderTest, WritesTheFileThatADanglingLinkNames) {
  fs::create_symlink("real.tif", root_ / "link.tif");
  {
    StagingFolder staging(root_ / "link.tif", false);
    Put(staging.StagedFile(), "new");
    staging.Publish();
  }
  EXPECT_TRUE(fs::is_symlink(root_ / "link.tif"));
  EXPECT_EQ(Contents(root_ / "real.tif"), "new");
}

}  // namespace
}  // namespace zarn::app
