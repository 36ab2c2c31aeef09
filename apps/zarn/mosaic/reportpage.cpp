// SPDX-License-Identifier: Apache-2.0
#include "apps/zarn/mosaic/reportpage.h"

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <numeric>

#include "apps/zarn/mosaic/reportskeleton.h"
#include "apps/zarn/mosaic/reporttext.h"

namespace zarn::app {
namespace {

std::string Cell(const std::string& contents) { return "<td>" + contents + "</td>"; }
std::string TextCell(const std::string& text) {
  return "<td class=\"text\">" + Escaped(text) + "</td>";
}

std::string Fact(const std::string& name, const std::string& value) {
  return "<dt>" + name + "</dt><dd>" + Escaped(value) + "</dd>";
}

std::string Percent(double part, double whole) {
  return (whole > 0 ? Fixed(100 * part / whole, 2) : "0.00") + "&nbsp;%";
}

std::string Swatch(const Rgb& colour) {
  constexpr const char* kDigits = "0123456789abcdef";
  std::string code = "#";
  for (const std::uint8_t part : colour) code.append({kDigits[part / 16], kDigits[part % 16]});
  return "<span class=\"swatch\" style=\"background:" + code + "\"></span>";
}

std::string CrsName(const OGRSpatialReference& crs) {
  const char* const name = crs.IsEmpty() ? nullptr : crs.GetName();
  return name != nullptr ? name : "none";
}

std::string UnitName(const OGRSpatialReference& crs) {
  if (crs.IsEmpty()) return {};
  const char* name = nullptr;
  if (crs.IsGeographic() != 0) {
    crs.GetAngularUnits(&name);
  } else {
    crs.GetLinearUnits(&name);
  }
  return name != nullptr ? std::string(" ") + name : std::string();
}

std::string Facts(const MosaicOptions& options, const MosaicPlan& plan) {
  std::string facts;
  const OutputGrid& grid = plan.grid;
  facts +=
      Fact("Size", std::to_string(grid.width) + " x " + std::to_string(grid.height) + " pixels");
  facts += Fact("Pixel", Shortest(std::abs(grid.transform[1])) + " x " +
                             Shortest(std::abs(grid.transform[5])) + UnitName(grid.crs));
  facts += Fact("Coordinate system", CrsName(grid.crs));
  facts += Fact("Resampling", options.resampling);
  facts += Fact("Balance", options.balance);
  if (!options.reference.empty()) facts += Fact("Reference", options.reference);
  if (options.hotSpot) facts += Fact("Hot spots", "removed");
  if (options.filter != "none") {
    facts += Fact("Filter", options.filter + ", " + std::to_string(options.filterSize) + " x " +
                                std::to_string(options.filterSize));
  }
  facts +=
      Fact("Seams", !options.cutlines.empty() ? "cutlines of " + options.cutlines : options.seams);
  facts += Fact("Feather", std::to_string(options.feather) + " pixels");
  facts += Fact("Order", options.order);
  if (options.fillGaps) facts += Fact("Gaps", "filled");
  std::string noData;
  for (const double value : plan.noData) noData += (noData.empty() ? "" : ", ") + Shortest(value);
  facts += Fact("No-data", noData.empty() ? "none" : noData);
  return facts;
}

std::string SceneRows(const MosaicPlan& plan, const ReportContents& contents) {
  const std::vector<std::int64_t>& pixels = contents.pixels;
  const auto withData =
      static_cast<double>(std::accumulate(pixels.begin() + 1, pixels.end(), std::int64_t{0}));
  std::string rows;
  for (std::size_t i = 0; i < plan.scenes.size(); ++i) {
    const std::int64_t count = pixels[i + 1];
    rows += "<tr><th>" + Swatch(contents.colours[i]) + std::to_string(i + 1) + "</th>" +
            TextCell(plan.scenes[i].label) + TextCell(plan.scenes[i].File()) +
            Cell(std::to_string(count)) + Cell(Percent(static_cast<double>(count), withData)) +
            "</tr>\n";
  }
  return rows + "<tr><th></th><td class=\"text faint\">no data</td><td></td>" +
         Cell(std::to_string(pixels.front())) + "<td></td></tr>";
}

double OnAxis(const HistogramAxis& axis, double value) {
  return std::clamp((value - axis.begin) / axis.width, 0.0, static_cast<double>(axis.bins));
}

std::string MarkAt(const HistogramAxis& axis, double value, const char* kind) {
  const std::string x = Fixed(OnAxis(axis, value), 2);
  return std::string("<line class=\"") + kind + "\" x1=\"" + x + "\" x2=\"" + x +
         "\" y1=\"0\" y2=\"100\"/>";
}

std::string Histogram(const CommonValues& values, const HistogramAxis& axis, std::int64_t most,
                      const std::string& name) {
  std::string path = "M0 100";
  for (std::size_t i = 0; i < values.bins.size(); ++i) {
    const double share =
        static_cast<double>(values.bins[i]) / static_cast<double>(std::max<std::int64_t>(most, 1));
    path += 'V' + Fixed(100 - 98 * share, 0) + 'H' + std::to_string(i + 1);
  }
  return "<svg class=\"histogram\" viewBox=\"0 0 " + std::to_string(axis.bins) +
         " 100\" preserveAspectRatio=\"none\" role=\"img\" aria-label=\"" + Escaped(name) +
         "\"><path d=\"" + path + "V100Z\"/>" + MarkAt(axis, values.mean, "own") +
         MarkAt(axis, values.othersMean, "others") + "</svg>";
}

std::string StateCells(const char* state, const CommonValues& values, const HistogramAxis& axis,
                       std::int64_t most, const std::string& name) {
  return TextCell(state) + Cell(Histogram(values, axis, most, name + ", " + state)) +
         Cell(Fixed(values.mean, axis.decimals)) + Cell(Fixed(values.deviation, axis.decimals)) +
         Cell(Fixed(values.othersMean, axis.decimals));
}

std::int64_t Most(const CommonValues& values) {
  return values.bins.empty() ? 0 : *std::max_element(values.bins.begin(), values.bins.end());
}

std::string SceneCard(std::size_t scene, const std::string& label, const Rgb& colour,
                      const ReportFigures& figures) {
  const std::vector<CommonValues>& before = figures.before.scenes[scene];
  const std::vector<CommonValues>& after = figures.after.scenes[scene];
  const std::string number = std::to_string(scene + 1);
  std::string card = "<article class=\"card\"><h3 id=\"scene-" + number + "\">" + Swatch(colour) +
                     number + "&ensp;" + Escaped(label) + "</h3>";
  if (before.front().count == 0) {
    return card + "<p class=\"faint\">No other scene has data where this one has.</p></article>";
  }
  card +=
      "<div class=\"wide\" role=\"region\" aria-labelledby=\"scene-" + number +
      "\" tabindex=\"0\"><table class=\"common\"><thead><tr><th class=\"text\">Band</th><th></th>"
      "<th></th><th>Mean</th><th>Std. dev.</th><th>Others</th></tr></thead><tbody>";
  for (std::size_t band = 0; band < before.size(); ++band) {
    const HistogramAxis& axis = figures.axes[band];
    const std::int64_t most = std::max(Most(before[band]), Most(after[band]));
    const std::string name = label + ", band " + std::to_string(band + 1);
    card += "<tr class=\"before\"><th rowspan=\"2\">" + std::to_string(band + 1) + "</th>" +
            StateCells("before", before[band], axis, most, name) + "</tr><tr>" +
            StateCells("after", after[band], axis, most, name) + "</tr>\n";
  }
  return card + "</tbody></table></div></article>\n";
}

std::string Common(const Planning& planning, const ReportContents& contents) {
  std::string text =
      "<p>Values of each scene where another scene has data too, before and after its correction "
      "(<span class=\"key\"></span> mean, <span class=\"key others\"></span> mean of what the "
      "others have in the same places). Histograms of a band have the same axis in all scenes, "
      "three standard deviations about the mean of all.";
  if (planning.survey->step > 1) {
    text += " Of every " + std::to_string(planning.survey->step) + " x " +
            std::to_string(planning.survey->step) + " pixels one was looked at.";
  }
  text += "</p>\n<div class=\"cards\">\n";
  for (std::size_t i = 0; i < planning.plan.scenes.size(); ++i) {
    text += SceneCard(i, planning.plan.scenes[i].label, contents.colours[i], contents.figures);
  }
  return text + "</div>";
}

std::string ResidualCells(const SeamResidual& residual, std::size_t band, int decimals) {
  if (residual.cells == 0) return Cell("&#8211;") + Cell("&#8211;");
  return Cell(Fixed(residual.meanDifference[band], decimals)) +
         Cell(Fixed(residual.rootMeanSquare[band], decimals));
}

std::string ResidualRows(const Planning& planning, const ReportContents& contents) {
  const ReportFigures& figures = contents.figures;
  const auto name = [&](std::uint32_t scene) {
    return "<div>" + Swatch(contents.colours[scene]) + std::to_string(scene + 1) + "&ensp;" +
           Escaped(planning.plan.scenes[scene].label) + "</div>";
  };
  std::string rows;
  for (std::size_t i = 0; i < figures.before.seams.size(); ++i) {
    const SeamResidual& before = figures.before.seams[i];
    const std::size_t bands = before.meanDifference.size();
    const std::string span = " rowspan=\"" + std::to_string(bands) + "\">";
    for (std::size_t band = 0; band < bands; ++band) {
      rows += "<tr>";
      if (band == 0) {
        rows.append("<th scope=\"rowgroup\"").append(span);
        rows.append(name(before.first)).append(name(before.second)).append("</th><td").append(span);
        rows.append(std::to_string(before.length * planning.survey->step)).append("</td>");
      }
      const int decimals = figures.axes[band].decimals;
      rows += Cell(std::to_string(band + 1)) + ResidualCells(before, band, decimals) +
              ResidualCells(figures.after.seams[i], band, decimals) + "</tr>\n";
    }
  }
  return rows;
}

std::string Residuals(const Planning& planning, const ReportContents& contents) {
  if (contents.figures.before.seams.empty()) {
    return "<p class=\"faint\">No two scenes have a common seam.</p>";
  }
  const std::string reach = std::to_string(2 * planning.survey->step);
  return "<p>The second scene minus the first one, in pixels within " + reach +
         " of their seam where both have data, before and after their corrections (without the "
         "feather, which hides what is left). The length is that of the pixels' edges.</p>\n"
         "<div class=\"wide\" role=\"region\" aria-labelledby=\"residuals-title\" tabindex=\"0\">"
         "<table id=\"residuals\"><thead><tr><th class=\"text\" rowspan=\"2\">Scenes</th>"
         "<th rowspan=\"2\">Length</th><th rowspan=\"2\">Band</th><th colspan=\"2\">Before</th>"
         "<th colspan=\"2\">After</th></tr><tr><th>Mean</th><th>RMS</th><th>Mean</th><th>RMS</th>"
         "</tr></thead><tbody>" +
         ResidualRows(planning, contents) + "</tbody></table></div>";
}

std::string TimeRows(const std::vector<std::pair<std::string, double>>& seconds) {
  double total = 0;
  for (const auto& [step, taken] : seconds) total += taken;
  std::string rows;
  for (const auto& [step, taken] : seconds) {
    const std::string share = Fixed(total > 0 ? 100 * taken / total : 0, 1);
    rows += "<tr>" + TextCell(step) + Cell(Fixed(taken, 2)) +
            "<td class=\"chart\"><span class=\"bar\" style=\"width:" + share +
            "%\"></span></td></tr>\n";
  }
  return rows + "<tr><th>total</th>" + Cell(Fixed(total, 2)) + "<td></td></tr>";
}

std::string SeamsNote(const MosaicOptions& options, const ReportContents& contents) {
  if (!contents.seams.empty()) return "The cutlines where they part two scenes, over the mosaic.";
  const bool hasCutlines = !options.cutlines.empty() || options.seams == "path";
  return hasCutlines ? "No cutline parts two scenes." : "The scenes were pasted whole.";
}

}  // namespace

std::string ReportPage(const MosaicOptions& options, const Planning& planning,
                       const ReportContents& contents) {
  const MosaicPlan& plan = planning.plan;
  const std::string name = std::filesystem::path(options.output.target).filename().string();
  // Smaller ones are shown enlarged.
  constexpr int kFine = 400;
  const std::size_t scenes = plan.scenes.size();
  const std::string summary = std::to_string(scenes) + (scenes == 1 ? " scene" : " scenes") + ", " +
                              std::to_string(planning.survey->channels) +
                              (planning.survey->channels == 1 ? " band" : " bands") + " of " +
                              planning.survey->type.Name();
  return Filled(kReportSkeleton,
                {{"name", Escaped(name)},
                 {"summary", summary},
                 {"facts", Facts(options, plan)},
                 {"freed", options.hotSpot ? ", freed of their hot spots only" : ""},
                 {"width", std::to_string(contents.width)},
                 {"height", std::to_string(contents.height)},
                 {"aspect", Fixed(static_cast<double>(contents.width) / contents.height, 5)},
                 {"shape", contents.width < contents.height ? " tall" : ""},
                 {"fine", std::max(contents.width, contents.height) < kFine ? " fine" : ""},
                 {"before", contents.before},
                 {"after", contents.after},
                 {"map", contents.map},
                 {"seams", contents.seams},
                 {"seamsNote", SeamsNote(options, contents)},
                 {"scenes", SceneRows(plan, contents)},
                 {"common", Common(planning, contents)},
                 {"residuals", Residuals(planning, contents)},
                 {"times", TimeRows(planning.seconds)}});
}

}  // namespace zarn::app
