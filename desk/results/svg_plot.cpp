#include "desk/results/svg_plot.h"

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"

namespace qv {

namespace {

constexpr double kWidth = 720, kHeight = 320, kLeft = 70, kRight = 20, kTop = 40, kBottom = 50;

struct Style {
  const char* colour;
  const char* dashes;
};
constexpr Style kStyles[] = {{"#0072b2", ""}, {"#d55e00", "7 4"}, {"#009e73", "2 3"}, {"#555555", "1 2"}};

std::string Escaped(const std::string& text) {
  std::string safe;
  for (const char c : text) {
    switch (c) {
      case '<': safe += "&lt;"; break;
      case '>': safe += "&gt;"; break;
      case '&': safe += "&amp;"; break;
      case '"': safe += "&quot;"; break;
      default: safe += static_cast<unsigned char>(c) < 32 ? ' ' : c;
    }
  }
  return safe;
}

// An axis with round steps.
struct Axis {
  double low = 0, high = 1, step = 0.2;

  void Fit(double from, double to) {
    if (!(to > from)) {
      from -= 0.5;
      to += 0.5;
    }
    const double rough = (to - from) / 6;
    const double ten = std::pow(10, std::floor(std::log10(rough)));
    step = ten * (rough > 5 * ten ? 10 : rough > 2 * ten ? 5 : rough > ten ? 2 : 1);
    low = std::floor(from / step) * step;
    high = std::ceil(to / step) * step;
  }
  std::vector<double> Ticks() const {
    std::vector<double> ticks;
    const auto count = std::lround((high - low) / step);
    for (long i = 0; i <= count; ++i) ticks.push_back(low + static_cast<double>(i) * step);
    return ticks;
  }
  double Share(double value) const { return (value - low) / (high - low); }
};

struct Frame {
  Axis x, y;
  double top = 0;

  double X(double value) const { return kLeft + x.Share(value) * (kWidth - kLeft - kRight); }
  double Y(double value) const { return top + kHeight - kBottom - y.Share(value) * (kHeight - kTop - kBottom); }
};

Frame FrameOf(const SvgPanel& panel, double top) {
  double x_low = INFINITY;
  double x_high = -INFINITY;
  double y_high = 0;
  double y_low = 0;
  for (const SvgSeries& series : panel.series) {
    const bool wide = series.bars && series.points.size() > 1;
    const double half = wide ? (series.points[1].first - series.points[0].first) / 2 : 0;
    for (const auto& [x, y] : series.points) {
      if (!std::isfinite(x) || !std::isfinite(y)) continue;
      x_low = std::min(x_low, x - half);
      x_high = std::max(x_high, x + half);
      y_low = std::min(y_low, y);
      y_high = std::max(y_high, y);
    }
  }
  for (const auto& [x, words] : panel.lines) {
    x_low = std::min(x_low, x);
    x_high = std::max(x_high, x);
  }
  Frame frame;
  frame.top = top;
  if (std::isfinite(x_low)) frame.x.Fit(x_low, x_high);
  frame.y.Fit(y_low, y_high);
  return frame;
}

std::string Text(double x, double y, const char* anchor, const std::string& words, const char* more = "") {
  return Format(R"(<text x="%.1f" y="%.1f" text-anchor="%s"%s>)", x, y, anchor, more) + Escaped(words) + "</text>\n";
}

std::string Grid(const Frame& frame, const SvgPanel& panel) {
  std::string svg = Text(kLeft, frame.top + 22, "start", panel.title, R"( font-weight="bold")");
  for (const double x : frame.x.Ticks()) {
    svg +=
        Format(R"(<path d="M%.1f %.1fV%.1f" stroke="#ddd"/>)", frame.X(x), frame.Y(frame.y.low), frame.Y(frame.y.high));
    svg +=
        Text(frame.X(x), frame.Y(frame.y.low) + 16, "middle", Format("%.6g", std::abs(x) < frame.x.step / 9 ? 0 : x));
  }
  for (const double y : frame.y.Ticks()) {
    svg += Format(R"(<path d="M%.1f %.1fH%.1f" stroke="#ddd"/>)", kLeft, frame.Y(y), kWidth - kRight);
    svg += Text(kLeft - 6, frame.Y(y) + 4, "end", Format("%.6g", std::abs(y) < frame.y.step / 9 ? 0 : y));
  }
  svg += Text((kLeft + kWidth - kRight) / 2, frame.top + kHeight - 12, "middle", panel.x_label);
  const double middle = frame.top + (kTop + kHeight - kBottom) / 2;
  return svg +
         Text(16, middle, "middle", panel.y_label, Format(R"-( transform="rotate(-90 16 %.1f)")-", middle).c_str());
}

std::string Stroke(const Frame& frame, const SvgSeries& series) {
  const Style& style = kStyles[series.style % std::size(kStyles)];
  std::string path;
  bool pen_down = false;
  const double half = series.bars && series.points.size() > 1
                          ? 0.48 * (frame.X(series.points[1].first) - frame.X(series.points[0].first))
                          : 8;
  for (const auto& [x, y] : series.points) {
    const bool drawn = std::isfinite(x) && std::isfinite(y);
    if (drawn && series.bars) {
      path += Format("M%.1f %.1fV%.1fH%.1fV%.1fZ", frame.X(x) - half, frame.Y(0), frame.Y(y), frame.X(x) + half,
                     frame.Y(0));
    } else if (drawn) {
      path += Format("%s%.1f %.1f", pen_down ? "L" : "M", frame.X(x), frame.Y(y));
    }
    pen_down = drawn;
  }
  return Format(R"(<path d="%s" fill="%s" fill-opacity="0.35" stroke="%s" stroke-dasharray="%s" stroke-width="%s"/>)",
                path.c_str(), series.bars ? style.colour : "none", style.colour, series.bars ? "" : style.dashes,
                series.bars ? "0.5" : "1.6") +
         "\n";
}

std::string Legend(const Frame& frame, const SvgPanel& panel) {
  std::string svg;
  double x = kWidth - kRight;
  for (auto series = panel.series.rbegin(); series != panel.series.rend(); ++series) {
    if (series->name.empty()) continue;
    const Style& style = kStyles[series->style % std::size(kStyles)];
    svg += Text(x, frame.top + 22, "end", series->name);
    x -= 7.0 * static_cast<double>(series->name.size()) + 10;
    svg += Format(R"(<path d="M%.1f %.1fh24" stroke="%s" stroke-dasharray="%s" stroke-width="2"/>)", x - 20,
                  frame.top + 18, style.colour, style.dashes);
    x -= 34;
  }
  return svg;
}

}  // namespace

std::string SvgDocument(const std::vector<SvgPanel>& panels) {
  const double height = kHeight * static_cast<double>(panels.size());
  std::string svg = Format(R"(<svg xmlns="http://www.w3.org/2000/svg" width="%g" height="%g" viewBox="0 0 %g %g" )",
                           kWidth, height, kWidth, height) +
                    R"(font-family="sans-serif" font-size="12"><rect width="100%" height="100%" fill="#fff"/>)" + "\n";
  double top = 0;
  for (const SvgPanel& panel : panels) {
    const Frame frame = FrameOf(panel, top);
    svg += Grid(frame, panel);
    for (const SvgSeries& series : panel.series) svg += Stroke(frame, series);
    for (const auto& [x, words] : panel.lines) {
      svg += Format(R"(<path d="M%.1f %.1fV%.1f" stroke="#000" stroke-dasharray="6 3"/>)", frame.X(x),
                    frame.Y(frame.y.low), frame.Y(frame.y.high));
      svg += Text(frame.X(x) + 4, frame.Y(frame.y.high) + 10, "start", words);
    }
    svg += Legend(frame, panel);
    top += kHeight;
  }
  return svg + "</svg>\n";
}

}  // namespace qv
