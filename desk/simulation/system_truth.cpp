// The figure of a whole system: an edge at a known place is exposed and developed without noise, and its spread taken
// by the known distance of each pixel, with no fit. Shape, sharpening and denoising depend on contrast and level, so
// the edge has the chart's.

#include <cmath>
#include <vector>

#include "desk/simulation/development.h"
#include "desk/simulation/method_law.h"
#include "desk/simulation/truth.h"

namespace qv {

namespace {

constexpr int kSide = 400;        // pixels of the photo of the edge
constexpr int kBorder = 16;       // whose border stages see too little of
constexpr int kBinsPerPixel = 8;  // of the edge spread
constexpr double kReach = 32;     // pixels to each side of the edge

// Mean level by distance from the edge, bins of an eighth of a pixel.
std::vector<double> EdgeSpread(const cv::Mat& gray, cv::Point2d normal) {
  const int count = static_cast<int>(2 * kReach * kBinsPerPixel) + 1;
  std::vector<double> sums(count);
  std::vector<int> pixels(count);
  const cv::Point2d middle((kSide - 1) / 2.0, (kSide - 1) / 2.0);
  for (int i = kBorder; i < kSide - kBorder; ++i) {
    for (int j = kBorder; j < kSide - kBorder; ++j) {
      const double distance = (cv::Point2d(j, i) - middle).dot(normal);
      const int bin = cvRound((distance + kReach) * kBinsPerPixel);
      if (bin < 0 || bin >= count) continue;
      sums[bin] += gray.at<float>(i, j);
      ++pixels[bin];
    }
  }
  for (int bin = 0; bin < count; ++bin) sums[bin] /= pixels[bin];
  return sums;
}

Json Figures(const cv::Mat& gray, cv::Point2d normal) {
  const std::vector<double> edge = EdgeSpread(gray, normal);
  const auto response = [&](double f) {
    double real = 0;
    double imaginary = 0;
    for (std::size_t i = 1; i < edge.size(); ++i) {
      const double angle =
          2 * CV_PI * f * (static_cast<double>(i) - static_cast<double>(edge.size()) / 2) / kBinsPerPixel;
      real += (edge[i] - edge[i - 1]) * std::cos(angle);
      imaginary += (edge[i] - edge[i - 1]) * std::sin(angle);
    }
    const double own = method_law::Sinc(f / kBinsPerPixel);  // of the bins, and of the difference
    return std::hypot(real, imaginary) / std::fabs(edge.back() - edge.front()) / (own * own);
  };
  Json sfr = Json::array();
  for (int i = 0; i <= 20; ++i) sfr.push_back({i / 20.0, response(i / 40.0)});
  const double mtf50 = 2 * method_law::HalfPoint(response, 1.0);
  return {{"mtf50_nyquist", mtf50}, {"mtf50_cycles_per_pixel", mtf50 / 2}, {"sfr", sfr}};
}

}  // namespace

Json SystemTruth(const CameraModel& camera, cv::Point2d along, double contrast) {
  CameraModel lens = camera;
  lens.size = {kSide, kSide};
  lens.shading_percent = lens.falloff_percent = lens.distortion_percent = lens.shutter_px = 0;
  along /= cv::norm(along);
  const cv::Point2d normal(along.y, -along.x);
  const cv::Point2d middle((kSide - 1) / 2.0, (kSide - 1) / 2.0);
  const cv::Point2d far = 2.0 * kSide * along;
  const cv::Point2d beside = 2.0 * kSide * normal;
  Scene scene;
  scene.shapes = {{{middle - far, middle + far, middle + far + beside, middle - far + beside}, Grey(255 / contrast)}};
  const cv::Mat stored = Stored(lens, Expose(lens, scene, cv::Matx33d::eye()));

  const Json truth = Figures(Gray(stored), normal);
  if (!camera.srgb) return {{"stored", truth}, {"light", truth}};
  cv::Mat light = stored.clone();
  light.forEach<cv::Vec3f>([](cv::Vec3f& pixel, const int* /*place*/) {
    for (int i = 0; i < 3; ++i) pixel[i] = static_cast<float>(LightOf(pixel[i]));
  });
  return {{"stored", truth}, {"light", Figures(Gray(light), normal)}};
}

}  // namespace qv
