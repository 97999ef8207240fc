#include "desk/measure/light_trust.h"

#include <cmath>
#include <cstdlib>
#include <memory>
#include <new>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "desk/measure/mean_trust.h"
#include "desk/measure/transfer.h"
#include "qvtester/tester.h"
#include "tests/camera/colour.h"

namespace qv {

namespace {

constexpr int kBlockSide = 8;    // pixels within which the scene is even, or nearly
constexpr int kBlocksASide = 8;  // the test's, of a region

// What the mean of linear light has of noise alone: within small blocks the scene is even, and the light of their mean
// level is that without noise. Red, green, blue.
cv::Vec3d LiftOf(const cv::Mat& pixels) {
  const Transfer srgb;
  const cv::Size blocks(std::max(pixels.cols / kBlockSide, 1), std::max(pixels.rows / kBlockSide, 1));
  const cv::Size block(std::min(pixels.cols, kBlockSide), std::min(pixels.rows, kBlockSide));
  const cv::Mat part = pixels(cv::Rect(0, 0, blocks.width * block.width, blocks.height * block.height));
  const double n = block.area();
  cv::Vec3d lift;
  for (int k = 0; k < 3; ++k) {
    cv::Mat levels;
    cv::extractChannel(part, levels, 2 - k);
    const double all = cv::mean(LinearLight(levels, srgb))[0];
    levels.convertTo(levels, CV_32F, 1.0 / 255);
    cv::resize(levels, levels, blocks, 0, 0, cv::INTER_AREA);
    lift[k] = (all - cv::mean(LinearLight(levels, srgb))[0]) * n / std::max(n - 1, 1.0);
  }
  return lift;
}

// Light for a level at the region's mean, red, green, blue: of stored errors, blue first, to linear ones.
cv::Vec3d SlopeOf(const cv::Mat& pixels) {
  const Transfer srgb;
  const cv::Scalar mean = cv::mean(pixels);
  cv::Vec3d slope;
  for (int k = 0; k < 3; ++k) {
    const double level = mean[2 - k] / 255;
    constexpr double kStep = 0.01;
    slope[k] = (srgb.Light(level + kStep) - srgb.Light(level - kStep)) / (2 * kStep) / 255;
  }
  return slope;
}

std::vector<float> TemperaturesOf(std::vector<float> xyz) {
  const int count = static_cast<int>(xyz.size() / 3);
  QVTester tester;
  const std::unique_ptr<float, decltype(&std::free)> kelvin(tester.xyz2cct(xyz.data(), 1, count), &std::free);
  if (kelvin == nullptr) throw std::bad_alloc();
  return {kelvin.get(), kelvin.get() + count};
}

// What is made of the means, given what light may really be there.
void TrustColour(const QVLightRegion& region, const std::vector<cv::Vec3d>& lights, LightTrust& trust) {
  std::array<std::vector<double>, 3> linear;
  std::array<std::vector<double>, 2> chromaticity;
  std::vector<double> luminance;
  std::vector<double> temperature;
  std::vector<float> all;
  for (const cv::Vec3d& light : lights) {
    const std::array<float, 3> xyz =
        LinearToXyz(static_cast<float>(light[0]), static_cast<float>(light[1]), static_cast<float>(light[2]));
    for (int k = 0; k < 3; ++k) linear[k].push_back(light[k] - region.linear_rgb_[k]);
    luminance.push_back(xyz[1] - region.xyz_[1]);
    for (int k = 0; k < 2; ++k)
      chromaticity[k].push_back(xyz[k] / (xyz[0] + xyz[1] + xyz[2]) - region.chromaticity_[k]);
    all.insert(all.end(), xyz.begin(), xyz.end());
  }
  for (const float kelvin : TemperaturesOf(all)) temperature.push_back(kelvin - region.cct_);
  for (int k = 0; k < 3; ++k) trust.linear[k] = FromErrors(linear[k], kPixelMethod);
  for (int k = 0; k < 2; ++k) trust.chromaticity[k] = FromErrors(chromaticity[k], kPixelMethod);
  trust.luminance = FromErrors(luminance, kPixelMethod);
  trust.cct = FromErrors(temperature, kPixelMethod);
}

// Means of the test's blocks.
cv::Mat BlockMeans(const cv::Mat& grey) {
  cv::Mat means(std::min(kBlocksASide, grey.rows), std::min(kBlocksASide, grey.cols), CV_64F);
  for (int i = 0; i < means.rows; ++i) {
    for (int k = 0; k < means.cols; ++k) {
      const cv::Range rows(i * grey.rows / means.rows, (i + 1) * grey.rows / means.rows);
      const cv::Range columns(k * grey.cols / means.cols, (k + 1) * grey.cols / means.cols);
      means.at<double>(i, k) = cv::mean(grey(rows, columns))[0];
    }
  }
  return means;
}

}  // namespace

LightTrust TrustInLight(const cv::Mat& photo, const QVLightRegion& region, const CodecSteps& codec) {
  cv::Mat pixels = photo(cv::Rect(region.left_, region.top_, region.width_, region.height_));
  if (pixels.channels() == 4) cv::cvtColor(pixels, pixels, cv::COLOR_BGRA2BGR);
  const auto area = static_cast<double>(pixels.total());
  const MeanErrors errors(pixels, codec);
  const std::vector<cv::Vec3d> off = errors.OfMean(area);
  LightTrust trust;
  const cv::Scalar mean = cv::mean(pixels);
  const double unrounded = GreyOfMeans({mean[0], mean[1], mean[2]});  // grey is rounded to levels pixel by pixel
  trust.mean_grey = OfDrawn(off, region.mean_grey_, [=](const cv::Vec3d& bgr) { return unrounded + GreyOfMeans(bgr); });
  const cv::Vec3d lift = LiftOf(pixels);
  const cv::Vec3d slope = SlopeOf(pixels);
  const cv::Vec3d found(region.linear_rgb_[0], region.linear_rgb_[1], region.linear_rgb_[2]);
  std::vector<cv::Vec3d> lights;
  for (const cv::Vec3d& bgr : off) lights.push_back(found - lift + slope.mul(cv::Vec3d(bgr[2], bgr[1], bgr[0])));
  TrustColour(region, lights, trust);

  cv::Mat grey;
  cv::cvtColor(pixels, grey, cv::COLOR_RGB2GRAY);
  const cv::Mat means = BlockMeans(grey);
  const double part = area / static_cast<double>(means.total());
  const double of_grey = codec.luma == 0 ? 1.0 / 12 / part : 0;  // rounded pixel by pixel; a codec's is alike in many
  trust.uniformity = errors.OfEvenness(means, part, of_grey);
  cv::Mat clipped;
  cv::transform(pixels == 255, clipped, cv::Matx13f(1, 1, 1));  // saturates
  trust.clipped_share = OfShare(clipped);
  return trust;
}

}  // namespace qv
