#include "unit_tests/drawing.h"

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"

namespace {

constexpr int kSubpixels = 4;

// Chart units to pixel corners: (0, 0) is the top left corner of the first pixel.
cv::Point2d Place(const ChartView& view, double x, double y) {
  const double angle = view.turn_deg * CV_PI / 180;
  const double u = (x - kChartSide / 2.0) * view.scale;
  const double v = (y - kChartSide / 2.0) * view.scale;
  return {view.size.width / 2.0 + u * std::cos(angle) + v * std::sin(angle),
          view.size.height / 2.0 - u * std::sin(angle) + v * std::cos(angle)};
}

void FillPolygon(cv::Mat& canvas, const ChartView& view, const std::vector<cv::Point2d>& corners, int level) {
  constexpr int kShift = 8;
  std::vector<cv::Point> scaled;
  for (const cv::Point2d& corner : corners) {
    const cv::Point2d p = Place(view, corner.x, corner.y) * kSubpixels;
    scaled.emplace_back(cvRound((p.x - 0.5) * (1 << kShift)), cvRound((p.y - 0.5) * (1 << kShift)));
  }
  cv::fillConvexPoly(canvas, scaled, cv::Scalar::all(level), cv::LINE_8, kShift);
}

// Integral of the integral of a Gaussian's distribution function: a ramp from t = 0 with a soft start.
double BlurredRamp(double t, double sigma) {
  const double z = t / sigma;
  const double below = 0.5 * std::erfc(-z / std::sqrt(2.0));
  const double density = std::exp(-z * z / 2) / std::sqrt(2 * CV_PI);
  return ((t * t + sigma * sigma) * below + t * sigma * density) / 2;
}

}  // namespace

void DrawMark(cv::Mat& image, int row, int column, int module, int dark, int light) {
  for (const auto& [inset, level] : {std::pair{0, dark}, {1, light}, {2, dark}}) {
    const int side = (7 - 2 * inset) * module;
    image(cv::Rect(column + inset * module, row + inset * module, side, side)).setTo(level);
  }
}

cv::Mat DrawMarks(cv::Size size, int module, const std::vector<cv::Point>& corners) {
  cv::Mat image(size, CV_8UC1, cv::Scalar(255));
  for (const cv::Point& corner : corners) DrawMark(image, corner.x, corner.y, module);
  return image;
}

cv::Mat DrawChart(const ChartView& view) {
  cv::Mat canvas(view.size * kSubpixels, CV_8UC1, cv::Scalar(220));
  const auto target = EdgeTarget();
  FillPolygon(canvas, view, {target.begin(), target.end()}, 50);

  for (int i = 0; i < view.marks; ++i) {
    const auto& [x, y] = kMarkCentres[view.marks == 2 ? 2 * i : i];
    for (const auto& [modules, level] : {std::pair{3.5, 10}, {2.5, 220}, {1.5, 10}}) {
      const double h = modules * kMarkSizes.back().module;
      FillPolygon(canvas, view, {{x - h, y - h}, {x + h, y - h}, {x + h, y + h}, {x - h, y + h}}, level);
    }
  }

  cv::Mat photo;
  cv::resize(canvas, photo, view.size, 0, 0, cv::INTER_AREA);
  if (view.blur_px > 0) cv::GaussianBlur(photo, photo, cv::Size(), view.blur_px);
  cv::cvtColor(photo, photo, cv::COLOR_GRAY2BGR);
  return photo;
}

std::vector<cv::Point2d> MarkCentres(const ChartView& view) {
  const cv::Point2d half(0.5, 0.5);
  return {Place(view, 0, 0) - half, Place(view, kChartSide, 0) - half, Place(view, 0, kChartSide) - half};
}

double EdgeRise(double distance, double sigma_px, double normal_deg) {
  if (std::fabs(distance) >= 8 * sigma_px + 1) return distance > 0 ? 1 : 0;
  // Along the normal the pixel's square is two boxes, one after the other; none is let shrink to nothing.
  const double angle = normal_deg * CV_PI / 180;
  const double a = std::max(std::fabs(std::cos(angle)), 1e-3);
  const double b = std::max(std::fabs(std::sin(angle)), 1e-3);
  const auto ramp = [&](double t) { return BlurredRamp(distance + t, sigma_px); };
  return (ramp((a + b) / 2) - ramp((a - b) / 2) - ramp((b - a) / 2) + ramp(-(a + b) / 2)) / (a * b);
}

cv::Mat DrawEdgePhoto(const EdgePhoto& view) {
  const double angle = view.normal_deg * CV_PI / 180;
  const cv::Point2d normal(std::cos(angle), std::sin(angle));
  const double fall_angle = view.fall_towards_deg * CV_PI / 180;
  const cv::Point2d fall(std::cos(fall_angle) / view.size.width, std::sin(fall_angle) / view.size.height);
  const cv::Point2d middle(view.size.width / 2.0, view.size.height / 2.0);
  cv::Mat photo(view.size, CV_32F);
  for (int row = 0; row < photo.rows; ++row) {
    for (int column = 0; column < photo.cols; ++column) {
      const cv::Point2d place(column, row);
      const double along = (place - view.through).dot({-normal.y, normal.x}) * 2 / view.size.height;
      const double distance = (place - view.through).dot(normal) + view.bow_px * along * along;
      const double lit = 1 - view.fall * (place - middle).dot(fall);
      const double share = EdgeRise(distance, view.sigma_px, view.normal_deg);
      photo.at<float>(row, column) = static_cast<float>(lit * (view.dark + (view.light - view.dark) * share));
    }
  }
  return photo;
}

cv::Mat EncodeSrgb(const cv::Mat& light) {
  cv::Mat stored(light.size(), CV_32F);
  for (int row = 0; row < light.rows; ++row) {
    for (int column = 0; column < light.cols; ++column) {
      const double share = light.at<float>(row, column) / 255.0;
      const double level = share <= 0.0031308 ? 12.92 * share : 1.055 * std::pow(share, 1 / 2.4) - 0.055;
      stored.at<float>(row, column) = static_cast<float>(255 * level);
    }
  }
  return stored;
}

cv::Mat DrawEdge(const EdgeView& view) {
  const cv::Point2d through((view.cols - 1) / 2.0 + view.place, (view.rows - 1) / 2.0);
  EdgePhoto photo = {{view.cols, view.rows}, through,   -std::atan(view.slope) * 180 / CV_PI,
                     view.sigma_px,          view.dark, view.light};
  if (!view.dark_left) std::swap(photo.dark, photo.light);
  return DrawEdgePhoto(photo);
}

cv::Mat DrawScene(unsigned seed, cv::Size size, int polygons, double blur_px) {
  cv::RNG random(seed);
  cv::Mat scene(size, CV_8UC1, cv::Scalar(128));
  for (int i = 0; i < polygons; ++i) {
    const cv::Point at{random.uniform(0, scene.cols), random.uniform(0, scene.rows)};
    std::vector<cv::Point> corners;
    for (int k = 0; k < 5; ++k) corners.push_back(at + cv::Point{random.uniform(-40, 40), random.uniform(-40, 40)});
    cv::fillConvexPoly(scene, corners, cv::Scalar(random.uniform(0, 256)), cv::LINE_AA);
  }
  if (blur_px > 0) cv::GaussianBlur(scene, scene, {}, blur_px);
  return scene;
}

std::array<cv::Point2d, 4> TurnedRectangle(cv::Point2d middle, double length, double width, double turn_deg) {
  const double angle = turn_deg * CV_PI / 180;
  const cv::Point2d across = cv::Point2d(std::cos(angle), std::sin(angle)) * (width / 2);
  const cv::Point2d along = cv::Point2d(-std::sin(angle), std::cos(angle)) * (length / 2);
  return {middle - across - along, middle + across - along, middle + across + along, middle - across + along};
}

TemporaryFolder::TemporaryFolder() {
  std::string pattern = (std::filesystem::temp_directory_path() / "qvtester-test-XXXXXX").string();
  path_ = mkdtemp(pattern.data());
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code ignored;
  std::filesystem::remove_all(path_, ignored);
}

std::string TemporaryFolder::Write(const std::string& name, const std::string& content) const {
  std::ofstream(Path(name), std::ios::binary) << content;
  return Path(name);
}

std::string TemporaryFolder::Write(const std::string& name, const cv::Mat& image) const {
  cv::imwrite(Path(name), image);
  return Path(name);
}

std::string ReadFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}
