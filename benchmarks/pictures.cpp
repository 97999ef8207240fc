#include "benchmarks/pictures.h"

#include <cmath>
#include <map>

#include "desk/scenes/charts.h"
#include "desk/simulation/camera.h"
#include "unit_tests/drawing.h"

const cv::Mat& ChartPhoto(double turn_deg) {
  static std::map<double, cv::Mat> photos;
  cv::Mat& photo = photos[turn_deg];
  if (photo.empty()) {
    qv::CameraModel camera;  // 12 megapixels
    camera.turn_deg = turn_deg;
    camera.blur_px = 1;
    camera.noise_percent = 1;
    photo =
        qv::Sense(camera, qv::Expose(camera, qv::SfrChart({}), qv::PhotoFromScene(camera, qv::SfrChartBounds())), 8);
  }
  return photo;
}

cv::Mat EdgeRegion(int cols, int rows) {
  EdgeView view;
  view.rows = rows;
  view.cols = cols;
  view.slope = std::tan(5 * CV_PI / 180);
  cv::Mat region = DrawEdge(view);
  cv::Mat noise(region.size(), CV_32F);
  cv::RNG(1).fill(noise, cv::RNG::NORMAL, 0, 2);
  region += noise;
  region.convertTo(region, CV_8U);
  region.convertTo(region, CV_32F);
  return region;
}
