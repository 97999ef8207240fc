#include "desk/simulation/simulation.h"

#include <opencv2/imgproc.hpp>
#include <vector>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/simulation/development.h"
#include "desk/simulation/truth.h"

namespace qv {

namespace {

// Draws the dots into what the panel's light is multiplied by, and answers their truth. The first four lie in the
// corners, the next four at the middle of the edges, the rest anywhere; by turns bright and dark.
Json DrawDots(const SimulationOptions& options, cv::Mat& factors) {
  const int right = factors.cols - options.dot_px;
  const int bottom = factors.rows - options.dot_px;
  const int apart = options.dot_px + 8;
  if (right < 0 || bottom < 0) throw Failure(kWrongUsage, "--dot-size: larger than the photo");
  cv::Mat taken = cv::Mat::zeros(factors.size(), CV_8U);  // where another dot would come too near
  cv::RNG random(options.camera.seed + 12345);
  Json dots = Json::array();
  const std::vector<cv::Point> first = {{0, 0},         {right, 0},          {0, bottom},         {right, bottom},
                                        {right / 2, 0}, {right, bottom / 2}, {right / 2, bottom}, {0, bottom / 2}};
  for (int tries = 0; static_cast<int>(dots.size()) < options.dots && tries < 1000 * options.dots; ++tries) {
    cv::Point at;
    if (tries < static_cast<int>(first.size())) {
      at = first[tries];
    } else {
      at.x = random.uniform(0, right + 1);
      at.y = random.uniform(0, bottom + 1);
    }
    if (taken.at<uchar>(at) != 0) continue;
    const cv::Rect near(at - cv::Point(apart, apart), cv::Size(2 * apart + 1, 2 * apart + 1));
    taken(near & cv::Rect({}, taken.size())) = 1;
    const double contrast = dots.size() % 2 == 0 ? options.dot_contrast : -options.dot_contrast;
    factors(cv::Rect(at, cv::Size(options.dot_px, options.dot_px))).setTo(cv::Scalar::all(1 + contrast));
    dots.push_back({{"column", at.x}, {"row", at.y}, {"side_px", options.dot_px}, {"contrast", contrast}});
  }
  if (static_cast<int>(dots.size()) < options.dots) {
    throw Failure(kWrongUsage, Format("--dots %d: only %zu have room in the photo", options.dots, dots.size()));
  }
  return dots;
}

}  // namespace

Simulation HdrCapture(const SimulationOptions& options) {
  const CameraModel& camera = options.camera;
  if (Develops(camera)) throw Failure(kWrongUsage, "--scene hdr: floats are light, and are not developed");
  cv::Mat factors(camera.size, CV_32FC3, cv::Scalar::all(1));
  Simulation s;
  s.truth["dots"] = DrawDots(options, factors);
  if (camera.blur_px > 0) {
    cv::GaussianBlur(factors, factors, {}, camera.blur_px, camera.blur_px, cv::BORDER_REPLICATE);
  }
  CameraModel panel = camera;
  panel.blur_px = panel.defocus_px = 0;  // an even panel
  cv::Mat levels = Expose(panel, Scene(), cv::Matx33d::eye()).mul(factors);
  cv::RNG noise(camera.seed);
  AddNoise(camera, levels, noise);
  s.levels = {levels / 255};
  s.is_hdr = true;
  return s;
}

}  // namespace qv
