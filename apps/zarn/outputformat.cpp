// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/outputformat.h"

#include <cpl_conv.h>
#include <cpl_error.h>

#include "apps/zarn/errors.h"
#include "apps/zarn/gdalruntime.h"

namespace zarn::app {
namespace {

bool Has(GDALDriver& driver, const char* capability) {
  return driver.GetMetadataItem(capability) != nullptr;
}

// Formats that keep no pixels of their own cannot be staged and moved.
bool CanWriteFiles(GDALDriver& driver) {
  return Has(driver, GDAL_DCAP_RASTER) &&
         (Has(driver, GDAL_DCAP_CREATE) || Has(driver, GDAL_DCAP_CREATECOPY)) &&
         !EQUAL(driver.GetDescription(), "VRT") && !EQUAL(driver.GetDescription(), "MEM");
}

GDALDriver* DriverForExtension(const std::string& target) {
  const std::string extension = CPLGetExtension(target.c_str());
  GDALDriverManager& manager = *GetGDALDriverManager();
  for (int i = 0; i < manager.GetDriverCount() && !extension.empty(); ++i) {
    GDALDriver& driver = *manager.GetDriver(i);
    const char* const extensions = driver.GetMetadataItem(GDAL_DMD_EXTENSIONS);
    if (extensions == nullptr) continue;
    const CPLStringList list(CSLTokenizeString2(extensions, " ", 0));
    if (list.FindString(extension.c_str()) < 0) continue;
    if (CanWriteFiles(driver)) return &driver;
    if (EQUAL(driver.GetDescription(), "VRT")) {
      throw UsageError("a VRT holds no pixels of its own; name another output format with --of");
    }
  }
  return manager.GetDriverByName("GTiff");
}

// Colour interpretation that GeoTIFF can only be told when the file is created.
void AddColourOptions(CPLStringList& options, const RasterSource& like) {
  const auto colourOf = [&](int band) {
    return band <= like.Dataset().GetRasterCount()
               ? like.Dataset().GetRasterBand(band)->GetColorInterpretation()
               : GCI_Undefined;
  };
  const bool rgb =
      colourOf(1) == GCI_RedBand && colourOf(2) == GCI_GreenBand && colourOf(3) == GCI_BlueBand;
  const bool palette = colourOf(1) == GCI_PaletteIndex && like.Dataset().GetRasterCount() == 1;
  if (options.FetchNameValue("PHOTOMETRIC") == nullptr) {
    options.SetNameValue("PHOTOMETRIC", rgb ? "RGB" : palette ? "PALETTE" : "MINISBLACK");
  }
  if (options.FetchNameValue("ALPHA") == nullptr) {
    options.SetNameValue("ALPHA", colourOf(rgb ? 4 : 2) == GCI_AlphaBand ? "YES" : "NO");
  }
}

void AddCompression(CPLStringList& options, const SampleType& type) {
  const auto setDefault = [&](const char* key, const char* value) {
    if (options.FetchNameValue(key) == nullptr) options.SetNameValue(key, value);
  };
  setDefault("TILED", "YES");
  setDefault("BIGTIFF", "IF_SAFER");
  if (options.FetchNameValue("COMPRESS") != nullptr) return;
  // The lowest level: files grow by three per cent against the usual one, in a third of the time.
  options.SetNameValue("COMPRESS", "DEFLATE");
  setDefault("ZLEVEL", "1");
  // It works on whole bytes, so not on samples of the caller's own number of bits.
  if (options.FetchNameValue("NBITS") != nullptr) return;
  if (GDALDataTypeIsComplex(type.gdal) != FALSE) return;
  setDefault("PREDICTOR", GDALDataTypeIsFloating(type.gdal) != FALSE ? "3" : "2");
}

void AddSignedByte(CPLStringList& options, const SampleType& type) {
  if (type.IsSignedByte()) options.SetNameValue("PIXELTYPE", "SIGNEDBYTE");
}

}  // namespace

OutputFormat::OutputFormat(const std::string& name, const std::string& target,
                           const std::vector<std::string>& options) {
  if (name.empty()) {
    driver_ = DriverForExtension(target);
  } else {
    driver_ = GetGDALDriverManager()->GetDriverByName(name.c_str());
    if (driver_ == nullptr) {
      throw UsageError("--of " + name + ": GDAL knows no such format (see gdalinfo --formats)");
    }
    if (!CanWriteFiles(*driver_)) {
      throw UsageError("--of " + name + ": this format cannot be written to a file");
    }
  }
  for (const std::string& option : options) {
    const std::size_t equals = option.find('=');
    if (equals == 0 || equals == std::string::npos) {
      throw UsageError("--co " + option + ": write it as KEY=VALUE");
    }
    options_.SetNameValue(option.substr(0, equals).c_str(), option.substr(equals + 1).c_str());
  }
  RefuseUnknownOptions();
}

void OutputFormat::RefuseUnknownOptions() {
  // GDAL itself only warns and goes on without the option, into a file that was not asked for.
  CPLErrorReset();
  CPLPushErrorHandler(CPLQuietErrorHandler);
  const bool known = GDALValidateCreationOptions(driver_, options_.List()) != FALSE;
  CPLPopErrorHandler();
  if (!known) throw UsageError("--co: " + LastGdalMessage());
}

bool OutputFormat::WritesBlocks() const { return Has(*driver_, GDAL_DCAP_CREATE); }

void OutputFormat::RequireSamples(const SampleType& type) const {
  const char* const types = driver_->GetMetadataItem(GDAL_DMD_CREATIONDATATYPES);
  const char* const options = driver_->GetMetadataItem(GDAL_DMD_CREATIONOPTIONLIST);
  const bool isGeoTiff = EQUAL(driver_->GetDescription(), "GTiff");
  const bool copiesSignedBytes = EQUAL(driver_->GetDescription(), "COG");
  // GDAL 3.6 leaves 64-bit integers out of GeoTIFF's list, though it writes them.
  const bool unlisted = isGeoTiff && (type.gdal == GDT_Int64 || type.gdal == GDT_UInt64);
  const bool holds =
      type.IsSignedByte()
          ? copiesSignedBytes || (options != nullptr && strstr(options, "SIGNEDBYTE") != nullptr)
          : types == nullptr || unlisted ||
                CPLStringList(CSLTokenizeString2(types, " ", 0))
                        .FindString(GDALGetDataTypeName(type.gdal)) >= 0;
  if (!holds) {
    throw RunError("the format " + Name() + " cannot hold " + type.Name() +
                   " samples; choose another with --of");
  }
}

CPLStringList OutputFormat::OptionsFor(const SampleType& type) const {
  CPLStringList options(options_);
  if (EQUAL(driver_->GetDescription(), "GTiff")) {
    AddCompression(options, type);
  } else if (EQUAL(driver_->GetDescription(), "COG") &&
             options.FetchNameValue("BIGTIFF") == nullptr) {
    options.SetNameValue("BIGTIFF", "IF_SAFER");
  }
  if (WritesBlocks()) AddSignedByte(options, type);
  return options;
}

CPLStringList OutputFormat::OptionsFor(const RasterSource& like) const {
  CPLStringList options = OptionsFor(like.Type());
  if (EQUAL(driver_->GetDescription(), "GTiff")) AddColourOptions(options, like);
  return options;
}

CPLStringList OutputFormat::ScratchOptionsFor(const RasterSource& like) {
  CPLStringList options;
  AddCompression(options, like.Type());
  AddColourOptions(options, like);
  AddSignedByte(options, like.Type());
  return options;
}

}  // namespace zarn::app
