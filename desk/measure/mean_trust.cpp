#include "desk/measure/mean_trust.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <opencv2/imgproc.hpp>

#include "desk/measure/patch_trust.h"

namespace qv {

namespace {

constexpr int kCodecBlock = 8;       // pixels a side
constexpr int kMostLookedAt = 1024;  // pixels a side

cv::Mat MiddleOf(const cv::Mat& picture) {
  const cv::Size size(std::min(picture.cols, kMostLookedAt), std::min(picture.rows, kMostLookedAt));
  return picture(cv::Rect({(picture.cols - size.width) / 2, (picture.rows - size.height) / 2}, size));
}

// Second differences between neighbours along rows and columns: noise without the scene's slope. Those that stand out
// are edges, of bars or of dots.
std::vector<cv::Vec3f> DifferencesOf(const cv::Mat& means) {
  constexpr double kStandsOut = 5;  // times the median
  std::vector<cv::Vec3f> all;
  std::vector<double> sizes;
  for (const cv::Point step : {cv::Point(1, 0), {0, 1}}) {
    for (int row = 2 * step.y; row < means.rows; ++row) {
      for (int i = 2 * step.x; i < means.cols; ++i) {
        const cv::Point at(i, row);
        all.push_back(means.at<cv::Vec3f>(at) - 2 * means.at<cv::Vec3f>(at - step) +
                      means.at<cv::Vec3f>(at - step - step));
        sizes.push_back(cv::norm(all.back()));
      }
    }
  }
  constexpr double kLeastNoise = 0.1;  // levels, in pictures without any
  const double most = kStandsOut * std::max(Median(sizes), kLeastNoise);
  all.erase(std::remove_if(all.begin(), all.end(), [=](const cv::Vec3f& one) { return cv::norm(one) > most; }),
            all.end());
  return all;
}

// How far luma and both chromas differ between blocks, what the codec's steps add taken out.
cv::Vec3d SpreadOf(const cv::Mat& pixels, const CodecSteps& codec) {
  const cv::Size blocks(pixels.cols / kCodecBlock, pixels.rows / kCodecBlock);
  if (codec.luma == 0 || blocks.area() < 2) return {};
  cv::Mat means;
  pixels(cv::Rect({}, blocks * kCodecBlock)).convertTo(means, CV_32F, 1.0 / 255);
  cv::resize(means, means, blocks, 0, 0, cv::INTER_AREA);
  cv::cvtColor(means, means, cv::COLOR_BGR2YCrCb);
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(means, mean, deviation);
  const auto without = [](double spread, double step) {
    return std::sqrt(std::max(255 * 255 * spread * spread - step * step / 12, 0.0));
  };
  return {without(deviation[0], codec.luma), without(deviation[2], codec.chroma), without(deviation[1], codec.chroma)};
}

// A smooth surface through a grid of means, CV_64F, of so many terms: a constant, a plane, of the second degree.
cv::Mat SurfaceThrough(const cv::Mat& grid, int terms) {
  cv::Mat at(static_cast<int>(grid.total()), terms, CV_64F);
  for (int i = 0; i < at.rows; ++i) {
    const double x = i % grid.cols - (grid.cols - 1) / 2.0;
    const int row = i / grid.cols;
    const double y = row - (grid.rows - 1) / 2.0;
    const std::array<double, 6> powers = {1, x, y, x * x, x * y, y * y};
    std::copy_n(powers.begin(), terms, at.ptr<double>(i));
  }
  cv::Mat factors;
  cv::solve(at, grid.reshape(1, at.rows), factors, cv::DECOMP_SVD);
  return cv::Mat(at * factors).reshape(1, grid.rows);
}

// What the true values of means with this noise probably are: the plainest surface off which they lie no further than
// noise, which is known to so many degrees of freedom; else what lies surely further stays.
cv::Mat WithoutNoise(const cv::Mat& grid, double noise, double degrees) {
  cv::Mat surface;
  cv::Mat off;
  double share = 0;
  for (const int terms : {1, 3, 6}) {
    const double freedom = static_cast<double>(grid.total()) - terms;
    if (freedom < terms) break;
    surface = SurfaceThrough(grid, terms);
    off = grid - surface;
    const double surely = 1 + 2 * std::sqrt(2 / freedom + 2 / degrees);  // two deviations
    const double variance = off.dot(off) / freedom;
    share = variance > 0 ? std::max(1 - surely * noise * noise / variance, 0.0) : 0;
    if (share == 0) break;
  }
  return surface + share * off;
}

double LeastOverMost(const cv::Mat& means) {
  double least = 0;
  double most = 0;
  cv::minMaxLoc(means, &least, &most);
  return least / most;
}

}  // namespace

MeanErrors::MeanErrors(const cv::Mat& pixels, const CodecSteps& codec)
    : pixels_(MiddleOf(pixels)), codec_(codec), spread_(SpreadOf(pixels_, codec)) {
  constexpr int kFewest = 60;  // blocks that tell what is alike between neighbouring pixels
  constexpr double kSquaredWeights = 6;
  const cv::Size blocks(pixels_.cols / kCodecBlock, pixels_.rows / kCodecBlock);
  const int side = blocks.area() >= kFewest ? kCodecBlock : 1;
  cv::Mat means;
  pixels_.convertTo(means, CV_32F);
  if (side > 1) cv::resize(means(cv::Rect({}, blocks * side)), means, blocks, 0, 0, cv::INTER_AREA);
  const std::vector<cv::Vec3f> differences = DifferencesOf(means);
  const auto n = static_cast<double>(differences.size());
  degrees_ = 18.0 / 35 * n;  // they overlap
  for (const cv::Vec3f& d : differences) {
    covariance_ += cv::Matx33d(cv::Vec3d(d) * cv::Vec3d(d).t()) * (side * side / (kSquaredWeights * n));
  }
}

std::vector<cv::Vec3d> MeanErrors::OfMean(double area, int draws) const {
  if (degrees_ < 1) return {};
  const cv::Matx33d root = RootOf(covariance_ * (1 / area));
  const CodecRounding codec(pixels_, codec_, spread_);
  cv::Vec3d rounding;  // to whole levels, which noise and scene spread
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(pixels_, mean, deviation);
  for (int k = 0; k < 3 && codec_.luma == 0; ++k) rounding[k] = HalfInterval(1, deviation[k]);
  cv::RNG random(9);
  std::vector<cv::Vec3d> errors(draws);
  for (cv::Vec3d& error : errors) {
    cv::Vec3d normal;
    for (int k = 0; k < 3; ++k) normal[k] = random.gaussian(1);
    error = root * normal + codec.Draw(random);
    for (int k = 0; k < 3; ++k) error[k] += rounding[k] * random.uniform(-1.0, 1.0);
  }
  return errors;
}

// Of the mean of a part's channels with these weights: what is made of chroma and of whole levels, not of luma.
double MeanErrors::RoundingVariance(const cv::Mat& part, const cv::Vec3d& weights) const {
  constexpr int kDraws = 200;
  cv::Vec3d spread = SpreadOf(part, codec_);
  spread[0] = std::numeric_limits<double>::infinity();
  const CodecRounding codec(part, codec_, spread);
  cv::RNG random(11);
  double squares = 0;
  for (int i = 0; i < kDraws; ++i) squares += std::pow(weights.dot(codec.Draw(random)), 2) / kDraws;
  return squares;
}

Uncertainty MeanErrors::OfEvenness(const cv::Mat& means, double area, double rounded) const {
  if (degrees_ < 1 || !(cv::norm(means, cv::NORM_INF) > 0)) return FromErrors({}, kPixelMethod);
  const cv::Vec3d weights(GreyOfMeans({1, 0, 0}), GreyOfMeans({0, 1, 0}), GreyOfMeans({0, 0, 1}));
  // A codec rounds each block's luma to a step; with its chroma, the channels to levels, alike where that hardly
  // differs, as within one of the means. Without a codec, grey is rounded.
  const int side = std::clamp(cvRound(std::sqrt(area)), 1, std::min(pixels_.cols, pixels_.rows));
  const cv::Rect middle((pixels_.cols - side) / 2, (pixels_.rows - side) / 2, side, side);
  const double luma_steps = std::pow(codec_.luma * kCodecBlock, 2) / 12 / area;
  cv::Scalar deviation;
  cv::meanStdDev(pixels_, cv::noArray(), deviation);
  const double levels = codec_.luma == 0
                            ? std::pow(HalfInterval(1, GreyOfMeans({deviation[0], deviation[1], deviation[2]})), 2) / 3
                            : RoundingVariance(pixels_(middle), weights);
  const double noise = std::sqrt(weights.dot(covariance_ * weights) / area + luma_steps + levels + rounded);
  const cv::Mat even = WithoutNoise(means, noise, degrees_);
  cv::RNG random(10);
  std::vector<double> errors;
  for (int draw = 0; draw < kColourDraws; ++draw) {
    const double of_noise = 1 + random.gaussian(1) / std::sqrt(2 * degrees_);  // which is not known better
    cv::Mat noisy(even.size(), CV_64F);
    random.fill(noisy, cv::RNG::NORMAL, 0, of_noise * noise);
    errors.push_back(LeastOverMost(even + noisy) - LeastOverMost(even));
  }
  return FromErrors(std::move(errors), kPixelMethod);
}

}  // namespace qv
