// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/estimate/stagedjson.h"

#include <filesystem>
#include <fstream>
#include <system_error>

#include "apps/zarn/errors.h"
#include "apps/zarn/stagedoutput.h"

namespace zarn::app {
namespace fs = std::filesystem;

void RefuseAsOutput(const std::string& target, const std::vector<RasterSource>& sources) {
  for (const RasterSource& source : sources) {
    const CPLStringList files(source.Dataset().GetFileList());
    for (int i = 0; i < files.size(); ++i) {
      std::error_code error;
      if (fs::equivalent(files[i], target, error)) {
        throw UsageError("the output " + target + " is a file of the input " + source.Name() +
                         "; name another output");
      }
    }
  }
}

void StagedJson::Write(const nlohmann::ordered_json& content) {
  std::ofstream file(staging_.StagedFile(), std::ios::binary);
  file << content.dump(2) << '\n';
  file.close();
  if (!file) FailWriting(Name(), "");
}

}  // namespace zarn::app
