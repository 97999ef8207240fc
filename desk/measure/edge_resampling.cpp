#include "desk/measure/edge_resampling.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "desk/measure/slanted_edge.h"

namespace qv {

namespace {

constexpr int kBlockRows = 8;    // kept together: interpolation and JPEG tie neighbouring rows
constexpr double kMoved = 0.05;  // pixels

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
  NoiselessLight(edge, spread, 0, moved).convertTo(plain, CV_32F, 255);
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
  const EdgeSpread spread = RiseOf(edge);
  if (spread.levels.empty()) return {kNone, kNone, kNone, kNone};
  const auto moved = [&](double by) { return read(NoiselessRegion(edge, spread, by)); };
  const double value = moved(0);
  if (std::fabs(found - value) <= tolerance * value) return {value, value, value, value};
  const auto [low, high] = std::minmax({value, moved(-kMoved), moved(kMoved)});
  return {value, low, high, read(NoiselessRegion(lit, RiseOf(lit), 0))};
}

bool ShowsMoreThanEdge(const cv::Mat& region) {
  constexpr double kTimesNoise = 3;
  constexpr double kLeastNoise = 1.0 / 255;
  const SlantedEdge edge = EdgeOf(region);
  if (edge.reason != nullptr) return false;
  const EdgeSpread spread = RiseOf(edge);
  if (spread.levels.empty()) return false;
  const cv::Mat noise = edge.light - NoiselessLight(edge, spread);
  const double rms = cv::norm(noise) / std::sqrt(static_cast<double>(noise.total()));
  return rms > kTimesNoise * std::max(kLeastNoise, NoiseBetweenNeighbours(noise));
}

Uncertainty ResampleEdge(const cv::Mat& region, const std::function<double(const cv::Mat&)>& read) {
  const SlantedEdge edge = EdgeOf(region);
  if (edge.reason != nullptr) return {kNone, kNone, kNone, kResamplingMethod};
  const EdgeSpread spread = RiseOf(edge);
  if (spread.levels.empty()) return {kNone, kNone, kNone, kResamplingMethod};
  const cv::Mat noiseless = NoiselessLight(edge, spread);
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
