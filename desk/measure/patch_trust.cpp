#include "desk/measure/patch_trust.h"

#include <opencv2/imgproc.hpp>

#include "desk/measure/cielab.h"

namespace qv {

namespace {

cv::Vec3d Levels(const cv::Point3i& mean) { return {1.0 * mean.x, 1.0 * mean.y, 1.0 * mean.z}; }

constexpr double kLumaShare = 0.67;  // of a channel's noise: the root of the weights' squares
constexpr double kChromaShare = 0.62;
constexpr int kBlockPx = 8;
constexpr int kChromaBlockPx = 16;  // of halved chroma

// Of a pixel, as the blocks' means tell it; the codec takes most of the pixels' own away.
double NoiseBeforeCodec(const cv::Mat& pixels, const CodecSteps& codec) {
  const double left = std::sqrt(cv::trace(CovarianceOfMean(pixels, 0)) / 3 * static_cast<double>(pixels.total()));
  const cv::Size blocks(pixels.cols / kBlockPx, pixels.rows / kBlockPx);
  if (blocks.width < 3 || blocks.height < 1) return left;
  cv::Mat means;
  cv::cvtColor(pixels(cv::Rect({}, blocks * kBlockPx)), means, cv::COLOR_BGR2GRAY);
  means.convertTo(means, CV_32F);
  cv::resize(means, means, blocks, 0, 0, cv::INTER_AREA);
  const cv::Matx13f second(1, -2, 1);
  cv::filter2D(means, means, CV_32F, second);
  const cv::Mat inner = means.colRange(1, blocks.width - 1);
  const double variance = inner.dot(inner) / (6.0 * static_cast<double>(inner.total()));
  return std::max(left, kBlockPx / kLumaShare * std::sqrt(std::max(variance - codec.luma * codec.luma / 12, 0.0)));
}

// How far decoded chroma differs between pixels: red and blue are luma and a function of it, to the level.
double ChromaSpread(const cv::Mat& pixels) {
  constexpr double kOfDifferences = 2.2;  // of red or blue less green, a level of one chroma and the other's part in it
  double squares = 0;
  for (const int k : {0, 2}) {
    cv::Mat channel;
    cv::Mat green;
    cv::Mat difference;
    cv::extractChannel(pixels, channel, k);
    cv::extractChannel(pixels, green, 1);
    cv::subtract(channel, green, difference, cv::noArray(), CV_32F);
    cv::Scalar mean;
    cv::Scalar deviation;
    cv::meanStdDev(difference, mean, deviation);
    squares += deviation[0] * deviation[0] / 2;
  }
  return std::sqrt(squares) / kOfDifferences;
}

// What the rounding of luma and both chromas may add (ITU-T T.871), in the order of the stored channels: blue first.
cv::Vec3d RgbOf(double luma, double blue, double red) {
  return {luma + 1.772 * blue, luma - 0.344136 * blue - 0.714136 * red, luma + 1.402 * red};
}

}  // namespace

cv::Matx33d RootOf(const cv::Matx33d& covariance) {
  cv::Matx33d root = cv::Matx33d::zeros();
  for (int row = 0; row < 3; ++row) {
    for (int column = 0; column <= row; ++column) {
      double rest = covariance(row, column);
      for (int k = 0; k < column; ++k) rest -= root(row, k) * root(column, k);
      if (row == column) {
        root(row, row) = std::sqrt(std::max(rest, 0.0));
      } else if (root(column, column) > 0) {
        root(row, column) = rest / root(column, column);
      }
    }
  }
  return root;
}

double HalfInterval(double step, double spread) {
  if (step == 0) return 0;
  const double share = spread / step;
  return step / 2 * std::exp(-2 * CV_PI * CV_PI * share * share);
}

// Blocks are rounded to the codec's steps; then samples of chroma to levels, and with them the channels. Where few
// different values come in, all pixels of a patch are off alike. Multiples of a step differ in their rounding by what
// the step departs from a whole number; multiples of chroma's weights in the channels by some 0.3.
CodecRounding::CodecRounding(const cv::Mat& pixels, const CodecSteps& codec, const cv::Vec3d& spread) {
  constexpr double kWeightsApart = 0.3;
  constexpr double kRoundingsVariance = 0.09;  // a twelfth of the samples, and some of the channels
  rounds_ = codec.luma != 0;
  if (!rounds_) return;
  const double noise = NoiseBeforeCodec(pixels, codec);
  const double seen = ChromaSpread(pixels);
  const double unrounded = std::sqrt(std::max(seen * seen - kRoundingsVariance, 0.0));
  const bool whole = codec.chroma == std::round(codec.chroma);
  const double steps_apart = whole ? 0 : std::fabs(1 - std::round(codec.chroma) / codec.chroma);
  luma_ = HalfInterval(codec.luma, std::hypot(kLumaShare * noise / kBlockPx, spread[0]));
  chroma_blue_ = HalfInterval(codec.chroma, std::hypot(kChromaShare * noise / kChromaBlockPx, spread[1]));
  chroma_red_ = HalfInterval(codec.chroma, std::hypot(kChromaShare * noise / kChromaBlockPx, spread[2]));
  chroma_sample_ = whole ? 0 : HalfInterval(1, unrounded * steps_apart);
  channel_ = HalfInterval(1, seen * kWeightsApart);
}

cv::Vec3d CodecRounding::Draw(cv::RNG& random) const {
  if (!rounds_) return {};
  const auto within = [&random](double bound) { return bound * random.uniform(-1.0, 1.0); };
  const double blue = within(chroma_blue_) + within(chroma_sample_);
  const double red = within(chroma_red_) + within(chroma_sample_);
  cv::Vec3d off = RgbOf(within(luma_), blue, red);
  for (int k = 0; k < 3; ++k) off[k] += within(channel_);
  return off;
}

std::vector<cv::Vec3d> DrawPatchColours(const cv::Mat& pixels, double area, const cv::Point3i& mean, std::uint64_t seed,
                                        const CodecSteps& codec) {
  const CodecRounding rounding(pixels, codec);
  const double share = static_cast<double>(pixels.total()) / area;
  const cv::Matx33d root = RootOf(CovarianceOfMean(pixels, 0) * share);
  cv::RNG random(seed);
  std::vector<cv::Vec3d> draws;
  for (int i = 0; i < kColourDraws; ++i) {
    cv::Vec3d normal;
    cv::Vec3d cut;
    for (int k = 0; k < 3; ++k) normal[k] = random.gaussian(1);
    for (int k = 0; k < 3; ++k) cut[k] = random.uniform(0.0, 1.0);
    draws.push_back(Levels(mean) + cut + root * normal + rounding.Draw(random));
  }
  return draws;
}

Uncertainty TrustInColour(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const ColourFigure& figure) {
  const double reading = figure(Levels(mean));
  std::vector<double> errors;
  for (const cv::Vec3d& draw : draws) errors.push_back(figure(draw) - reading);
  return FromErrors(std::move(errors), kPixelMethod);
}

Uncertainty TrustInPair(const cv::Point3i& mean, const std::vector<cv::Vec3d>& draws, const cv::Point3i& standard,
                        const std::vector<cv::Vec3d>& standard_draws, const PairFigure& figure) {
  const double reading = figure(Levels(mean), Levels(standard));
  std::vector<double> errors;
  for (std::size_t i = 0; i < std::min(draws.size(), standard_draws.size()); ++i) {
    errors.push_back(figure(draws[i], standard_draws[i]) - reading);
  }
  return FromErrors(std::move(errors), kPixelMethod);
}

cv::Vec3d OwnLab(const cv::Vec3d& rgb) { return LabOfXyz(XyzOfLab(LabD65OfSrgb(rgb), kD65), kUnitWhite); }

}  // namespace qv
