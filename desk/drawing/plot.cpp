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

constexpr double kText = 12;
constexpr double kSample = 34;  // of a line in the legend
constexpr double kRow = 18;

// A name in the legend, and how its line is drawn.
struct Entry {
  std::string name;
  Series series;
  bool bars, level;
};

std::vector<Entry> LegendOf(const Plot& plot) {
  std::vector<Entry> entries;
  for (const Plot::Curve& curve : plot.curves) {
    if (!curve.name.empty()) entries.push_back({curve.name, curve.series, curve.bars, false});
    if (curve.ends_only && !curve.name.empty()) entries.back().series.shape = PointShape::kNone;
  }
  for (const Plot::Level& level : plot.levels) {
    entries.push_back({level.name, {OnPaper(level.tone), level.dash, PointShape::kNone}, false, true});
  }
  return entries;
}

// Entries side by side, as many a row as have room.
std::vector<std::vector<Entry>> LegendRows(const Plot& plot, double width) {
  std::vector<std::vector<Entry>> rows;
  double used = 0;
  for (const Entry& entry : LegendOf(plot)) {
    const double needed = kSample + 6 + WidthOf(entry.name, kText) + 16;
    if (rows.empty() || used + needed > width) {
      rows.emplace_back();
      used = 0;
    }
    used += needed;
    rows.back().push_back(entry);
  }
  return rows;
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
  void Spots(const std::vector<cv::Point2d>& places, const Series& series) const;
  void Piece(const std::vector<cv::Point2d>& piece, const Plot::Curve& curve) const;
  void Curves() const;
  void Levels() const;
  bool IsTaken(const cv::Rect2d& place, const std::vector<cv::Rect2d>& texts) const;
  void Markers() const;
  void Legend() const;
};

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

void Drawing::Spots(const std::vector<cv::Point2d>& places, const Series& series) const {
  constexpr double kReach = 3.5;
  for (const cv::Point2d& p : places) {
    switch (series.shape) {
      case PointShape::kNone: break;
      case PointShape::kCircle: picture.Circle(p, kReach - 1, series.colour, 2); break;
      case PointShape::kSquare:
        picture.Line({p + cv::Point2d(-kReach, -kReach), p + cv::Point2d(kReach, -kReach),
                      p + cv::Point2d(kReach, kReach), p + cv::Point2d(-kReach, kReach)},
                     series.colour, 1.5, true);
        break;
      case PointShape::kTriangle:
        picture.Line({p + cv::Point2d(0, -kReach - 1), p + cv::Point2d(kReach + 1, kReach),
                      p + cv::Point2d(-kReach - 1, kReach)},
                     series.colour, 1.5, true);
        break;
    }
  }
}

// Points without a gap.
void Drawing::Piece(const std::vector<cv::Point2d>& piece, const Plot::Curve& curve) const {
  if (piece.size() > 1) picture.Line(piece, curve.series.colour, 2, false, curve.series.dash);
  if (!curve.ends_only) {
    Spots(piece, curve.series);
  } else if (piece.size() == 1) {
    picture.Circle(piece[0], 0.75, curve.series.colour, 2);
  }
}

void Drawing::Curves() const {
  for (const Plot::Curve& curve : plot.curves) {
    const cv::Point2d shift(curve.shift_px, 0);
    std::vector<cv::Point2d> piece;
    for (std::size_t i = 0; i <= curve.points.size(); ++i) {
      const bool goes_on = i < curve.points.size() && Finite(curve.points[i]) && curve.points[i].x <= plot.x_max;
      if (goes_on && curve.bars) {
        picture.Line({At({curve.points[i].x, plot.y_min}), At(curve.points[i])}, curve.series.colour, 1);
      } else if (goes_on) {
        piece.push_back(At(curve.points[i]) + shift);
        if (i < curve.spans.size()) {
          const cv::Point2d low = At({curve.points[i].x, curve.spans[i][0]}) + shift;
          const cv::Point2d high = At({curve.points[i].x, curve.spans[i][1]}) + shift;
          picture.Line({low, high}, curve.series.colour, 1);
          for (const cv::Point2d& end : {low, high})
            picture.Line({end - cv::Point2d(3, 0), end + cv::Point2d(3, 0)}, curve.series.colour, 1);
        }
      } else if (!piece.empty()) {
        Piece(piece, curve);
        piece.clear();
      }
    }
  }
}

void Drawing::Levels() const {
  for (const Plot::Level& level : plot.levels) {
    if (!std::isfinite(level.at) || (level.upright && level.at > plot.x_max)) continue;
    const cv::Point2d from = level.upright ? At({level.at, plot.y_min}) : At({0, level.at});
    const cv::Point2d to = level.upright ? At({level.at, plot.y_max}) : At({plot.x_max, level.at});
    picture.Line({from, to}, OnPaper(level.tone), 1, false, level.dash);
  }
}

// Whether a text there would lie over another, over a curve, or be cut.
bool Drawing::IsTaken(const cv::Rect2d& place, const std::vector<cv::Rect2d>& texts) const {
  if ((place & frame).area() < place.area() * (1 - 1e-9)) return true;
  if (std::any_of(texts.begin(), texts.end(), [&](const cv::Rect2d& other) { return (other & place).area() > 0; })) {
    return true;
  }
  return std::any_of(plot.curves.begin(), plot.curves.end(), [&](const Plot::Curve& curve) {
    return std::any_of(curve.points.begin(), curve.points.end(),
                       [&](const cv::Point2d& p) { return Finite(p) && place.contains(At(p)); });
  });
}

void Drawing::Markers() const {
  constexpr double kOff = 8;
  std::vector<cv::Rect2d> taken;
  for (const Plot::Marker& marker : plot.markers) {
    if (!Finite(marker.at) || marker.at.x > plot.x_max) continue;
    const cv::Point2d at = At(marker.at);
    const Colour colour = OnPaper(marker.tone);
    picture.Line({{at.x, frame.y + frame.height}, at}, colour, 1.5);
    picture.Circle(at, 4, colour, 2.5);
    if (marker.text.empty()) continue;
    const cv::Size2d size(WidthOf(marker.text, kText + 1) + 4, kText + 6);
    // Beside the place; where nothing is free, at its right, or its left where the frame ends.
    std::vector<cv::Rect2d> places;
    for (const double up : {kOff + size.height, -kOff, 2 * (kOff + size.height), -2 * kOff - size.height}) {
      places.emplace_back(cv::Point2d(at.x + kOff, at.y - up), size);
      places.emplace_back(cv::Point2d(at.x - kOff - size.width, at.y - up), size);
      places.emplace_back(cv::Point2d(at.x + 5 * kOff, at.y - up), size);
    }
    auto place = std::find_if(places.begin(), places.end(), [&](const cv::Rect2d& p) { return !IsTaken(p, taken); });
    if (place == places.end()) place = places.begin() + (places[0].br().x > frame.br().x ? 1 : 0);
    picture.FillRectangle(*place, kPaper);
    picture.Text(marker.text, {place->x + 2, place->br().y - 5}, kText + 1, marker.tone);
    taken.push_back(*place);
  }
}

void Drawing::Legend() const {
  double y = frame.br().y + 56;
  for (const std::vector<Entry>& row : LegendRows(plot, area.width - 16)) {
    double x = area.x + 12;
    for (const Entry& entry : row) {
      const cv::Point2d middle(x + kSample / 2, y - 4);
      if (entry.bars) {
        picture.FillRectangle({x + 8, y - 9, kSample - 16, 10}, entry.series.colour);
      } else {
        picture.Line({{x, middle.y}, {x + kSample, middle.y}}, entry.series.colour, entry.level ? 1 : 2, false,
                     entry.series.dash);
        Spots({middle}, entry.series);
      }
      picture.Text(entry.name, {x + kSample + 6, y}, kText, kInk);
      x += kSample + 6 + WidthOf(entry.name, kText) + 16;
    }
    y += kRow;
  }
}

}  // namespace

void DrawPlot(Picture& picture, const Plot& plot, const cv::Rect2d& area) {
  const bool second_axis = !plot.second_x_label.empty();
  const double above = second_axis ? 58 : 28;
  const double below = 44 + kRow * static_cast<double>(LegendRows(plot, area.width - 16).size());
  const cv::Rect2d frame(area.x + 52, area.y + above, area.width - 68, area.height - above - below);
  const Drawing drawing = {picture, plot, area, frame};
  picture.Text(plot.title, {area.x + area.width / 2, area.y + 16}, kText + 2, kInk, Align::kCentre);
  drawing.Ticks();
  drawing.Labels();
  drawing.Levels();
  drawing.Curves();
  picture.Line({frame.tl(), {frame.br().x, frame.y}, frame.br(), {frame.x, frame.br().y}}, OnPaper(kInk), 1, true);
  drawing.Markers();
  drawing.Legend();
}

}  // namespace qv
