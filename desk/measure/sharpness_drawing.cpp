// The photo with its marks in order, both regions where they lie, and each region's curves beside it.

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/drawing/plot.h"
#include "desk/measure/sharpness.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr double kPlotWidth = 420;
constexpr double kPlotsHeight = 760;

// The line through each row's steepest place is enough to draw the profile by.
std::vector<double> EdgeProfile(const cv::Mat& pixels) {
  QVTester tester;
  cv::Mat region;
  pixels.convertTo(region, CV_32F);
  region = tester.ConvertToVertical(region);
  cv::Mat derivative;
  float taps[] = {0.5f, -0.5f};
  tester.GetFirstDerivative(region, region.rows, region.cols, taps, 2, derivative);
  derivative = cv::abs(derivative);
  cv::Mat loc(region.rows, 1, CV_32F);
  for (int i = 0; i < region.rows; ++i)
    loc.at<float>(i) = tester.GetCentroid(derivative.row(i).mul(derivative.row(i)).t());
  float slope = 0;
  float offset = 0;
  tester.FindEdge(loc, region.rows, &slope, &offset);
  const cv::Mat profile = tester.ProjectData(region, slope, offset, 1);
  return {profile.begin<float>(), profile.end<float>()};
}

Colour ColourOf(const Reading& m) { return m.outcome == Outcome::kFail ? kPoor : m.marginal ? kDoubtful : kGood; }

const char* WordOf(const Reading& m) {
  if (!m.limit.given()) return "";
  return m.outcome == Outcome::kFail ? ", poor" : m.marginal ? ", marginal" : ", good";
}

std::string FigureText(double value) { return std::isfinite(value) ? Format("%.3f", value) : "none"; }

// Name and figures stand off the edges: below the one region, above the other.
void DrawRegion(Picture& picture, const Record& record, const PhotoPlace& place, const SharpnessRegion& region,
                std::size_t i) {
  const std::string name = kRegionNames[i];
  const Reading& mtf50 = *record.phase.Find("mtf50_" + name);
  const Colour colour = ColourOf(mtf50);
  std::vector<cv::Point2d> outline;
  for (const cv::Point2d& corner : region.outline) outline.push_back(place(corner));
  picture.Line(outline, colour, 3, true);
  cv::Point2d label = (outline[0] + outline[2]) / 2;
  for (const cv::Point2d& corner : outline)
    label.y = i == 0 ? std::max(label.y, corner.y) : std::min(label.y, corner.y);
  label.y += i == 0 ? 22 : -54;
  const double iso = record.phase.Find("mtf50_iso_" + name)->value();
  for (const std::string& line :
       {name, "MTF50 " + FigureText(mtf50.value()) + " Nyquist" + WordOf(mtf50), "ISO 12233: " + FigureText(iso)}) {
    picture.Text(line, label, 16, colour, Align::kCentre, true);
    label.y += 22;
  }
}

Plot ProfilePlot(const SharpnessRegion& region, const std::string& name) {
  const std::vector<double> profile = EdgeProfile(region.pixels);
  Plot plot;
  const auto [across, along] = std::minmax(region.pixels.cols, region.pixels.rows);
  plot.title = Format("Edge profile, %s region (%d x %d px)", name.c_str(), across, along);
  plot.x_label = "across the edge, pixels";
  plot.y_label = "grey level";
  plot.x_max = static_cast<double>(profile.size());
  plot.y_max = 255;
  for (std::size_t k = 0; k < profile.size(); ++k) plot.curve.emplace_back(static_cast<double>(k), profile[k]);
  return plot;
}

Plot ResponsePlot(const Reading& curve, const Reading& mtf50, const std::string& name) {
  Plot plot;
  plot.title = "SFR, " + name + " region";
  plot.x_label = "frequency, fraction of Nyquist";
  plot.second_x_label = "cycles per pixel";
  plot.second_x_factor = 0.5;
  plot.y_label = "response";
  plot.y_max = 1.1;
  plot.horizontal_lines = {0.5};
  for (std::size_t k = 0; k < curve.values.size(); ++k) plot.curve.emplace_back(curve.axis[k], curve.values[k]);
  plot.markers = {{{mtf50.value(), 0.5}, Format("MTF50 %.4f Nyquist", mtf50.value()), ColourOf(mtf50)}};
  return plot;
}

std::string Heading(const Record& record, const ChartView& view) {
  if (record.phase.code == QV_SUCCESS) {
    return Format("%s: %s, chart turned by %.1f degrees, threshold %d", record.test_name.c_str(),
                  Name(record.outcome()), view.turn_deg, view.threshold);
  }
  return Format("%s: code %d, %zu of 3 marks, threshold %d", record.test_name.c_str(), record.phase.code,
                view.marks.size(), view.threshold);
}

}  // namespace

std::optional<Picture> SharpnessFinding::Draw(const Record& record) const {
  if (!ShowsPhoto(record.phase.code)) return std::nullopt;
  constexpr double kPhoto = 1080;
  constexpr double kLeastWidth = 760;  // that a miss's reasons have room in
  const bool measured = record.phase.code == QV_SUCCESS;
  const double scale = FitScale(photo, kPhoto);
  const double width = photo.cols * scale;
  const double height = std::max(photo.rows * scale, measured ? kPlotsHeight : 0);
  Picture picture(cvRound(measured ? width + 2 * kPlotWidth + 16 : std::max(width, kLeastWidth)),
                  cvRound(height + kHeadPx));
  const PhotoPlace place = picture.PlacePhoto(photo, {0, kHeadPx}, scale);
  picture.Text(Heading(record, view), {12, 28}, 18, kInk);
  DrawMarks(picture, view, place);
  for (std::size_t i = 0; i < regions.size(); ++i) {
    const std::string name = kRegionNames[i];
    DrawRegion(picture, record, place, regions[i], i);
    const double left = width + 16 + static_cast<double>(i) * kPlotWidth;
    DrawPlot(picture, ProfilePlot(regions[i], name), {left, kHeadPx, kPlotWidth, 330});
    if (const Reading* curve = record.phase.Find("sfr_" + name)) {
      const Plot response = ResponsePlot(*curve, *record.phase.Find("mtf50_" + name), name);
      DrawPlot(picture, response, {left, kHeadPx + 340, kPlotWidth, 400});
    }
  }
  return picture;
}

}  // namespace qv
