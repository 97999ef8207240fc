// Slanted-edge figures after ISO 12233:2014. The edge is found and its light evened out in slanted_edge.cpp; then
//   1. all pixels of the region are binned by their distance from the edge, four bins a pixel: the edge spread;
//   2. its central difference under a window about its centroid is the line spread;
//   3. the response is |DFT| / |DFT(0)|, divided by what the difference and the bins take away.
// Where the standard leaves a choice: the window is level as far as the blur reaches and ends soon after, since what
// lies beyond adds noise only. All in double precision.

#include "desk/measure/iso_mtf.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <opencv2/imgproc.hpp>

namespace qv {

namespace {

// The window reaches kWindow / (frequency of response 0.5) to each side, and never less than kNarrowest pixels.
constexpr double kWindow = 1.7;
constexpr double kNarrowest = 6;
constexpr double kOfTheMethod = 0.001;  // what the steps themselves leave, as a share of a figure
constexpr double kHalo = 0.03;  // an overshoot from which on the window is twice as wide: sharpening reaches further
constexpr double kLeastWindow = 1.2;  // where the region is narrower

constexpr double kNotMeasured = std::numeric_limits<double>::quiet_NaN();
constexpr IsoFigures kNoFigures = {kNotMeasured, kNotMeasured, kNotMeasured, kNotMeasured,
                                   kNotMeasured, kNotMeasured, kNotMeasured};

std::vector<double> Curve(const LineSpread& line) {
  return ResponseCurve(line, kCurveStep, static_cast<int>(kHighest / kCurveStep) + 1);
}

// Where a parabola through three bins comes to `level`, between the middle one and its neighbour on one side.
double Between(double before, double here, double after, double level, int way) {
  const double slope = (after - before) / 2;
  const double bend = (after + before) / 2 - here;
  double x = 0;
  for (int step = 0; step < 6; ++step) x = (level - here - bend * x * x) / slope;
  return std::isfinite(x) ? std::clamp(x, std::min(0, way) * 1.0, std::max(0, way) * 1.0) : 0;
}

// Place at which the edge comes to `level`, looked for from its middle towards `way`. The mean over a bin of width h is
// the level at its middle plus h^2 / 24 of its second derivative, which is taken off.
double Crossing(const EdgeSpread& spread, double level, int way) {
  const auto& means = spread.levels;
  const auto at = [&](int k) { return means[k] - (means[k + 1] - 2 * means[k] + means[k - 1]) / 24; };
  const int last = static_cast<int>(means.size()) - 3;
  for (int k = spread.middle; k >= 2 && k <= last; k += way) {
    if (way * (at(k + way) - level) < 0) continue;
    const double share = std::fabs(at(k) - level) < std::fabs(at(k + way) - level)
                             ? Between(at(k - 1), at(k), at(k + 1), level, way)
                             : way + Between(at(k + way - 1), at(k + way), at(k + way + 1), level, -way);
    return spread.Place(k + share);
  }
  return kNotMeasured;
}

double EdgeWidth(const EdgeSpread& spread) { return Crossing(spread, 0.9, 1) - Crossing(spread, 0.1, -1); }

// Of means over a pixel, so that noise does not count.
double Overshoot(const EdgeSpread& spread) {
  double most = 0;
  for (std::size_t k = 0; k + kBinsPerPixel <= spread.levels.size(); ++k) {
    double mean = 0;
    for (int i = 0; i < kBinsPerPixel; ++i) mean += spread.levels[k + i] / kBinsPerPixel;
    most = std::max({most, mean - 1, -mean});
  }
  return most;
}

IsoFigures Read(const EdgeSpread& spread, double window) {
  if (spread.levels.empty()) return kNoFigures;
  const LineSpread line = Differentiate(spread, window);
  if (line.weights.empty()) return kNoFigures;
  const std::vector<double> curve = Curve(line);
  const auto peak = std::max_element(curve.begin(), curve.end() - static_cast<std::ptrdiff_t>(curve.size() / 2));
  const auto fall = [&](double level, std::size_t from = 0) { return 2 * FirstFall(line, curve, level, from); };
  return {
      fall(0.5), fall(0.3),         fall(0.1),        fall(*peak / 2, static_cast<std::size_t>(peak - curve.begin())),
      *peak,     EdgeWidth(spread), Overshoot(spread)};
}

}  // namespace

IsoMtf MeasureIsoMtf(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer) {
  CV_Assert(!gray.empty());
  IsoMtf iso = {kNoFigures, {}, {}, kNotMeasured, nullptr};
  iso.bands.fill(kNoFigures);
  const auto refuse = [&](const char* reason) {
    iso.reason = reason;
    return iso;
  };
  const SlantedEdge edge = LocateEdge(gray, corners, transfer);
  if (edge.reason != nullptr) return refuse(edge.reason);
  const double frequency = kHalfOfSigma / edge.sigma_px;
  double window = std::clamp(kWindow / frequency, std::min(kNarrowest, edge.room), edge.room);
  if (window < kLeastWindow / frequency) return refuse("the blur is too wide for the region");
  const EdgeSpreads spreads = ProjectEdge(edge, std::min(2 * window + 2, edge.room));
  if (spreads.whole.levels.empty()) return refuse("the edge follows the pixel grid, which leaves bins empty");
  if (Overshoot(spreads.whole) > kHalo) window = std::min(2 * window, edge.room);
  iso.figures = Read(spreads.whole, window);
  if (!std::isfinite(iso.figures.mtf50)) return refuse("the response does not fall to one half");
  for (std::size_t i = 0; i < iso.bands.size(); ++i) iso.bands[i] = Read(spreads.bands[i], window);
  iso.edge_angle_deg = edge.angle_deg();
  iso.response = ResponseCurve(Differentiate(spreads.whole, window), kIsoStep / 2, static_cast<int>(2 / kIsoStep) + 1);
  return iso;
}

IsoFigures MeasureCodedAgain(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer,
                             const CodecSteps& codec) {
  const std::vector<cv::Point2f> around(corners.begin(), corners.end());
  constexpr int kMargin = 8;  // a block
  cv::Rect part = cv::boundingRect(around);
  part = (part + cv::Size(2 * kMargin, 2 * kMargin) - cv::Point(kMargin, kMargin)) & cv::Rect({}, gray.size());
  if (gray.type() != CV_8UC1 || part.empty()) return kNoFigures;
  std::array<cv::Point2d, 4> moved = corners;
  for (cv::Point2d& corner : moved) corner -= cv::Point2d(part.tl());
  return MeasureIsoMtf(CodedAgain(gray, part, codec), moved, transfer).figures;
}

Uncertainty UncertaintyOf(const IsoMtf& iso, double IsoFigures::*figure, const IsoFigures* again) {
  std::vector<double> readings;
  for (const IsoFigures& band : iso.bands) readings.push_back(band.*figure);
  const double whole = iso.figures.*figure;
  double of_method = kOfTheMethod * whole;
  if (figure == &IsoFigures::peak || figure == &IsoFigures::overshoot) {
    // Noise raises a highest value: that of a quarter twice as much as that of the whole.
    double excess = -whole;
    for (const double reading : readings) excess += reading / kBands;
    of_method = std::hypot(of_method, excess);
  }
  Uncertainty scatter = OfMean(readings, of_method, kBandsMethod);
  if (again == nullptr || !std::isfinite(again->*figure)) return scatter;
  // Beyond what chance does, which the scatter tells.
  const double error = std::max(std::fabs(again->*figure - whole) - scatter.standard, 0.0);
  return OffBy(error, scatter, kBands - 1);
}

}  // namespace qv
