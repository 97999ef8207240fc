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

// A plot on its way onto a picture.
struct Drawing {
  Picture& picture;
  const Plot& plot;
  cv::Rect2d area, frame;

  cv::Point2d At(cv::Point2d value) const {
    const double y = std::clamp(value.y, plot.y_min, plot.y_max);
    return {frame.x + value.x / plot.x_max * frame.width,
            frame.y + frame.height * (1 - (y - plot.y_min) / (plot.y_max - plot.y_min))};
  }
  void Ticks() const;
  void Labels() const;
  void Curves() const;
  void Markers() const;
};

constexpr double kText = 12;
constexpr Colour kCurve = {0.1, 0.35, 0.75};

bool Finite(const cv::Point2d& p) { return std::isfinite(p.x) && std::isfinite(p.y); }

void Drawing::Ticks() const {
  const double x_step = TickStep(plot.x_max, 4);
  for (int i = 0; i * x_step <= plot.x_max * (1 + 1e-9); ++i) {
    const double x = i * x_step;
    const cv::Point2d foot = At({x, plot.y_min});
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
    const cv::Point2d left = At({0, y});
    picture.Line({left, {frame.x + frame.width, left.y}}, kFaint, 0.5);
    picture.Text(TickText(y, y_step), {frame.x - 6, left.y + 4}, kText, kInk, Align::kRight);
  }
}

void Drawing::Labels() const {
  picture.Text(plot.x_label, {frame.x + frame.width / 2, frame.y + frame.height + 34}, kText, kInk, Align::kCentre);
  picture.Text(plot.second_x_label, {frame.x + frame.width / 2, frame.y - 24}, kText, kInk, Align::kCentre);
  picture.TextUpwards(plot.y_label, {area.x + 12, frame.y + frame.height / 2}, kText, kInk);
}

void Drawing::Curves() const {
  for (const double y : plot.horizontal_lines) picture.Line({At({0, y}), At({plot.x_max, y})}, kInk, 1);
  std::vector<cv::Point2d> line;
  for (const cv::Point2d& point : plot.curve) {
    if (!Finite(point)) continue;
    if (plot.bars) picture.Line({At({point.x, plot.y_min}), At(point)}, kCurve, 1);
    line.push_back(At(point));
  }
  std::vector<cv::Point2d> second_line;
  for (const cv::Point2d& point : plot.second_curve) second_line.push_back(At(point));
  if (!second_line.empty()) picture.Line(second_line, kInk, 1);
  if (!plot.bars && !line.empty()) picture.Line(line, kCurve, 2);
  for (const Plot::Curve& curve : plot.more_curves) {
    std::vector<cv::Point2d> piece;
    for (std::size_t i = 0; i <= curve.points.size(); ++i) {
      const bool goes_on = i < curve.points.size() && Finite(curve.points[i]);
      if (goes_on) piece.push_back(At(curve.points[i]));
      if (goes_on || piece.empty()) continue;
      const bool alone = piece.size() == 1;
      if (!alone) picture.Line(piece, curve.colour, 2.5);
      for (const cv::Point2d& point : piece) {
        if (curve.dots || alone) picture.Circle(point, alone && !curve.dots ? 0.75 : 2.5, curve.colour, 2);
      }
      piece.clear();
    }
  }
}

void Drawing::Markers() const {
  for (const Plot::Marker& marker : plot.markers) {
    if (!Finite(marker.at) || marker.at.x > plot.x_max) continue;
    const cv::Point2d at = At(marker.at);
    picture.Line({{at.x, frame.y + frame.height}, at}, marker.colour, 1.5);
    picture.Circle(at, 4, marker.colour, 2.5);
    picture.Text(marker.text, {at.x + 8, at.y - 8}, kText + 1, kInk);
  }
}

}  // namespace

void DrawPlot(Picture& picture, const Plot& plot, const cv::Rect2d& area) {
  const bool second_axis = !plot.second_x_label.empty();
  const cv::Rect2d frame(area.x + 52, area.y + (second_axis ? 58 : 28), area.width - 68,
                         area.height - (second_axis ? 102 : 72));
  const Drawing drawing = {picture, plot, area, frame};
  picture.Text(plot.title, {area.x + area.width / 2, area.y + 16}, kText + 2, kInk, Align::kCentre);
  drawing.Ticks();
  drawing.Labels();
  drawing.Curves();
  drawing.Markers();
  picture.Line({frame.tl(), {frame.br().x, frame.y}, frame.br(), {frame.x, frame.br().y}}, kInk, 1, true);
}

}  // namespace qv
