#include "desk/measure/cielab.h"

#include <cmath>

namespace qv {

namespace {

constexpr double kEpsilon = 216.0 / 24389;
constexpr double kKappa = 24389.0 / 27;

double Forward(double t) { return t > kEpsilon ? std::cbrt(t) : (kKappa * t + 16) / 116; }

double Back(double f) { return f * f * f > kEpsilon ? f * f * f : (116 * f - 16) / kKappa; }

double Linear(double level) {
  const double v = level / 255;
  return v <= 0.04045 ? v / 12.92 : std::pow((v + 0.055) / 1.055, 2.4);
}

double Radians(double degrees) { return degrees * CV_PI / 180; }

double HueDegrees(double a, double b) {
  if (a == 0 && b == 0) return 0;
  const double hue = std::atan2(b, a) * 180 / CV_PI;
  return hue < 0 ? hue + 360 : hue;
}

double Pow7(double v) { return std::pow(v, 7); }

struct Polar {
  double l, chroma, hue;  // degrees
};

// With a* stretched near the grey axis, by the mean chroma of both.
Polar Stretched(const cv::Vec3d& lab, double mean_chroma) {
  const double g = 0.5 * (1 - std::sqrt(Pow7(mean_chroma) / (Pow7(mean_chroma) + Pow7(25))));
  const double a = (1 + g) * lab[1];
  return {lab[0], std::hypot(a, lab[2]), HueDegrees(a, lab[2])};
}

double MeanHue(const Polar& p, const Polar& q) {
  if (p.chroma * q.chroma == 0) return p.hue + q.hue;
  const double sum = p.hue + q.hue;
  if (std::abs(p.hue - q.hue) <= 180) return sum / 2;
  return (sum < 360 ? sum + 360 : sum - 360) / 2;
}

double HueDifference(const Polar& p, const Polar& q) {
  if (p.chroma * q.chroma == 0) return 0;
  const double difference = q.hue - p.hue;
  if (difference > 180) return difference - 360;
  return difference < -180 ? difference + 360 : difference;
}

}  // namespace

cv::Vec3d LabOfXyz(const cv::Vec3d& xyz, const cv::Vec3d& white) {
  const double fx = Forward(xyz[0] / white[0]);
  const double fy = Forward(xyz[1] / white[1]);
  const double fz = Forward(xyz[2] / white[2]);
  return {116 * fy - 16, 500 * (fx - fy), 200 * (fy - fz)};
}

cv::Vec3d XyzOfLab(const cv::Vec3d& lab, const cv::Vec3d& white) {
  const double fy = (lab[0] + 16) / 116;
  return {white[0] * Back(fy + lab[1] / 500), white[1] * Back(fy), white[2] * Back(fy - lab[2] / 200)};
}

cv::Vec3d LabD65OfSrgb(const cv::Vec3d& rgb) {
  static const cv::Matx33d kXyzOfRgb(0.4124, 0.3576, 0.1805, 0.2126, 0.7152, 0.0722, 0.0193, 0.1192, 0.9505);
  return LabOfXyz(kXyzOfRgb * cv::Vec3d(Linear(rgb[0]), Linear(rgb[1]), Linear(rgb[2])), kD65);
}

cv::Vec3d LabD65OfOwn(const cv::Vec3d& own) { return LabOfXyz(XyzOfLab(own, kUnitWhite), kD65); }

double DeltaE2000(const cv::Vec3d& lab, const cv::Vec3d& other) {
  const double mean_chroma = (std::hypot(lab[1], lab[2]) + std::hypot(other[1], other[2])) / 2;
  const Polar p = Stretched(lab, mean_chroma);
  const Polar q = Stretched(other, mean_chroma);
  const double dl = q.l - p.l;
  const double dc = q.chroma - p.chroma;
  const double dh = 2 * std::sqrt(p.chroma * q.chroma) * std::sin(Radians(HueDifference(p, q) / 2));

  const double c = (p.chroma + q.chroma) / 2;
  const double h = MeanHue(p, q);
  const double off = (p.l + q.l) / 2 - 50;
  const double t = 1 - 0.17 * std::cos(Radians(h - 30)) + 0.24 * std::cos(Radians(2 * h)) +
                   0.32 * std::cos(Radians(3 * h + 6)) - 0.20 * std::cos(Radians(4 * h - 63));
  const double sl = 1 + 0.015 * off * off / std::sqrt(20 + off * off);
  const double sc = 1 + 0.045 * c;
  const double sh = 1 + 0.015 * c * t;
  const double turn = 30 * std::exp(-std::pow((h - 275) / 25, 2));
  const double rt = -std::sin(Radians(2 * turn)) * 2 * std::sqrt(Pow7(c) / (Pow7(c) + Pow7(25)));
  const double l = dl / sl;
  const double k = dc / sc;
  const double m = dh / sh;
  return std::sqrt(l * l + k * k + m * m + rt * k * m);
}

}  // namespace qv
