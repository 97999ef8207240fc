// SURF (Bay, Tuytelaars, Van Gool 2006) as dlib computes it, to the bit and in a fraction of its time; the call of
// dlib's own is in unit_tests/plain/surf.h. Its descriptor rounds samples to whole pixels, so it is given the picture
// at twice its size; and it reads beyond key points near the border, so the picture is padded.

#include "chart/surf.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "chart/surf_points.h"
#include "chart/surf_sums.h"

namespace {

constexpr int kZoom = 2;
constexpr int kPadding = 192;    // of the enlarged picture, pixels
constexpr double kReach = 3.75;  // scales that a key point keeps off the picture's own border
constexpr double kWindow = 32;   // side, in scales, of all that a descriptor reads
constexpr int kDescriptor = 64;

// The enlarged, padded picture's place in the picture itself, both counted from pixel centres.
float Back(double x) { return static_cast<float>((x - kPadding + 0.5) / kZoom - 0.5); }

// As dlib rounds; of a place inside the picture, where nothing is below 0.
int Round(double x) { return static_cast<int>(x + 0.5); }  // NOLINT(bugprone-incorrect-roundings)

bool IsUsable(const SurfPoint& point, const SurfSums& sums) {
  if (point.scale < kSmallestSurfScale) return false;
  const double reach = kReach * point.scale;
  const int side = static_cast<int>(kWindow * point.scale);
  const auto is_off = [&](double x, int size) {
    const int first = Round(x) - side / 2;
    return x - kPadding >= reach && size - kPadding - 1 - x >= reach && first >= 0 && first + side <= size;
  };
  return is_off(point.center.x, sums.cols()) && is_off(point.center.y, sums.rows());
}

// Weighted gradients about a key point: 109 of them, at whole scales, within six.
class Gradients {
 public:
  Gradients(const SurfSums& sums, const SurfPoint& point) {
    static const std::array<double, kReach2> kWeights = Weights();
    const int scale = Round(point.scale);
    std::size_t n = 0;
    for (int r = -kRadius; r <= kRadius; ++r) {
      for (int c = -kRadius; c <= kRadius; ++c) {
        if (r * r + c * c >= kReach2) continue;
        const SurfSums::Haar haar =
            sums.HaarAt(Round(scale * c + point.center.x), Round(scale * r + point.center.y), 2 * scale);
        at_[n++] = {kWeights[r * r + c * c] * haar.x, kWeights[r * r + c * c] * haar.y};
      }
    }
  }

  // The angle of the longest sum over a sixth of the circle, of 45 that are tried.
  double DominantAngle() const {
    static const std::array<Slice, kSlices> kSlice = Slices();
    std::array<cv::Point2d, kSlices> sums;
    for (const cv::Point2d& gradient : at_) {
      const double angle = std::atan2(gradient.y, gradient.x);
      // It lies in seven or eight slices in a row, up to the one that begins last before it; one more to either side,
      // for rounding.
      const int last = static_cast<int>((angle + CV_PI) / kSliceStep) + 1;
      for (int k = last - 9; k <= last; ++k) {
        const int slice = (k + kSlices) % kSlices;
        if (kSlice[slice].Holds(angle)) sums[slice] += gradient;
      }
    }
    double longest = 0;
    double best = 0;
    for (const cv::Point2d& sum : sums) {
      const double length = sum.x * sum.x + sum.y * sum.y;
      if (length <= longest) continue;
      longest = length;
      best = std::atan2(sum.y, sum.x);
    }
    return best;
  }

 private:
  static constexpr int kRadius = 6;
  static constexpr int kReach2 = kRadius * kRadius;
  static constexpr int kSlices = 45;
  static constexpr double kSliceStep = (2 * CV_PI) / kSlices;

  struct Slice {
    double first, last;
    bool Holds(double angle) const {
      return (first <= angle && angle <= last) || (last > CV_PI && (angle >= first || angle <= -2 * CV_PI + last));
    }
  };

  static std::array<Slice, kSlices> Slices() {
    std::array<Slice, kSlices> slices = {};
    for (int i = 0; i < kSlices; ++i) {
      slices[i].first = kSliceStep * i - CV_PI;
      slices[i].last = slices[i].first + CV_PI / 3;
    }
    return slices;
  }

  // Gaussian of 2.5 by the square of the distance.
  static std::array<double, kReach2> Weights() {
    constexpr double kSigma = 2.5;
    const double root_2_pi = 2.5066282746310002416123552393401041626930;
    std::array<double, kReach2> weights = {};
    for (int i = 0; i < kReach2; ++i) weights[i] = 1.0 / (kSigma * root_2_pi) * std::exp(-i / (2 * kSigma * kSigma));
    return weights;
  }

  std::array<cv::Point2d, 109> at_;
};

// Sums of gradients, and of their sizes, over four by four cells of five by five samples, turned by the angle; a cell
// reaches one sample into its neighbours. 64 values, of length 1.
void Describe(const SurfSums& sums, const SurfPoint& point, double angle, float* out) {
  constexpr int kHalf = 10;
  constexpr int kSide = 2 * kHalf;
  constexpr int kCell = 5;
  const double sine = std::sin(angle);
  const double cosine = std::cos(angle);
  std::array<SurfSums::Haar, kSide * kSide> haar;
  for (int y = 0; y < kSide; ++y) {
    const double v = (y - kHalf) * point.scale;
    for (int x = 0; x < kSide; ++x) {
      const double u = (x - kHalf) * point.scale;
      haar[y * kSide + x] = sums.HaarAt(Round(cosine * u - sine * v + point.center.x),
                                        Round(sine * u + cosine * v + point.center.y), Round(point.scale));
    }
  }

  std::array<double, kDescriptor> values;
  std::size_t n = 0;
  for (int r = 0; r < kSide; r += kCell) {
    for (int c = 0; c < kSide; c += kCell) {
      std::array<double, 4> sum = {};
      for (int y = std::max(r - 1, 0); y < std::min(r + kCell + 1, kSide); ++y) {
        for (int x = std::max(c - 1, 0); x < std::min(c + kCell + 1, kSide); ++x) {
          const double weight = 1.0 / (4 + std::abs(r + 2 - y) + std::abs(c + 2 - x));
          const double gx = weight * haar[y * kSide + x].x;
          const double gy = weight * haar[y * kSide + x].y;
          const double across = cosine * gx + sine * gy;
          const double along = cosine * gy - sine * gx;
          sum[0] += across;
          sum[1] += along;
          sum[2] += std::abs(across);
          sum[3] += std::abs(along);
        }
      }
      for (const double value : sum) values[n++] = value;
    }
  }
  double squares = 0;
  for (const double value : values) squares += value * value;
  const double length = std::sqrt(squares) + 1e-7;  // for a plain place
  for (int i = 0; i < kDescriptor; ++i) out[i] = static_cast<float>(values[i] / length);
}

}  // namespace

void DetectAndDescribe(const cv::Mat& gray, std::vector<cv::KeyPoint>& keypoints, cv::Mat& descriptors) {
  keypoints.clear();
  descriptors.release();
  cv::Mat padded;
  cv::resize(gray, padded, cv::Size(), kZoom, kZoom, cv::INTER_LINEAR);
  const cv::Rect inside(kPadding, kPadding, padded.cols, padded.rows);
  cv::copyMakeBorder(padded, padded, kPadding, kPadding, kPadding, kPadding, cv::BORDER_REPLICATE);
  const SurfSums sums(padded);

  std::vector<SurfPoint> points = FindSurfPoints(sums, inside);
  points.erase(std::remove_if(points.begin(), points.end(), [&](const SurfPoint& p) { return !IsUsable(p, sums); }),
               points.end());
  if (points.empty()) return;
  descriptors.create(static_cast<int>(points.size()), kDescriptor, CV_32F);
  for (std::size_t i = 0; i < points.size(); ++i) {
    const SurfPoint& point = points[i];
    const double angle = Gradients(sums, point).DominantAngle();
    Describe(sums, point, angle, descriptors.ptr<float>(static_cast<int>(i)));
    keypoints.emplace_back(Back(point.center.x), Back(point.center.y), static_cast<float>(20 * point.scale / kZoom),
                           static_cast<float>(angle * 180 / CV_PI), static_cast<float>(point.score));
  }
}
