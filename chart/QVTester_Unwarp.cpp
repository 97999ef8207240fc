// Registration of a picture onto a reference: SURF features, a FLANN matcher, and the affine map that the three best
// matches fix exactly. There is no outlier rejection beyond the distance limit: where one of the three is false, or
// they lie nearly in one line, the map is wrong.

#include <algorithm>
#include <array>
#include <opencv2/flann.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/registration.h"
#include "chart/surf.h"
#include "qvtester/tester.h"

namespace {

constexpr std::size_t kPointsOfAffine = 3;

// One best match a reference key point. FLANN's trees are random: the same seed makes each search repeatable, and the
// caller's own random numbers go on as if nothing had been drawn.
std::vector<cv::DMatch> MatchFeatures(const cv::Mat& query, const cv::Mat& train) {
  if (query.empty() || train.empty()) return {};
  const cv::RNG callers = cv::theRNG();
  cvflann::seed_random(1);
  cv::FlannBasedMatcher matcher(cv::makePtr<cv::flann::KDTreeIndexParams>(4),
                                cv::makePtr<cv::flann::SearchParams>(32, 0.0f, true));
  std::vector<cv::DMatch> matches;
  matcher.match(query, train, matches);
  cv::theRNG() = callers;
  return matches;
}

std::vector<cv::DMatch> GoodMatches(const std::vector<cv::DMatch>& matches) {
  double minDist = 50.0;
  for (const cv::DMatch& match : matches) minDist = std::min<double>(minDist, match.distance);
  // A perfect match would otherwise reject everything else.
  const double limit = minDist == 0 ? 0.05 : 5.0 * minDist;
  std::vector<cv::DMatch> good;
  std::copy_if(matches.begin(), matches.end(), std::back_inserter(good),
               [limit](const cv::DMatch& match) { return match.distance < limit; });
  return good;
}

}  // namespace

FeatureImage FindFeatures(const cv::Mat& image) {
  if (image.depth() != CV_8U) CV_Error(cv::Error::StsUnsupportedFormat, "registration needs 8 bits a channel");
  FeatureImage features;
  features.image = image;
  cv::Mat gray = image;
  if (image.channels() != 1) cv::cvtColor(image, gray, cv::COLOR_RGB2GRAY);
  DetectAndDescribe(gray, features.keypoints, features.descriptors);
  return features;
}

Registration Register(const FeatureImage& reference, const FeatureImage& image) {
  Registration result;
  result.good = GoodMatches(MatchFeatures(reference.descriptors, image.descriptors));
  if (result.good.size() < kPointsOfAffine) return result;

  std::vector<cv::DMatch> best = result.good;
  std::stable_sort(best.begin(), best.end(),
                   [](const cv::DMatch& a, const cv::DMatch& b) { return a.distance < b.distance; });
  std::array<cv::Point2f, kPointsOfAffine> from;
  std::array<cv::Point2f, kPointsOfAffine> to;
  for (std::size_t i = 0; i < kPointsOfAffine; ++i) {
    from[i] = reference.keypoints[best[i].queryIdx].pt;
    to[i] = image.keypoints[best[i].trainIdx].pt;
  }
  result.matrix = cv::getAffineTransform(from.data(), to.data());
  cv::warpAffine(image.image, result.unwarped, result.matrix, reference.image.size(),
                 cv::INTER_LINEAR | cv::WARP_INVERSE_MAP, cv::BORDER_REPLICATE, cv::Scalar(0));
  return result;
}

int QVTester::GetUnwarpedImage(cv::Mat reference, cv::Mat image, cv::Mat& unwarped) {
  const FeatureImage from = FindFeatures(reference);
  const FeatureImage to = FindFeatures(image);
  const Registration result = Register(from, to);
  if (result.matrix.empty()) return QV_ERROR_NO_REGISTRATION;
  kept_->unwarp = {from.image.clone(), to.image.clone(), from.keypoints, to.keypoints,
                   result.good,        result.matrix,    cv::Mat()};
  result.unwarped.copyTo(unwarped);
  return QV_SUCCESS;
}

const cv::Mat& QVTester::DrawUnwarpMatches() {
  Unwarp& last = kept_->unwarp;
  if (last.drawing.empty() && !last.reference.empty()) {
    cv::drawMatches(last.reference, last.reference_keypoints, last.image, last.image_keypoints, last.good, last.drawing,
                    cv::Scalar::all(-1), cv::Scalar::all(-1), std::vector<char>(),
                    cv::DrawMatchesFlags::NOT_DRAW_SINGLE_POINTS);
  }
  return last.drawing;
}
