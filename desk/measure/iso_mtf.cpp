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
#include <numeric>
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

constexpr double IsoFigures::*kAllFigures[] = {&IsoFigures::mtf50,    &IsoFigures::mtf30, &IsoFigures::mtf10,
                                               &IsoFigures::mtf50p,   &IsoFigures::peak,  &IsoFigures::edge_width,
                                               &IsoFigures::overshoot};

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

EdgeSpread GaussianRise(double sigma_px) {
  EdgeSpread rise = {cvCeil(6 * sigma_px * kBinsPerPixel), {}};
  for (int bin = 0; bin <= 2 * rise.middle; ++bin) {
    rise.levels.push_back(std::erfc(-rise.Place(bin) / sigma_px / std::sqrt(2.0)) / 2);
  }
  return rise;
}

// Of a normal variable the median size is 0.6745 sigma; most pixels lie off the edge.
double NoiseAbout(const cv::Mat& levels, const cv::Mat& gray) {
  constexpr int kEvery = 5;  // pixels, and rows: enough to tell
  std::vector<double> off;
  for (int row = 0; row < gray.rows; row += kEvery) {
    for (int i = row % 2; i < gray.cols; i += kEvery) {
      off.push_back(std::fabs(1.0 * gray.at<uchar>(row, i) - levels.at<float>(row, i)));
    }
  }
  return Median(off) / 0.6745;
}

using Bands = std::array<IsoFigures, kBands>;

Bands ReadBands(const EdgeSpreads& spreads, double window) {
  Bands bands;
  for (int i = 0; i < kBands; ++i) bands[i] = Read(spreads.bands[i], window);
  return bands;
}

// How far the window reaches to each side.
double WindowOf(const SlantedEdge& edge) {
  return std::clamp(kWindow * edge.sigma_px / kHalfOfSigma, std::min(kNarrowest, edge.room), edge.room);
}

EdgeSpreads SpreadsIn(const SlantedEdge& edge, double window) {
  return ProjectEdge(edge, std::min(2 * window + 2, edge.room));
}

// What of the light about an edge counts, its middle rows alone where there are many: what a codec does is the same.
SlantedEdge MiddleOf(const SlantedEdge& edge, double window) {
  constexpr int kMostRows = 256;
  const int rows = std::min(edge.light.rows, kMostRows);
  const int top = (edge.light.rows - rows) / 2;
  const double reach = (2 * window + 3) * std::hypot(1, edge.curve.slope);
  const auto [low, high] =
      std::minmax({edge.curve.Column(top), edge.curve.Column(top + rows / 2.0), edge.curve.Column(top + rows)});
  const int left = cvFloor(low - reach);
  const cv::Rect part = cv::Rect(left, top, cvCeil(high + reach) - left, rows) & cv::Rect({}, edge.light.size());
  if (part.empty()) return edge;
  SlantedEdge middle = edge;
  middle.light = edge.light(part);
  middle.first += edge.lying ? cv::Point(part.y, part.x) : part.tl();
  middle.region.middle -= cv::Point2d(part.tl());
  middle.curve.middle_row -= part.y;
  middle.curve.offset -= part.x;
  middle.rows.assign(edge.rows.begin() + top, edge.rows.begin() + top + rows);
  return middle;
}

// A drawn edge that lies as one that was found, as sharp and as noisy; and what a codec makes of it.
class DrawnEdge {
 public:
  DrawnEdge(const SlantedEdge& edge, double window, const cv::Mat& gray, const Transfer& transfer)
      : edge_(edge),
        window_(window),
        transfer_(transfer),
        levels_(Encoded(NoiselessLight(edge, GaussianRise(edge.sigma_px), kMargin), transfer)) {
    if (edge.lying) cv::transpose(levels_, levels_);
    const cv::Rect seen(kMargin, kMargin, levels_.cols - 2 * kMargin, levels_.rows - 2 * kMargin);
    noise_.create(levels_.size(), CV_32F);
    cv::RNG random(75);
    random.fill(noise_, cv::RNG::NORMAL, 0, NoiseAbout(levels_(seen), gray(cv::Rect(edge.first, seen.size()))));
  }

  // By how much the codec changes each band's figures.
  Bands Errors(const CodecSteps& codec, double sign) const {
    cv::Mat photo;
    cv::Mat(levels_ + sign * noise_).convertTo(photo, CV_8U);
    Bands errors = Figures(Coded(photo, edge_.first - cv::Point(kMargin, kMargin), codec));
    const Bands plain = Figures(photo);
    for (int i = 0; i < kBands; ++i) {
      for (const auto figure : kAllFigures) errors[i].*figure -= plain[i].*figure;
    }
    return errors;
  }

 private:
  static constexpr int kMargin = 8;  // a block

  Bands Figures(const cv::Mat& photo) const {
    SlantedEdge edge = edge_;
    edge.light =
        LinearLight(photo(cv::Rect({kMargin, kMargin}, photo.size() - cv::Size(2 * kMargin, 2 * kMargin))), transfer_);
    if (edge.lying) cv::transpose(edge.light, edge.light);
    return ReadBands(SpreadsIn(edge, window_), window_);
  }

  SlantedEdge edge_;
  double window_;
  Transfer transfer_;
  cv::Mat levels_, noise_;
};

CodecError ErrorOf(const DrawnEdge& drawn, const CodecSteps& codec) {
  // Noise and its opposite: what of an error is chance mostly cancels.
  const Bands one = drawn.Errors(codec, 1);
  const Bands other = drawn.Errors(codec, -1);
  CodecError error;
  for (const auto figure : kAllFigures) {
    std::vector<double> errors;
    for (int i = 0; i < kBands; ++i) errors.push_back((one[i].*figure + other[i].*figure) / 2);
    error.mean.*figure = std::accumulate(errors.begin(), errors.end(), 0.0) / kBands;
    error.chance.*figure = Spread(errors) / std::sqrt(1.0 * kBands);
  }
  return error;
}

}  // namespace

IsoMtf MeasureIsoMtf(const cv::Mat& gray, const std::array<cv::Point2d, 4>& corners, const Transfer& transfer,
                     const CodecSteps& codec) {
  CV_Assert(!gray.empty());
  IsoMtf iso = {kNoFigures, {}, {}, kNotMeasured, {}, nullptr};
  iso.bands.fill(kNoFigures);
  const auto refuse = [&](const char* reason) {
    iso.reason = reason;
    return iso;
  };
  const SlantedEdge edge = LocateEdge(gray, corners, transfer);
  if (edge.reason != nullptr) return refuse(edge.reason);
  const double frequency = kHalfOfSigma / edge.sigma_px;
  double window = WindowOf(edge);
  if (window < kLeastWindow / frequency) return refuse("the blur is too wide for the region");
  const EdgeSpreads spreads = SpreadsIn(edge, window);
  if (spreads.whole.levels.empty()) return refuse("the edge follows the pixel grid, which leaves bins empty");
  if (Overshoot(spreads.whole) > kHalo) window = std::min(2 * window, edge.room);
  iso.figures = Read(spreads.whole, window);
  if (!std::isfinite(iso.figures.mtf50)) return refuse("the response does not fall to one half");
  iso.bands = ReadBands(spreads, window);
  iso.edge_angle_deg = edge.angle_deg();
  iso.response = ResponseCurve(Differentiate(spreads.whole, window), kIsoStep / 2, static_cast<int>(2 / kIsoStep) + 1);
  if (codec.luma != 0 && gray.type() == CV_8UC1)
    iso.of_codec = ErrorOf({MiddleOf(edge, window), window, gray, transfer}, codec);
  return iso;
}

Uncertainty UncertaintyOf(const IsoMtf& iso, double IsoFigures::*figure) {
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
  const double square = std::pow(iso.of_codec.mean.*figure, 2) - std::pow(iso.of_codec.chance.*figure, 2);
  return square > 0 ? OffBy(std::sqrt(square), scatter, kBands - 1) : scatter;  // chance adds its square
}

}  // namespace qv
