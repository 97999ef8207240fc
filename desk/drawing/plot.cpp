#include "desk/drawing/plot.h"

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/drawing/picture.h"

namespace qv {

namespace {

// The widest of the steps 1, 2, 5, 10, 20 ... that cuts the span into at least `parts`.
double TickStep(double span, int parts) {
  const double decade = std::pow(10, std::floor(std::log10(span / parts)));
  for (const double step : {10.0, 5.0, 2.0}) {
    if (step * decade * parts <= span * (1 + 1e-9)) return step * decade;
  }
  return decade;
}

// As few digits as tell neighbouring ticks apart.
std::string TickText(double value, double step) {
  const int decimals = step >= 1 ? 0 : std::clamp(static_cast<int>(std::ceil(-std::log10(step) - 1e-9)), 1, 3);
  return Format("%.*f", decimals, value);
}

}  // namespace

void DrawPlot(Picture& picture, const Plot& plot, const cv::Rect2d& area) {
  constexpr double kText = 12;
  const cv::Rect2d frame(area.x + 52, area.y + (plot.second_x_label.empty() ? 28 : 58), area.width - 68,
                         area.height - (plot.second_x_label.empty() ? 72 : 102));
  const auto place = [&](cv::Point2d value) {
    const double y = std::clamp(value.y, plot.y_min, plot.y_max);
    return cv::Point2d(frame.x + value.x / plot.x_max * frame.width,
                       frame.y + frame.height * (1 - (y - plot.y_min) / (plot.y_max - plot.y_min)));
  };
  picture.Text(plot.title, {area.x + area.width / 2, area.y + 16}, kText + 2, kInk, Align::kCentre);

  const double x_step = TickStep(plot.x_max, 4);
  for (int i = 0; i * x_step <= plot.x_max * (1 + 1e-9); ++i) {
    const double x = i * x_step;
    const cv::Point2d foot = place({x, plot.y_min});
    picture.Line({foot, {foot.x, frame.y}}, kFaint, 0.5);
    picture.Text(TickText(x, x_step), {foot.x, foot.y + 16}, kText, kInk, Align::kCentre);
    if (!plot.second_x_label.empty()) {
      picture.Text(TickText(x * plot.second_x_factor, x_step * plot.second_x_factor), {foot.x, frame.y - 6}, kText,
                   kInk, Align::kCentre);
    }
  }
  const double y_step = TickStep(plot.y_max - plot.y_min, 4);
  for (int i = 0; plot.y_min + i * y_step <= plot.y_max + y_step * 1e-9; ++i) {
    const double y = plot.y_min + i * y_step;
    const cv::Point2d left = place({0, y});
    picture.Line({left, {frame.x + frame.width, left.y}}, kFaint, 0.5);
    picture.Text(TickText(y, y_step), {frame.x - 6, left.y + 4}, kText, kInk, Align::kRight);
  }
  picture.Text(plot.x_label, {frame.x + frame.width / 2, frame.y + frame.height + 34}, kText, kInk, Align::kCentre);
  picture.Text(plot.second_x_label, {frame.x + frame.width / 2, frame.y - 24}, kText, kInk, Align::kCentre);
  picture.TextUpwards(plot.y_label, {area.x + 12, frame.y + frame.height / 2}, kText, kInk);

  for (const double y : plot.horizontal_lines) picture.Line({place({0, y}), place({plot.x_max, y})}, kInk, 1);
  const auto finite = [](const cv::Point2d& p) { return std::isfinite(p.x) && std::isfinite(p.y); };
  std::vector<cv::Point2d> line;
  for (const cv::Point2d& point : plot.curve) {
    if (!finite(point)) continue;
    if (plot.bars) picture.Line({place({point.x, plot.y_min}), place(point)}, {0.1, 0.35, 0.75}, 1);
    line.push_back(place(point));
  }
  std::vector<cv::Point2d> second_line;
  for (const cv::Point2d& point : plot.second_curve) second_line.push_back(place(point));
  if (!second_line.empty()) picture.Line(second_line, kInk, 1);
  if (!plot.bars && !line.empty()) picture.Line(line, {0.1, 0.35, 0.75}, 2);
  for (const Plot::Curve& curve : plot.more_curves) {
    std::vector<cv::Point2d> points;
    for (const cv::Point2d& point : curve.points) points.push_back(place(point));
    picture.Line(points, curve.colour, 2.5);
    for (const cv::Point2d& point : points) picture.Circle(point, 2.5, curve.colour, 2);
  }
  for (const Plot::Marker& marker : plot.markers) {
    if (!finite(marker.at) || marker.at.x > plot.x_max) continue;
    const cv::Point2d at = place(marker.at);
    picture.Line({{at.x, frame.y + frame.height}, at}, marker.colour, 1.5);
    picture.Circle(at, 4, marker.colour, 2.5);
    picture.Text(marker.text, {at.x + 8, at.y - 8}, kText + 1, kInk);
  }
  picture.Line({frame.tl(), {frame.br().x, frame.y}, frame.br(), {frame.x, frame.br().y}}, kInk, 1, true);
}

}  // namespace qv
