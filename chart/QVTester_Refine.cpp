// Refinement of a registration by the enhanced correlation coefficient (Evangelidis and Psarakis, IEEE PAMI 30, 2008).
// It climbs: from a start that is further off than the pictures' structures are wide it ends anywhere. So it begins
// with coarse pictures, in which they are wide, and each result is the next finer one's start.

#include <cmath>
#include <limits>
#include <opencv2/imgproc.hpp>
#include <opencv2/video/tracking.hpp>

#include "qvtester/tester.h"

namespace {

constexpr int kCoarsest = 48;          // pixels of a picture's shorter side, at least
constexpr double kFinest = 2'000'000;  // pixels of the reference, at most: more cost time and gain nothing
constexpr int kMostHalvings = 4;
constexpr int kSteps = 100;
constexpr double kEnough = 1e-6;  // change of the correlation that ends the search
constexpr int kSmoothing = 5;     // pixels

// The same map between pictures of `scale` times the size, coordinates counted from pixel centres.
cv::Mat Scaled(const cv::Mat& map, double scale) {
  const double shift = (scale - 1) / 2;
  const cv::Mat linear = map.colRange(0, 2);
  const cv::Mat centre = (cv::Mat_<double>(2, 1) << shift, shift);
  cv::Mat scaled;
  cv::hconcat(linear, scale * map.col(2) + centre - linear * centre, scaled);
  return scaled;
}

// A picture at a fraction of its size; each pixel the mean of those that it covers.
cv::Mat Shrunk(const cv::Mat& picture, double scale) {
  if (scale == 1) return picture;
  cv::Mat shrunk;
  cv::resize(picture, shrunk, cv::Size(), scale, scale, cv::INTER_AREA);
  return shrunk;
}

// Does the image show a quarter of the reference or more? Less is no overlap to climb by.
bool Overlap(const cv::Mat& map, cv::Size reference, cv::Size image) {
  constexpr int kGrid = 16;
  int seen = 0;
  for (int i = 0; i < kGrid; ++i) {
    for (int k = 0; k < kGrid; ++k) {
      const double x = (i + 0.5) * reference.width / kGrid;
      const double y = (k + 0.5) * reference.height / kGrid;
      const double u = map.at<double>(0, 0) * x + map.at<double>(0, 1) * y + map.at<double>(0, 2);
      const double v = map.at<double>(1, 0) * x + map.at<double>(1, 1) * y + map.at<double>(1, 2);
      seen += static_cast<int>(u >= 0 && v >= 0 && u < image.width && v < image.height);
    }
  }
  return seen >= kGrid * kGrid / 4;
}

// On a plain picture the correlation is one of rounding.
bool ShowsAnything(const cv::Mat& image, const cv::Mat& map, cv::Size reference) {
  constexpr double kLeast = 0.5;  // levels
  cv::Mat seen;
  cv::warpAffine(image, seen, map, reference, cv::INTER_NEAREST | cv::WARP_INVERSE_MAP, cv::BORDER_REPLICATE);
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(seen, mean, deviation);
  return deviation[0] >= kLeast;
}

// NaN where it does not converge; the map is then left as it is.
double Climb(const cv::Mat& reference, const cv::Mat& image, double scale, cv::Mat& map) {
  cv::Mat found;
  Scaled(map, scale).convertTo(found, CV_32F);
  try {
    const cv::TermCriteria enough(cv::TermCriteria::COUNT + cv::TermCriteria::EPS, kSteps, kEnough);
    const double correlation = cv::findTransformECC(Shrunk(reference, scale), Shrunk(image, scale), found,
                                                    cv::MOTION_AFFINE, enough, cv::noArray(), kSmoothing);
    if (!(correlation > 0) || !cv::checkRange(found)) return std::numeric_limits<double>::quiet_NaN();
    found.convertTo(found, CV_64F);
    map = Scaled(found, 1 / scale);
    return correlation;
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
    return std::numeric_limits<double>::quiet_NaN();  // no overlap, or nothing to climb
  }
}

}  // namespace

float QVTester::RefineUnwarp(cv::Mat reference, cv::Mat image, cv::Mat& map) {
  if (reference.empty() || image.empty() || reference.type() != CV_8UC1 || image.type() != CV_8UC1) {
    CV_Error(cv::Error::StsUnsupportedFormat, "refinement needs one channel of 8 bits");
  }
  constexpr auto kNone = std::numeric_limits<float>::quiet_NaN();
  if (!Overlap(map, reference.size(), image.size())) return kNone;
  int finest = 0;  // halvings
  while (std::ldexp(static_cast<double>(reference.total()), -2 * finest) > kFinest) ++finest;
  const int side = std::min({reference.rows, reference.cols, image.rows, image.cols});
  int halvings = finest;
  while (halvings < finest + kMostHalvings && (side >> (halvings + 1)) >= kCoarsest) ++halvings;
  cv::Mat found = map.clone();
  double correlation = kNone;
  for (; halvings >= finest; --halvings) correlation = Climb(reference, image, std::ldexp(1.0, -halvings), found);
  if (std::isnan(correlation) || !Overlap(found, reference.size(), image.size())) return kNone;
  if (!ShowsAnything(image, found, reference.size())) return kNone;
  map = found;
  return static_cast<float>(correlation);
}
