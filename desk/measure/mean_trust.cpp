#include "desk/measure/mean_trust.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/measure/coded_mean.h"
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

// What the true values of means probably are: the plainest surface off which they lie with no more variance than may
// be noise's; else what surely lies further stays.
cv::Mat WithoutNoise(const cv::Mat& grid, double most) {
  cv::Mat surface;
  cv::Mat off;
  double share = 0;
  for (const int terms : {1, 3, 6}) {
    const double freedom = static_cast<double>(grid.total()) - terms;
    if (freedom < terms) break;
    surface = SurfaceThrough(grid, terms);
    off = grid - surface;
    const double variance = off.dot(off) / freedom;
    share = variance > 0 ? std::max(1 - most / variance, 0.0) : 0;
    if (share == 0) break;
  }
  return surface + share * off;
}

// The variance about their own means that two deviations more than the middle of these grids have.
double MostVariance(const std::vector<cv::Mat>& drawn) {
  constexpr double kShare = 0.977;
  std::vector<double> variances;
  for (const cv::Mat& one : drawn) {
    const cv::Mat off = one - cv::mean(one)[0];
    variances.push_back(off.dot(off) / std::max(static_cast<double>(off.total()) - 1, 1.0));
  }
  const auto place = static_cast<std::ptrdiff_t>(kShare * static_cast<double>(variances.size()));
  std::nth_element(variances.begin(), variances.begin() + place, variances.end());
  return variances[place];
}

double LeastOverMost(const cv::Mat& means) {
  double least = 0;
  double most = 0;
  cv::minMaxLoc(means, &least, &most);
  return least / most;
}

}  // namespace

MeanErrors::MeanErrors(const cv::Mat& pixels, const CodecSteps& codec)
    : pixels_(MiddleOf(pixels)), codec_(codec), coded_(pixels_, codec) {
  constexpr int kFewest = 60;  // blocks that tell what is alike between neighbouring pixels
  constexpr double kSquaredWeights = 6;
  const cv::Size blocks(pixels_.cols / kCodecBlock, pixels_.rows / kCodecBlock);
  const int side = blocks.area() >= kFewest ? kCodecBlock : 1;
  cv::Mat means;
  pixels_.convertTo(means, CV_32F);
  if (side > 1) cv::resize(means(cv::Rect({}, blocks * side)), means, blocks, 0, 0, cv::INTER_AREA);
  const std::vector<cv::Vec3f> differences = DifferencesOf(means);
  const auto n = static_cast<double>(differences.size());
  degrees_ = 18.0 / 53 * n;  // they overlap, and rows cross columns
  for (const cv::Vec3f& d : differences) {
    covariance_ += cv::Matx33d(cv::Vec3d(d) * cv::Vec3d(d).t()) * (side * side / (kSquaredWeights * n));
  }
}

std::vector<cv::Vec3d> MeanErrors::OfMean(double area, int draws) const {
  if (degrees_ < 1) return {};
  const cv::Matx33d root = codec_.luma == 0 ? RootOf(covariance_ * (1 / area)) : cv::Matx33d::zeros();
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
    error = root * normal - coded_.Draw(area, random);
    for (int k = 0; k < 3; ++k) error[k] += rounding[k] * random.uniform(-1.0, 1.0);
  }
  return errors;
}

std::vector<double> MeanErrors::OfGreyPart(double area, int draws) const {
  cv::RNG random(14);
  if (codec_.luma != 0) return coded_.DrawGreyOfPart(area, draws, random);
  std::vector<double> errors;
  for (const cv::Vec3d& one : OfMean(area, draws)) errors.push_back(GreyOfMeans(one));
  return errors;
}

// What means of grey over so many pixels are off by, drawn: by noise, which is not known better than that, and by whole
// levels, of each pixel after the photo was stored too; with a codec by what that rounds, most of it alike.
std::vector<cv::Mat> MeanErrors::OfGreyMeans(const cv::Mat& grid, double area, double share, double rounded) const {
  cv::RNG random(10);
  if (codec_.luma != 0) return coded_.DrawGrey(grid, area, share, rounded, kColourDraws, random);
  const cv::Vec3d weights(GreyOfMeans({1, 0, 0}), GreyOfMeans({0, 1, 0}), GreyOfMeans({0, 0, 1}));
  cv::Scalar deviation;
  cv::meanStdDev(pixels_, cv::noArray(), deviation);
  const double levels = HalfInterval(1, GreyOfMeans({deviation[0], deviation[1], deviation[2]}));
  const double noise = std::sqrt(weights.dot(covariance_ * weights) / area + levels * levels / 3 + rounded);
  std::vector<cv::Mat> errors(kColourDraws);
  for (cv::Mat& error : errors) {  // the root of degrees over chi squared, by Wilson and Hilferty
    const double part = 2 / (9 * degrees_);
    const double of_noise = std::pow(std::max(1 - part + std::sqrt(part) * random.gaussian(1), 0.2), -1.5);
    error.create(grid.size(), CV_64F);
    random.fill(error, cv::RNG::NORMAL, 0, of_noise * noise);
  }
  return errors;
}

Uncertainty MeanErrors::OfEvenness(const cv::Mat& means, double area, double rounded, double share) const {
  if (degrees_ < 1 || !(cv::norm(means, cv::NORM_INF) > 0)) return FromErrors({}, kPixelMethod);
  const std::vector<cv::Mat> drawn = OfGreyMeans(means, area, share, rounded);
  const cv::Mat even = WithoutNoise(means, MostVariance(drawn));
  std::vector<double> errors;
  for (const cv::Mat& one : drawn) errors.push_back(LeastOverMost(even + one) - LeastOverMost(even));
  return FromErrors(std::move(errors), kPixelMethod);
}

}  // namespace qv
