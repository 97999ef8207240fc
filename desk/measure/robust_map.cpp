#include "desk/measure/robust_map.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <opencv2/calib3d.hpp>
#include <opencv2/features2d.hpp>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "desk/measure/grey.h"
#include "qvtester/tester.h"

namespace qv {

namespace {

constexpr double kMostMatchedPixels = 1'500'000;  // in which features are looked for; a refinement follows
constexpr int kMostFeatures = 4000;
constexpr float kRatio = 0.8f;      // of a match's distance to the next best one's
constexpr double kAgreeing = 3;     // pixels of the pictures as searched
constexpr int kFewestAgreeing = 8;  // agreeing matches; three fix a map, and by chance some lie near it
constexpr double kLowest = 0.6;     // correlation of a sound map
constexpr double kFurthest = 4;     // pixels that a refinement may move the map: more is another place
constexpr int kGrid = 9;

struct Features {
  std::vector<cv::KeyPoint> points;  // in the picture's own coordinates
  cv::Mat descriptors;
};

Features FindFeatures(const cv::Mat& gray, double scale) {
  cv::Mat searched = gray;
  if (scale < 1) cv::resize(gray, searched, cv::Size(), scale, scale, cv::INTER_AREA);
  Features features;
  cv::SIFT::create(kMostFeatures)->detectAndCompute(searched, cv::noArray(), features.points, features.descriptors);
  for (cv::KeyPoint& point : features.points) {
    point.pt = (point.pt + cv::Point2f(0.5f, 0.5f)) / scale - cv::Point2f(0.5f, 0.5f);
  }
  return features;
}

// The best match of each, where the next best is clearly worse; -1 elsewhere.
std::vector<int> Nearest(const cv::Mat& query, const cv::Mat& train) {
  std::vector<std::vector<cv::DMatch>> pairs;
  cv::BFMatcher(cv::NORM_L2).knnMatch(query, train, pairs, 2);
  std::vector<int> nearest(query.rows, -1);
  for (const std::vector<cv::DMatch>& pair : pairs) {
    if (pair.size() == 2 && pair[0].distance < kRatio * pair[1].distance) nearest[pair[0].queryIdx] = pair[0].trainIdx;
  }
  return nearest;
}

struct Matches {
  std::vector<cv::Point2f> from, to;
};

Matches Match(const Features& reference, const Features& image) {
  Matches matches;
  if (reference.descriptors.empty() || image.descriptors.empty()) return matches;
  const std::vector<int> there = Nearest(reference.descriptors, image.descriptors);
  const std::vector<int> back = Nearest(image.descriptors, reference.descriptors);
  for (int i = 0; i < static_cast<int>(there.size()); ++i) {
    if (there[i] < 0 || back[there[i]] != i) continue;
    matches.from.push_back(reference.points[i].pt);
    matches.to.push_back(image.points[there[i]].pt);
  }
  return matches;
}

// Root mean square distance of the agreeing matches from the map.
double Residual(const Matches& matches, const cv::Mat& map, const cv::Mat& agreeing) {
  std::vector<cv::Point2f> placed;
  cv::transform(matches.from, placed, map);
  double squares = 0;
  for (std::size_t i = 0; i < placed.size(); ++i) {
    const cv::Point2f off = placed[i] - matches.to[i];
    if (agreeing.at<unsigned char>(static_cast<int>(i)) != 0) squares += off.dot(off);
  }
  return std::sqrt(squares / cv::countNonZero(agreeing));
}

}  // namespace

double MapDistance(const cv::Mat& a, const cv::Mat& b, cv::Size reference) {
  const cv::Mat difference = a - b;
  double sum = 0;
  for (int i = 0; i < kGrid; ++i) {
    for (int k = 0; k < kGrid; ++k) {
      const double x = i * (reference.width - 1.0) / (kGrid - 1);
      const double y = k * (reference.height - 1.0) / (kGrid - 1);
      sum += cv::norm(difference * (cv::Mat_<double>(3, 1) << x, y, 1));
    }
  }
  return sum / (kGrid * kGrid);
}

RobustMap FindRobustMap(QVTester& tester, const cv::Mat& reference, const cv::Mat& image) {
  RobustMap result;
  result.correlation = std::numeric_limits<double>::quiet_NaN();
  const cv::Mat from = GreyOf(reference);
  const cv::Mat to = GreyOf(image);
  const double pixels = static_cast<double>(std::max(from.total(), to.total()));
  const double scale = std::min(1.0, std::sqrt(kMostMatchedPixels / pixels));
  const Matches matches = Match(FindFeatures(from, scale), FindFeatures(to, scale));
  result.matches = static_cast<int>(matches.from.size());
  if (result.matches < kFewestAgreeing) {
    result.doubt = Format("only %d features match, and %d are needed", result.matches, kFewestAgreeing);
    return result;
  }
  cv::Mat agreeing;
  const cv::RNG callers = cv::theRNG();
  cv::Mat map = cv::estimateAffine2D(matches.from, matches.to, agreeing, cv::RANSAC, kAgreeing / scale, 5000, 0.999);
  cv::theRNG() = callers;
  result.agreeing = cv::countNonZero(agreeing);
  if (map.empty() || result.agreeing < kFewestAgreeing) {
    result.doubt = Format("only %d of %d matches agree with one map", result.agreeing, result.matches);
    return result;
  }
  result.residual_px = Residual(matches, map, agreeing);

  cv::Mat refined = map.clone();
  result.correlation = tester.RefineUnwarp(from, to, refined);
  const double moved = MapDistance(map, refined, from.size());
  if (std::isnan(result.correlation)) {
    result.doubt = "the refinement did not converge";
  } else if (moved > kFurthest / scale) {
    result.doubt = Format("the refinement moved the map by %.1f px", moved);
  } else {
    map = refined;
    if (result.correlation < kLowest) result.doubt = Format("the pictures correlate by %.2f only", result.correlation);
  }
  result.matrix = map;
  return result;
}

}  // namespace qv
