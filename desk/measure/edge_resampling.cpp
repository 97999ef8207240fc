#include "desk/measure/edge_resampling.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "desk/measure/slanted_edge.h"

namespace qv {

namespace {

constexpr int kBlockRows = 8;       // kept together: interpolation and JPEG tie neighbouring rows
constexpr double kSmoothing = 0.6;  // half the width of the smoothing, in sigmas of the edge
constexpr double kSpreads =
    4;  // sigmas and kBeyond pixels to each side of the edge, where it differs from its plateaus
constexpr double kBeyond = 2;
constexpr double kMoved = 0.05;  // pixels

// A parabola through 2 m + 1 neighbours, its value at the middle (Savitzky and Golay).
std::vector<double> Smoothed(const std::vector<double>& levels, int m) {
  std::vector<double> smooth = levels;
  const int count = static_cast<int>(levels.size());
  for (int k = m; k + m < count; ++k) {
    double sum = 0;
    for (int i = -m; i <= m; ++i) sum += (3 * m * m + 3 * m - 1 - 5 * i * i) * levels[k + i];
    smooth[k] = 3 * sum / ((2 * m + 3) * (2 * m + 1) * (2 * m - 1));
  }
  return smooth;
}

EdgeSpread SpreadOf(const SlantedEdge& edge) {
  return ProjectEdge(edge, std::min(kSpreads * edge.sigma_px + kBeyond, edge.room)).whole;
}

// The region without its noise: each pixel by its distance from the edge, which is moved across by so many pixels.
cv::Mat Noiseless(const SlantedEdge& edge, const EdgeSpread& spread, double moved = 0) {
  const std::vector<double> share =
      Smoothed(spread.levels, std::max(1, cvRound(kSmoothing * edge.sigma_px * kBinsPerPixel)));
  const int last = static_cast<int>(share.size()) - 1;
  cv::Mat picture(edge.light.size(), CV_64F);
  for (int row = 0; row < picture.rows; ++row) {
    const double across = 1 / std::hypot(1, edge.curve.Slope(row));
    const double place = edge.curve.Column(row);
    const double t = row - edge.curve.middle_row;
    for (int i = 0; i < picture.cols; ++i) {
      const double d = (i - place - moved) * across;
      const double bin = d * kBinsPerPixel + spread.middle;
      const int below = std::clamp(cvFloor(bin), 0, last - 1);
      double risen = d > 0 ? 1 : 0;
      if (bin >= 0 && bin < last) risen = share[below] + (share[below + 1] - share[below]) * (bin - below);
      const double left = edge.left.At(d, t);
      picture.at<double>(row, i) = left + (edge.right.At(d, t) - left) * risen;
    }
  }
  return picture;
}

// Blocks of the noise's rows in another order, some twice, each row where it lay as seen from the edge.
cv::Mat Redrawn(const cv::Mat& noiseless, const cv::Mat& noise, const EdgeCurve& curve, cv::RNG& random) {
  cv::Mat picture(noise.size(), CV_32F);  // what was rounded has its rounding in the noise
  const int block = std::min(kBlockRows, noise.rows);
  int source = 0;
  for (int row = 0; row < noise.rows; ++row, ++source) {
    if (row % block == 0) source = random.uniform(0, noise.rows - block + 1);
    const int shift = cvRound(curve.Column(source) - curve.Column(row));
    const auto* from = noise.ptr<double>(source);
    const auto* without = noiseless.ptr<double>(row);
    auto* to = picture.ptr<float>(row);
    for (int i = 0; i < noise.cols; ++i) {
      const int column = ((i + shift) % noise.cols + noise.cols) % noise.cols;
      to[i] = static_cast<float>(255 * (without[i] + from[column]));
    }
  }
  return picture;
}

constexpr double kNone = std::numeric_limits<double>::quiet_NaN();

// Of the whole region, in its stored levels.
SlantedEdge EdgeOf(const cv::Mat& region) {
  CV_Assert(region.type() == CV_8UC1);
  const double right = region.cols - 0.5;
  const double bottom = region.rows - 0.5;
  return LocateEdge(region, {{{-0.5, -0.5}, {right, -0.5}, {right, bottom}, {-0.5, bottom}}},
                    {Transfer::Kind::kLinear, 1});
}

// Standard deviation of independent noise: of two normal values the median of |a - b| is 0.954 sigma.
double NoiseBetweenNeighbours(const cv::Mat& noise) {
  const cv::Mat_<double> steps = cv::abs(noise.colRange(1, noise.cols) - noise.colRange(0, noise.cols - 1));
  return Median({steps.begin(), steps.end()}) / 0.954;
}

// The region without its noise, as it lies in the photo, in levels.
cv::Mat NoiselessRegion(const SlantedEdge& edge, const EdgeSpread& spread, double moved) {
  cv::Mat plain;
  Noiseless(edge, spread, moved).convertTo(plain, CV_32F, 255);
  if (!edge.lying) return plain;
  cv::Mat turned;
  cv::transpose(plain, turned);
  return turned;
}

}  // namespace

NoiselessReading ReadNoiseless(const cv::Mat& region, const std::function<double(const cv::Mat&)>& read, double found,
                               double tolerance) {
  SlantedEdge edge = EdgeOf(region);
  if (edge.reason != nullptr) return {kNone, kNone, kNone, kNone};
  const SlantedEdge lit = edge;
  for (Plateau* plateau : {&edge.left, &edge.right}) plateau->by_distance = plateau->by_row = 0;
  const EdgeSpread spread = SpreadOf(edge);
  if (spread.levels.empty()) return {kNone, kNone, kNone, kNone};
  const auto moved = [&](double by) { return read(NoiselessRegion(edge, spread, by)); };
  const double value = moved(0);
  if (std::fabs(found - value) <= tolerance * value) return {value, value, value, value};
  const auto [low, high] = std::minmax({value, moved(-kMoved), moved(kMoved)});
  return {value, low, high, read(NoiselessRegion(lit, SpreadOf(lit), 0))};
}

bool ShowsMoreThanEdge(const cv::Mat& region) {
  constexpr double kTimesNoise = 3;
  constexpr double kLeastNoise = 1.0 / 255;
  const SlantedEdge edge = EdgeOf(region);
  if (edge.reason != nullptr) return false;
  const EdgeSpread spread = SpreadOf(edge);
  if (spread.levels.empty()) return false;
  const cv::Mat noise = edge.light - Noiseless(edge, spread);
  const double rms = cv::norm(noise) / std::sqrt(static_cast<double>(noise.total()));
  return rms > kTimesNoise * std::max(kLeastNoise, NoiseBetweenNeighbours(noise));
}

Uncertainty ResampleEdge(const cv::Mat& region, const std::function<double(const cv::Mat&)>& read) {
  const SlantedEdge edge = EdgeOf(region);
  if (edge.reason != nullptr) return {kNone, kNone, kNone, kResamplingMethod};
  const EdgeSpread spread = SpreadOf(edge);
  if (spread.levels.empty()) return {kNone, kNone, kNone, kResamplingMethod};
  const cv::Mat noiseless = Noiseless(edge, spread);
  const cv::Mat noise = edge.light - noiseless;
  const auto as_found = [&](const cv::Mat& picture) {
    cv::Mat turned = picture;
    if (edge.lying) cv::transpose(picture, turned);
    return read(turned);
  };
  cv::Mat plain;
  noiseless.convertTo(plain, CV_32F, 255);
  const double centre = as_found(plain);
  cv::RNG random(50);
  std::vector<double> errors;
  for (int run = 0; run < kResamplings; ++run) {
    errors.push_back(as_found(Redrawn(noiseless, noise, edge.curve, random)) - centre);
  }
  return FromErrors(std::move(errors), kResamplingMethod);
}

}  // namespace qv
