// The photo with its marks in order, both regions where they lie, and each region's curves beside it.

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/drawing/plot.h"
#include "desk/measure/heading.h"
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

std::string FigureText(double value) { return std::isfinite(value) ? Format("%.3f", value) : "none"; }

// Name, figures and limit stand beside the region.
void DrawRegion(Picture& picture, Labels& labels, const Record& record, const cv::Rect2d& box,
                const std::string& name) {
  const Reading& mtf50 = *record.phase.Find("mtf50_" + name);
  const Reading& iso = *record.phase.Find("mtf50_iso_" + name);
  PlaceWords words(name);
  words.Add(mtf50, "MTF50 " + FigureText(mtf50.value()) + " Nyquist");
  words.Add(iso, "ISO 12233: " + FigureText(iso.value()));
  labels.Add(picture, words.Lines(), box, words.tone());
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
  plot.curves = {{"mean along the edge", {}, kSeries[0]}};
  plot.curves[0].ends_only = true;
  for (std::size_t k = 0; k < profile.size(); ++k) {
    plot.curves[0].points.emplace_back(static_cast<double>(k), profile[k]);
  }
  return plot;
}

void AddCurve(Plot& plot, const Phase& phase, const std::string& figure, const char* name) {
  const Reading* const curve = phase.Find(figure);
  if (curve == nullptr) return;
  Plot::Curve drawn = {name, {}, kSeries[plot.curves.size()]};
  drawn.ends_only = true;
  for (std::size_t k = 0; k < curve->values.size(); ++k) drawn.points.emplace_back(curve->axis[k], curve->values[k]);
  plot.curves.push_back(std::move(drawn));
}

// The test's own response and that by ISO 12233, with MTF50 of each and its limits.
Plot ResponsePlot(const Phase& phase, const std::string& name) {
  Plot plot;
  plot.title = "SFR, " + name + " region";
  plot.x_label = "frequency, fraction of Nyquist";
  plot.second_x_label = "cycles per pixel";
  plot.second_x_factor = 0.5;
  plot.y_label = "response";
  plot.levels = {{0.5, "response 0.5"}};
  AddCurve(plot, phase, "sfr_" + name, "the test's own");
  AddCurve(plot, phase, "sfr_iso_" + name, "ISO 12233");
  plot.y_max = 1.1;
  for (const Plot::Curve& curve : plot.curves) {
    for (const cv::Point2d& p : curve.points) plot.y_max = std::max(plot.y_max, std::isfinite(p.y) ? p.y * 1.05 : 0);
  }
  for (const auto& [figure, label] : {std::pair{"mtf50_", "own"}, {"mtf50_iso_", "ISO"}}) {
    const Reading* const mtf50 = phase.Find(figure + name);
    if (mtf50 == nullptr) continue;
    plot.markers.push_back({{mtf50->value(), 0.5}, Format("MTF50 %s %.4f", label, mtf50->value()), ToneOf(*mtf50)});
    for (const auto& [limit, side] : {std::pair{mtf50->limit.min, "at least"}, {mtf50->limit.max, "at most"}}) {
      if (!limit) continue;
      plot.levels.push_back(
          {*limit, Format("%s: %s %g, %s", label, side, *limit, Name(mtf50->outcome)), true, ToneOf(*mtf50)});
    }
  }
  return plot;
}

std::string TitleOf(const Record& record, const ChartView& view) {
  if (record.phase.code == QV_SUCCESS) {
    return Format("%s, threshold %d", record.test_name.c_str(), view.threshold);
  }
  return Format("%s: code %d, %zu of 3 marks, threshold %d", record.test_name.c_str(), record.phase.code,
                view.marks.size(), view.threshold);
}

}  // namespace

std::optional<Picture> SharpnessFinding::Draw(const Record& record) const {
  if (!ShowsPhoto(record.phase.code)) return std::nullopt;
  constexpr double kPhoto = 1080;
  constexpr double kLeastWidth = 900;  // that a miss's reasons have room in
  const bool measured = record.phase.code == QV_SUCCESS;
  const double scale = FitScale(photo, kPhoto);
  const double width = photo.cols * scale;
  const double height = std::max(photo.rows * scale, measured ? kPlotsHeight : 0);
  const double whole = measured ? width + 2 * kPlotWidth + 16 : std::max(width, kLeastWidth);
  const Heading heading(record, TitleOf(record, view), whole, {"chart_turn"});
  const double top = heading.height();
  Picture picture(cvRound(whole), cvRound(height + top));
  heading.Draw(picture);
  const PhotoPlace place = picture.PlacePhoto(photo, {0, top}, scale);
  Labels labels({0, top, measured ? width : whole, height});  // below a low photo is room beside the plots
  std::vector<cv::Rect2d> boxes;
  for (std::size_t i = 0; i < regions.size(); ++i) {
    std::vector<cv::Point2d> outline;
    for (const cv::Point2d& corner : regions[i].outline) outline.push_back(place(corner));
    picture.Line(outline, ToneOf(*record.phase.Find(std::string("mtf50_") + kRegionNames[i])), 3, true);
    boxes.push_back(BoxAbout(outline));
    labels.Keep(boxes.back());
  }
  DrawMarks(picture, labels, view, place);
  for (std::size_t i = 0; i < regions.size(); ++i) {
    const std::string name = kRegionNames[i];
    DrawRegion(picture, labels, record, boxes[i], name);
    const double left = width + 16 + static_cast<double>(i) * kPlotWidth;
    DrawPlot(picture, ProfilePlot(regions[i], name), {left, top, kPlotWidth, 330});
    DrawPlot(picture, ResponsePlot(record.phase, name), {left, top + 340, kPlotWidth, 420});
  }
  return picture;
}

}  // namespace qv
