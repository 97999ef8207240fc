#include "desk/measure/uncertainty.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <numeric>
#include <opencv2/imgproc.hpp>

namespace qv {

namespace {

constexpr double kUnknown = std::numeric_limits<double>::quiet_NaN();

// Student's distribution function for whole degrees of freedom (Abramowitz and Stegun 26.7.3 and 26.7.4): what lies
// between -t and t.
double StudentShare(double t, int degrees) {
  const double theta = std::atan2(t, std::sqrt(static_cast<double>(degrees)));
  const double cosine = std::cos(theta);
  const bool odd = degrees % 2 != 0;
  double term = odd ? cosine : 1;
  double sum = degrees == 1 ? 0 : term;
  for (int k = odd ? 3 : 2; k < degrees; k += 2) {
    term *= cosine * cosine * (k - 1) / k;
    sum += term;
  }
  return odd ? 2 / CV_PI * (theta + std::sin(theta) * sum) : std::sin(theta) * sum;
}

// Differences between neighbours along a row, halved: the variance of a pixel's noise, without the scene's slope.
cv::Matx33d NeighbourCovariance(const cv::Mat& patch) {
  cv::Matx33d sum = cv::Matx33d::zeros();
  double count = 0;
  for (int row = 0; row < patch.rows; ++row) {
    const auto* pixels = patch.ptr<cv::Vec3b>(row);
    for (int i = 0; i + 2 < patch.cols; ++i) {
      const cv::Vec3d difference = cv::Vec3d(pixels[i]) - 2 * cv::Vec3d(pixels[i + 1]) + cv::Vec3d(pixels[i + 2]);
      sum += difference * difference.t();
      ++count;
    }
  }
  return count == 0 ? cv::Matx33d::zeros() : sum * (1 / (6 * count));
}

// A picture in blocks, and second differences between neighbours along the rows: noise without the scene's slope. What
// a codec, a filter or a mosaic does binds neighbouring pixels, so noise is that of blocks where there are enough.
struct Parts {
  double count = 0;
  std::vector<double> differences;

  double Independent() const { return 18.0 / 35 * static_cast<double>(differences.size()); }  // they overlap
};
constexpr double kSquaredWeights = 6;  // of 1, -2, 1

// The smaller differences tell the noise where the scene's edges take less than three in ten; a median would stand on
// whole levels where a codec leaves blocks on these.
constexpr double kSmaller = 0.7;
constexpr double kTheirSquares = 0.3097;  // mean of a normal variable's squares among the smaller
constexpr double kWorth = 0.37;           // they tell as much as so many of all, at least

double NoiseOf(const Parts& parts) {
  std::vector<double> squares;
  for (const double difference : parts.differences) squares.push_back(difference * difference);
  const auto count = static_cast<std::ptrdiff_t>(std::ceil(kSmaller * static_cast<double>(squares.size())));
  std::nth_element(squares.begin(), squares.begin() + count - 1, squares.end());
  const double sum = std::accumulate(squares.begin(), squares.begin() + count, 0.0);
  return std::sqrt(sum / static_cast<double>(count) / kTheirSquares / kSquaredWeights);
}

Parts PartsOf(const cv::Mat& picture) {
  constexpr int kBlock = 8;  // pixels a side: a codec's
  constexpr int kFewest = 60;
  const cv::Size blocks(picture.cols / kBlock, picture.rows / kBlock);
  const bool in_blocks = blocks.width >= 3 && blocks.area() >= kFewest;
  cv::Mat levels;
  picture.convertTo(levels, CV_32F);
  if (in_blocks) cv::resize(levels(cv::Rect({}, blocks * kBlock)), levels, blocks, 0, 0, cv::INTER_AREA);
  Parts parts;
  parts.count = static_cast<double>(picture.total()) / (in_blocks ? kBlock * kBlock : 1);
  for (int row = 0; row < levels.rows; ++row) {
    const auto* values = levels.ptr<float>(row);
    for (int i = 0; i + 2 < levels.cols; ++i)
      parts.differences.push_back(1.0 * values[i] - 2.0 * values[i + 1] + values[i + 2]);
  }
  return parts;
}

}  // namespace

const std::vector<UncertaintyMethod>& UncertaintyMethods() {
  static const std::vector<UncertaintyMethod> methods = {
      {kBandsMethod,
       "Each quarter of the edge gives a reading of its own; their scatter over the root of four is the standard "
       "uncertainty, with three degrees of freedom. Type B: 0.1 % for what the method itself leaves (bins, plateaus, "
       "rounding of levels). A JPEG file's own steps are also taken on a drawn edge, as sharp as the one that was "
       "found (a Gaussian), in its place, light and noise: what they change of a figure there, beyond chance, is "
       "taken for an error of the reading. What light or chart do to the edge itself is not in it."},
      {kResamplingMethod,
       "The region is taken apart into its edge spread and its noise; the noise is drawn again in blocks of rows, "
       "50 times, and each picture is measured anew. The 95 % quantile of the readings' distance from the one without "
       "noise is the expanded uncertainty; jumps of the reading are in it. It tells how far the reading lies from the "
       "noiseless one, not how far that lies from the lens's own figure."},
      {kPixelMethod,
       "What the colour of a patch, a light or a display may be is drawn 400 times (JCGM 101) and carried through the "
       "formulas: from the variance of its pixels, by differences between neighbours, over their number. In a "
       "JPEG file it is drawn from what luma and chroma may have been: blocks' means, moved by the noise that the "
       "file's table "
       "left, are rounded to its steps, then to levels, and the mean that came of it tells where it may have lain "
       "(chroma at half the pixels is taken for granted). A patch's mean is cut to a whole level (type B: up "
       "to one level low); the standard photo's noise is taken to be the same. Of a light the true value is that "
       "without noise, which lifts the mean of bent levels: by how much, its blocks of 8 x 8 pixels tell. An evenness "
       "is the least over the largest of means, and reads low by noise: noise is drawn anew about the plainest surface "
       "through them. A light's region should keep 16 px off its rim in a JPEG file. What light and exposure do from "
       "photo to photo is not in it. Of a display 2,000 draws; with what straightening rounds, halves up, which lifts "
       "means by some 0.005 levels, and, type B, 0.02 px of where each side lies."},
      {kMeanMethod,
       "The variance of blocks of 8 x 8 pixels, from differences between neighbours, over their number; of single "
       "pixels where there are fewer than 60 blocks. A share of pixels is a mean of ones and noughts, of the photo as "
       "it is stored: a JPEG file has fewer clipped pixels than the camera saw. At 0.3 % of noise the rim of a "
       "clipped area counts as noise, and the share's uncertainty is up to three times too wide. Type B: of a share, "
       "one pixel; of a JPEG file's mean, up to a 128th of a level, by which its blocks' means are rounded one way. "
       "What light and exposure do from photo to photo is not in it (take several photos)."},
      {kResidualMethod,
       "Marks: how far the search's places lie from the centres of gravity of the marks' inner squares in evened "
       "light, which are good to 0.005 px (type B) and beside each other to 0.003 px, but for what noise moves them, "
       "carried to the legs and the turn; a module is good to 0.0065 px (type B) and noise. Where the blur is over a "
       "fifth of a module the frame shines into the circle about the square: what moves a centre then counts by as "
       "much more as it follows the circle, and of that 0.0125 px, and 0.1 px of a module, are added (type B). In a "
       "JPEG file noise is hidden up to the first step of its table, over the root of 12 (type B). Registration: the "
       "grey levels left over under the map of all matches, by 64 parts of the picture (as noise may be alike between "
       "neighbours), tell where the best map lies and how surely; what lies between it and either map is in that one's"
       " uncertainty, and the distance of both maps has it by 400 draws (JCGM 101). Type B, of interpolated pixels: "
       "0.0015 px of a place and 0.0038 px of an enlargement at the picture's sides; of a print's map 0.001 px of a "
       "place alone; none for depth in the scene and "
       "distortion, which no affine map follows."},
      {kSpotMethod,
       "Type B alone: the 95 % quantiles of the errors of 3,000 simulated spots, half sharp and half soft, by contrast "
       "times the root of the pixels over the noise, s: of the area 0.48 + 1.5 / s of it, of the contrast 0.45 + 6 / s "
       "(from s = 50 on 0.1 + 6 / s), of a place 0.015 + 1.2 / s of the diameter; of all spots together, the root of "
       "the squares. The noise of a pixel, rounding to levels included: the scatter of medians over parts of the "
       "photo, drawn 200 times (JCGM 101), and what their reading between steps is known to be off. What JPEG takes "
       "off noise and spots is not in it. Under half a percent of noise only sharp spots stand out of the levels' "
       "steps: areas and contrasts are then too wide, by half."},
      {kStampTrust,
       "Type B alone. Of a rate the rounding of the last stamp, a millisecond where all are whole ones (Matroska), "
       "else "
       "a 90,000th of a second, rectangular; where a film's last frames have no stamps, by how much the median "
       "interval, "
       "at which they are taken to follow, departs from the film's own. Of a gap the difference of two roundings, "
       "triangular; where several are as long but for a step, what the longest has more than their mean. Of the moment "
       "of settling one frame to either side."},
      {kCourseMethod,
       "Differences between neighbouring frames beyond what the film does tell the noise of one; a median of n has it "
       "1.25 times over the root of n (of two thirds of n for MTF50, since a codec makes neighbours alike). A flash's "
       "levels are those of decoded frames, whose luma and chroma are cut to whole levels: two frames' pixels are "
       "taken "
       "back to them and tell how much was cut, which is left in the levels and taken for an error; frames that were "
       "converted otherwise may be up to a level off (type B). Type B besides: 0.2 levels, as encoders code means of 4 "
       "x 4 pixels in steps of some 0.7. A pulse's width has the noise of its flanks and of "
       "the level half-way, and what it departs from that of a smooth pulse through its frames. What else the film's "
       "codec does to all frames alike is not in it."},
      {kRepeatMethod,
       "The spread of several photos of one unit, over the root of their number, with Student's factor; the median's "
       "is wider than the mean's by sqrt(pi / 2)."},
  };
  return methods;
}

double StudentFactor(double degrees_of_freedom) {
  constexpr double kNormal = 1.959964;
  if (!(degrees_of_freedom >= 1)) return std::isnan(degrees_of_freedom) ? kUnknown : StudentFactor(1);
  if (degrees_of_freedom > 200) return kNormal * (1 + (kNormal * kNormal + 1) / (4 * degrees_of_freedom));
  const auto whole = static_cast<int>(degrees_of_freedom);  // cut: the factor is rather too large than too small
  double low = 1;
  double high = 13;
  for (int step = 0; step < 50; ++step) {
    const double middle = (low + high) / 2;
    (StudentShare(middle, whole) < kCoverage ? low : high) = middle;
  }
  return high;
}

Uncertainty Combined(double type_a, double degrees_of_freedom, double type_b, const char* method) {
  const double standard = std::hypot(type_a, type_b);
  const double share = standard == 0 ? 1 : type_a / standard;
  const double factor = StudentFactor(degrees_of_freedom / std::pow(share, 4));
  return {standard, factor * standard, factor, method};
}

double HalfWidthHolding(const std::function<double(double)>& below, double low, double high) {
  constexpr int kSteps = 50;
  for (int step = 0; step < kSteps; ++step) {
    const double middle = (low + high) / 2;
    (below(middle) - below(-middle) < kCoverage ? low : high) = middle;
  }
  return high;
}

Uncertainty OffBy(double error, const Uncertainty& about, double degrees_of_freedom) {
  const double off = std::fabs(error);
  if (!(off > 0) || !(about.standard > 0)) return about;
  const auto degrees = static_cast<int>(std::clamp(degrees_of_freedom, 1.0, 200.0));
  const auto below = [&](double x) {  // Student's distribution about where the error puts the true value
    const double t = (x - off) / about.standard;
    return (1 + std::copysign(StudentShare(std::fabs(t), degrees), t)) / 2;
  };
  const double high = HalfWidthHolding(below, 0, off + about.expanded);
  const double standard = std::hypot(off, about.standard);
  return {standard, high, high / standard, about.method};
}

Uncertainty Rectangular(double half, const char* method) {
  const double standard = half / std::sqrt(3.0);
  return {standard, kCoverage * half, kCoverage * std::sqrt(3.0), method};
}

double Spread(const std::vector<double>& readings) {
  const auto n = static_cast<double>(readings.size());
  if (readings.size() < 2) return kUnknown;
  const double mean = std::accumulate(readings.begin(), readings.end(), 0.0) / n;
  double squares = 0;
  for (const double reading : readings) squares += (reading - mean) * (reading - mean);
  return std::sqrt(squares / (n - 1));
}

Uncertainty OfMean(const std::vector<double>& readings, double type_b, const char* method) {
  const auto n = static_cast<double>(readings.size());
  if (readings.size() < 2) return {kUnknown, kUnknown, kUnknown, method};
  return Combined(Spread(readings) / std::sqrt(n), n - 1, type_b, method);
}

Uncertainty OfMedian(const std::vector<double>& readings) {
  const double wider = readings.size() > 2 ? std::sqrt(CV_PI / 2) : 1;  // the median of two is their mean
  Uncertainty u = OfMean(readings, 0, kRepeatMethod);
  u.standard *= wider;
  u.expanded *= wider;
  return u;
}

double Median(std::vector<double> readings) {
  if (readings.empty()) return kUnknown;
  std::sort(readings.begin(), readings.end());
  const std::size_t half = readings.size() / 2;
  return readings.size() % 2 != 0 ? readings[half] : (readings[half - 1] + readings[half]) / 2;
}

Uncertainty FromErrors(std::vector<double> errors, const char* method) {
  if (errors.empty()) return {kUnknown, kUnknown, kUnknown, method};
  double squares = 0;
  for (double& error : errors) {
    error = std::isfinite(error) ? std::fabs(error) : std::numeric_limits<double>::infinity();
    squares += error * error;
  }
  std::sort(errors.begin(), errors.end());
  // A further error lies below the k-th of n in k of n + 1 cases.
  const auto n = static_cast<double>(errors.size());
  const double place = std::clamp(kCoverage * (n + 1) - 1, 0.0, n - 1);
  const auto below = static_cast<std::size_t>(place);
  const double above = errors[std::min(below + 1, errors.size() - 1)];
  const double expanded =
      std::isinf(above) ? above : errors[below] + (above - errors[below]) * (place - std::floor(place));
  const double standard = std::sqrt(squares / n);
  return {standard, expanded, standard == 0 ? 1 : expanded / standard, method};
}

Uncertainty OfMeanLevel(const cv::Mat& picture, double unit, double type_b) {
  const Parts parts = PartsOf(picture);
  if (parts.differences.empty()) return {kUnknown, kUnknown, kUnknown, kMeanMethod};
  return Combined(unit * NoiseOf(parts) / std::sqrt(parts.count), std::max(kWorth * parts.Independent(), 1.0),
                  unit * type_b, kMeanMethod);
}

Uncertainty OfShare(const cv::Mat& mask) {
  const Parts parts = PartsOf(mask);
  if (parts.differences.empty()) return {kUnknown, kUnknown, kUnknown, kMeanMethod};
  double squares = 0;
  for (const double difference : parts.differences) squares += difference * difference;
  const double variance = squares / (kSquaredWeights * static_cast<double>(parts.differences.size()));
  return Combined(std::sqrt(variance / parts.count) / 255, std::max(parts.Independent(), 1.0),
                  1 / static_cast<double>(mask.total()), kMeanMethod);
}

cv::Matx33d CovarianceOfMean(const cv::Mat& patch, double rounding) {
  CV_Assert(patch.type() == CV_8UC3 && !patch.empty());
  return NeighbourCovariance(patch) * (1.0 / static_cast<double>(patch.total())) + cv::Matx33d::eye() * rounding;
}

}  // namespace qv
