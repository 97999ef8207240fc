#include <cmath>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "desk/measure/grey.h"
#include "desk/measure/residual_trust.h"

namespace qv {

namespace {

using Parameters = cv::Vec<double, 6>;  // column = a x + b y + c, row = d x + e y + f
using Covariance = cv::Matx<double, 6, 6>;

constexpr int kParts = 8;  // of the picture in each direction

// Type B: what interpolated pixels do, whatever the noise, seen on 900 pairs: to places, and at half of the picture's
// longer side to enlargements. The search leaves maps a little small. Turns are free of it.
struct Interpolated {
  double place_px, enlargement_px;
};
constexpr Interpolated kTextures = {0.0015, 0.0038};
// Prints, which are smoothed by a median before, are flat but for the rims of their strokes: enlargements are free too.
constexpr Interpolated kStrokes = {0.001, 0};

// Reference coordinates from the middle, in halves of the longer side: all six parameters are then pixels of the image.
struct Frame {
  cv::Point2d middle;
  double half;

  explicit Frame(cv::Size size)
      : middle((size.width - 1) / 2.0, (size.height - 1) / 2.0), half(std::max(size.width, size.height) / 2.0) {}

  Parameters From(const cv::Mat& map) const {
    const cv::Matx23d m(map);
    const cv::Vec2d centre = m * cv::Vec3d(middle.x, middle.y, 1);
    return {m(0, 0) * half, m(0, 1) * half, centre[0], m(1, 0) * half, m(1, 1) * half, centre[1]};
  }
  cv::Matx23d Map(const Parameters& p) const {
    const double a = p[0] / half;
    const double b = p[1] / half;
    const double d = p[3] / half;
    const double e = p[4] / half;
    return {a, b, p[2] - a * middle.x - b * middle.y, d, e, p[5] - d * middle.x - e * middle.y};
  }
};

cv::Mat Smoothed(const cv::Mat& picture) {
  cv::Mat grey;
  GreyOf(picture).convertTo(grey, CV_32F);
  cv::GaussianBlur(grey, grey, {5, 5}, 0);  // as the refinement sees it
  return grey;
}

struct Overlap {
  cv::Mat reference, image, by_column, by_row, both;  // the image and its slopes in the reference's frame
};

Overlap LookThrough(const cv::Mat& reference, const cv::Mat& image, const cv::Mat& map) {
  Overlap seen;
  seen.reference = Smoothed(reference);
  const cv::Mat whole = Smoothed(image);
  cv::Mat slope;
  const int how = cv::INTER_LINEAR | cv::WARP_INVERSE_MAP;
  cv::warpAffine(whole, seen.image, map, reference.size(), how, cv::BORDER_REPLICATE);
  const cv::Matx13f difference(-0.5f, 0, 0.5f);
  cv::filter2D(whole, slope, CV_32F, difference);
  cv::warpAffine(slope, seen.by_column, map, reference.size(), how, cv::BORDER_REPLICATE);
  cv::filter2D(whole, slope, CV_32F, difference.t());
  cv::warpAffine(slope, seen.by_row, map, reference.size(), how, cv::BORDER_REPLICATE);
  cv::Mat inside(image.size(), CV_8U, cv::Scalar(255));
  cv::rectangle(inside, {0, 0, image.cols, image.rows}, cv::Scalar(0), 2);
  cv::warpAffine(inside, seen.both, map, reference.size(), cv::INTER_NEAREST | cv::WARP_INVERSE_MAP,
                 cv::BORDER_CONSTANT, cv::Scalar(0));
  return seen;
}

// What one part of the picture says.
struct Part {
  Covariance information = Covariance::zeros();
  Parameters score;
  double count = 0, reference = 0, image = 0, reference_squares = 0, image_squares = 0, products = 0;

  Part& operator+=(const Part& other) {
    information += other.information;
    score += other.score;
    count += other.count;
    reference += other.reference;
    image += other.image;
    reference_squares += other.reference_squares;
    image_squares += other.image_squares;
    products += other.products;
    return *this;
  }
  // Sums of products and squares, each about its mean.
  double Both() const { return products - reference * image / count; }
  double OfImage() const { return image_squares - image * image / count; }
  double Correlation() const {
    return Both() / std::sqrt((reference_squares - reference * reference / count) * OfImage());
  }
};

Part& PartAt(std::vector<Part>& parts, const Overlap& seen, int row, int column) {
  return parts[row * kParts / seen.both.rows * kParts + column * kParts / seen.both.cols];
}

std::vector<Part> LevelsByParts(const Overlap& seen) {
  std::vector<Part> parts(kParts * kParts);
  for (int row = 0; row < seen.both.rows; ++row) {
    for (int i = 0; i < seen.both.cols; ++i) {
      if (seen.both.at<uchar>(row, i) == 0) continue;
      Part& part = PartAt(parts, seen, row, i);
      const double r = seen.reference.at<float>(row, i);
      const double v = seen.image.at<float>(row, i);
      ++part.count;
      part.reference += r;
      part.image += v;
      part.reference_squares += r * r;
      part.image_squares += v * v;
      part.products += r * v;
    }
  }
  return parts;
}

// Each pixel's slope by the parameters, and its residual under gain and offset of the levels.
void AddSlopes(const Overlap& seen, const Frame& frame, const Part& all, std::vector<Part>& parts) {
  const double gain = all.Both() / all.OfImage();
  const double offset = (all.reference - gain * all.image) / all.count;
  for (int row = 0; row < seen.both.rows; ++row) {
    const double y = (row - frame.middle.y) / frame.half;
    for (int i = 0; i < seen.both.cols; ++i) {
      if (seen.both.at<uchar>(row, i) == 0) continue;
      const double x = (i - frame.middle.x) / frame.half;
      const double c = gain * seen.by_column.at<float>(row, i);
      const double r = gain * seen.by_row.at<float>(row, i);
      const Parameters slope(c * x, c * y, c, r * x, r * y, r);
      const double left = seen.reference.at<float>(row, i) - offset - gain * seen.image.at<float>(row, i);
      Part& part = PartAt(parts, seen, row, i);
      part.score += slope * left;
      for (int k = 0; k < 6; ++k) {
        for (int j = 0; j < 6; ++j) part.information(k, j) += slope[k] * slope[j];
      }
    }
  }
}

struct MapTrust {
  Covariance covariance;
  Parameters step;         // what the search left to climb when it ended
  double correlation = 0;  // its standard uncertainty
  int parts = 0;           // that had their say
};

// By the parts' own scores (a sandwich, as White 1980): noise may be alike between neighbours, and differ by place.
MapTrust TrustOf(const Overlap& seen, const Frame& frame, const Interpolated& pixels) {
  std::vector<Part> parts = LevelsByParts(seen);
  Part all;
  for (const Part& part : parts) all += part;
  AddSlopes(seen, frame, all, parts);
  Covariance information = Covariance::zeros();
  Covariance scores = Covariance::zeros();
  Parameters all_scores;
  MapTrust trust;
  std::vector<double> without;
  for (const Part& part : parts) {
    if (part.count == 0) continue;
    ++trust.parts;
    information += part.information;
    scores += part.score * part.score.t();
    all_scores += part.score;
    Part rest;
    for (const Part& other : parts) {
      if (&other != &part) rest += other;
    }
    without.push_back(rest.Correlation());
  }
  const Covariance inverse = information.inv(cv::DECOMP_SVD);
  const double n = trust.parts;
  trust.step = inverse * all_scores;
  trust.covariance = inverse * scores * inverse * (n / std::max(n - 6, 1.0));
  const Parameters interpolated(pixels.enlargement_px, 0, pixels.place_px, 0, pixels.enlargement_px, pixels.place_px);
  trust.covariance += Covariance::diag(interpolated.mul(interpolated));
  trust.correlation = Spread(without) * (n - 1) / std::sqrt(n);
  return trust;
}

double Turn(const Parameters& p) { return std::atan2(p[1] - p[3], p[0] + p[4]) * 180 / CV_PI; }
double Area(const Parameters& p) { return p[0] * p[4] - p[1] * p[3]; }
double Stretch(const Parameters& p) {
  cv::Vec2d enlargements;
  cv::SVD::compute(cv::Matx22d(p[0], p[1], p[3], p[4]), enlargements, cv::SVD::NO_UV);
  return enlargements[0] / enlargements[1];
}

// Of the distance from the fixed map to what the map of all may be, drawn many times (JCGM 101): no distance is below
// 0, so that near it the law is not normal about the reading.
Uncertainty OfDistance(const Frame& frame, const cv::Mat& fixed, const Parameters& best, const Covariance& covariance,
                       const Phase& phase, cv::Size size) {
  constexpr int kDraws = 400;
  const double reading = phase.Find("map_distance")->value();
  cv::Vec<double, 6> variances;
  Covariance directions;
  cv::eigen(covariance, variances, directions);
  cv::RNG random(6);
  std::vector<double> errors;
  for (int i = 0; i < kDraws; ++i) {
    Parameters draw = best;
    for (int k = 0; k < 6; ++k) {
      draw += directions.row(k).t() * (std::sqrt(std::max(variances[k], 0.0)) * random.gaussian(1));
    }
    errors.push_back(MapDistance(fixed, cv::Mat(frame.Map(draw)), size) - reading);
  }
  return FromErrors(std::move(errors), kResidualMethod);
}

// Of each element of a map, by the best one there is.
std::vector<Uncertainty> OfElements(const MapTrust& trust, const Frame& frame, const Parameters& best,
                                    const Parameters& is) {
  std::vector<Uncertainty> elements;
  for (const int i : {0, 1, 2, 3, 4, 5}) {
    const auto element = [&](const Parameters& p) { return frame.Map(p).val[i]; };
    elements.push_back(
        FromKnownError(element(is) - element(best), Propagated<6>(element, best, trust.covariance, 0.01)));
  }
  return elements;
}

}  // namespace

void TrustRefinedMap(Phase& phase, const cv::Mat& reference, const cv::Mat& image, const cv::Mat& map) {
  if (!std::isfinite(phase.Find("correlation")->value())) return;
  const Frame frame(reference.size());
  const MapTrust trust = TrustOf(LookThrough(reference, image, map), frame, kStrokes);
  if (trust.parts <= 6) return;
  const Parameters found = frame.From(map);  // where the search ended: of strokes its last step says nothing
  phase.Find("matrix")->Trust(OfElements(trust, frame, found, found));
  phase.Find("correlation")->Trust({Combined(trust.correlation, trust.parts - 6, 0, kResidualMethod)});
}

void TrustMaps(Phase& phase, const cv::Mat& reference, const cv::Mat& image, const cv::Mat& fixed,
               const RobustMap& robust) {
  if (robust.matrix.empty() || !robust.doubt.empty()) return;
  const Frame frame(reference.size());
  const MapTrust trust = TrustOf(LookThrough(reference, image, robust.matrix), frame, kTextures);
  const double degrees = trust.parts - 6;
  if (degrees < 1) return;
  const Parameters of_all = frame.From(robust.matrix);
  const Parameters of_three = frame.From(fixed);
  const Parameters best = of_all + trust.step;
  const auto off_best = [&](const Parameters& is, const auto& f) {
    return FromKnownError(f(is) - f(best), Propagated<6>(f, best, trust.covariance, 0.01));
  };
  const auto by_best = [&](const char* figure, const auto& f) { phase.Find(figure)->Trust({off_best(of_three, f)}); };
  by_best("shift_columns", [](const Parameters& p) { return p[2]; });
  by_best("shift_rows", [](const Parameters& p) { return p[5]; });
  by_best("turn", Turn);
  by_best("scale", [&](const Parameters& p) { return std::sqrt(std::fabs(Area(p))) / frame.half; });
  by_best("stretch", Stretch);
  phase.Find("robust_matrix")->Trust(OfElements(trust, frame, best, of_all));
  phase.Find("matrix")->Trust(OfElements(trust, frame, best, of_three));
  phase.Find("map_distance")->Trust({OfDistance(frame, fixed, best, trust.covariance, phase, reference.size())});
  const double matches = 2.0 * robust.agreeing - 6;
  phase.Find("robust_residual")
      ->Trust({Combined(robust.residual_px / std::sqrt(2 * matches), matches, 0, kResidualMethod)});
  phase.Find("robust_correlation")->Trust({Combined(trust.correlation, degrees, 0, kResidualMethod)});
}

}  // namespace qv
