#include "desk/simulation/camera.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <memory>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "desk/drawing/cairo_check.h"
#include "desk/simulation/development.h"
#include "desk/simulation/method_law.h"

namespace qv {

namespace {

constexpr int kTileRows = 128;          // of the photo, drawn and blurred at a time
constexpr int kTileColumns = 1024;      // a drawing is at most 32767 wide
constexpr double kSigmas = 5;           // sigmas to which a Gaussian is carried
constexpr double kSmallestSigma = 1.2;  // in subpixels: a sampled Gaussian narrower than this is not the continuous one
constexpr double kStep = 8;             // pixels between the points of a bent edge
constexpr double kDistance = 2.5;       // of the camera from the scene's plane, in sides of the scene

// Subpixels a side, so that every blur is well sampled and the drawing's own smoothing does not show.
int Subpixels(const CameraModel& camera) {
  if (camera.defocus_px > 0 || cv::norm(camera.smear_px) > 0) return 4;
  if (camera.blur_px <= 0) return 4;
  return std::clamp(static_cast<int>(std::ceil(kSmallestSigma / camera.blur_px)), 2, 8);
}

// Maps the scene to a tile; null where a matrix does.
using Bending = std::function<cv::Point2d(cv::Point2d)>;

struct Tile {
  cv::Matx33d from_scene;
  Bending bent;
  double step;  // of bent edges
  cv::Size size;
};

// The scene at the tile's subpixels, CV_32FC3 in BGR, whole levels where no shapes meet; each value a mean over its
// subpixel.
cv::Mat DrawWhole(const Scene& scene, const Tile& tile) {
  const std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> surface(
      cairo_image_surface_create(CAIRO_FORMAT_RGB24, tile.size.width, tile.size.height), cairo_surface_destroy);
  const std::unique_ptr<cairo_t, void (*)(cairo_t*)> cr(cairo_create(surface.get()), cairo_destroy);
  cairo_set_antialias(cr.get(), CAIRO_ANTIALIAS_BEST);
  cairo_set_source_rgb(cr.get(), scene.paper[0] / 255, scene.paper[1] / 255, scene.paper[2] / 255);
  cairo_paint(cr.get());
  if (tile.bent) {
    Fill(cr.get(), scene, tile.bent, tile.step);
  } else {
    Fill(cr.get(), scene, tile.from_scene);
  }
  CheckDrawn(cr.get(), "the scene");
  cairo_surface_flush(surface.get());

  const cv::Mat drawn(tile.size, CV_8UC4, cairo_image_surface_get_data(surface.get()),
                      static_cast<std::size_t>(cairo_image_surface_get_stride(surface.get())));
  cv::Mat levels;
  cv::cvtColor(drawn, levels, cv::COLOR_BGRA2BGR);
  levels.convertTo(levels, CV_32F);
  return levels;
}

// Whole levels are too coarse for light: its darkest tenth holds a third of the stored levels. What is left of each
// colour beyond its whole level is drawn too, 255 times as strong.
cv::Mat DrawInLight(const Scene& scene, const Tile& tile) {
  Scene whole = InLight(scene);
  Scene rest = whole;
  const auto split = [](cv::Vec3d& colour, cv::Vec3d& left) {
    for (int i = 0; i < 3; ++i) {
      left[i] = 255 * (colour[i] - std::floor(colour[i]));
      colour[i] = std::floor(colour[i]);
    }
  };
  split(whole.paper, rest.paper);
  for (std::size_t i = 0; i < whole.shapes.size(); ++i) split(whole.shapes[i].colour, rest.shapes[i].colour);
  return DrawWhole(whole, tile) + DrawWhole(rest, tile) / 255;
}

constexpr int kKernelSamples = 8;  // a subpixel

// Weight of a point at a distance of x cells: Keys' cubic convolution, which keeps mean and variance of what it
// samples.
double CellWeight(double x) {
  x = std::fabs(x);
  if (x < 1) return (1.5 * x - 2.5) * x * x + 1;
  return x < 2 ? ((2.5 - 0.5 * x) * x - 4) * x + 2 : 0;
}

// The points shared out among the cells about them, summed to 1.
cv::Mat PointsKernel(const std::vector<cv::Point2d>& points, double reach) {
  const int half = static_cast<int>(std::ceil(reach)) + 2;
  cv::Mat kernel(2 * half + 1, 2 * half + 1, CV_32F, cv::Scalar(0));
  for (const cv::Point2d& p : points) {
    const int row = half + cvFloor(p.y) - 1;
    const int column = half + cvFloor(p.x) - 1;
    for (int i = row; i < row + 4; ++i) {
      for (int j = column; j < column + 4; ++j) {
        kernel.at<float>(i, j) += static_cast<float>(CellWeight(i - half - p.y) * CellWeight(j - half - p.x));
      }
    }
  }
  return kernel / static_cast<double>(points.size());
}

cv::Mat DiscKernel(double radius) {
  std::vector<cv::Point2d> points;
  const int half = static_cast<int>(std::ceil(radius * kKernelSamples));
  for (int i = -half; i < half; ++i) {
    for (int j = -half; j < half; ++j) {
      const cv::Point2d p = cv::Point2d(j + 0.5, i + 0.5) / kKernelSamples;
      if (cv::norm(p) <= radius) points.push_back(p);
    }
  }
  if (points.empty()) points.emplace_back(0, 0);
  return PointsKernel(points, radius);
}

// A straight path through the middle.
cv::Mat PathKernel(cv::Point2d path) {
  const double length = cv::norm(path);
  const int count = static_cast<int>(std::ceil(length * kKernelSamples));
  std::vector<cv::Point2d> points;
  for (int i = 0; i < count; ++i) points.push_back(path * ((i + 0.5) / count - 0.5));
  return PointsKernel(points, length / 2);
}

void Blur(cv::Mat& tile, const CameraModel& camera, int subpixels) {
  if (const double sigma = camera.blur_px * subpixels; sigma > 0) {
    const cv::Mat kernel = cv::getGaussianKernel(2 * static_cast<int>(std::ceil(kSigmas * sigma)) + 1, sigma, CV_32F);
    cv::sepFilter2D(tile, tile, CV_32F, kernel, kernel, {-1, -1}, 0, cv::BORDER_REPLICATE);
  }
  const auto filter = [&](const cv::Mat& kernel) {
    cv::filter2D(tile, tile, CV_32F, kernel, {-1, -1}, 0, cv::BORDER_REPLICATE);
  };
  if (camera.defocus_px > 0) filter(DiscKernel(camera.defocus_px * subpixels));
  if (cv::norm(camera.smear_px) > 0) filter(PathKernel(camera.smear_px * subpixels));
}

// The light and the sensor's gains on a part of the photo.
void Shade(const CameraModel& camera, cv::Mat part, cv::Point at) {
  const cv::Point2d middle((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  const cv::Vec3d gains = camera.Gains();
  const cv::Vec3f bgr(static_cast<float>(gains[2]), static_cast<float>(gains[1]), static_cast<float>(gains[0]));
  const double angle = camera.falloff_direction_deg * CV_PI / 180;
  const cv::Point2d line(std::cos(angle), std::sin(angle));
  const double end = std::fabs(line.x) * middle.x + std::fabs(line.y) * middle.y;
  for (int i = 0; i < part.rows; ++i) {
    auto* pixel = part.ptr<cv::Vec3f>(i);
    for (int j = 0; j < part.cols; ++j) {
      const cv::Point2d off = cv::Point2d(at.x + j, at.y + i) - middle;
      double shade = 1 - camera.shading_percent / 100 * off.dot(off) / middle.dot(middle);
      if (camera.falloff_percent > 0) shade *= 1 - camera.falloff_percent / 100 * (off.dot(line) / end + 1) / 2;
      pixel[j] = pixel[j].mul(bgr) * static_cast<float>(shade);
    }
  }
}

}  // namespace

cv::Vec3d CameraModel::Gains() const { return cast * (gain * std::exp2(exposure_ev)); }

cv::Matx33d PhotoFromScene(const CameraModel& camera, const cv::Rect2d& bounds) {
  // The plane is turned, panned and tilted about the middle of the bounds and seen from straight ahead.
  const double side = std::max(bounds.width, bounds.height);
  const double turn = camera.turn_deg * CV_PI / 180;
  const double pan = camera.pan_deg * CV_PI / 180;
  const double tilt = camera.tilt_deg * CV_PI / 180;
  const cv::Point2d from = (bounds.tl() + bounds.br()) / 2;
  const cv::Matx33d centre(1, 0, -from.x, 0, 1, -from.y, 0, 0, 1);
  const cv::Matx33d turned(std::cos(turn), std::sin(turn), 0, -std::sin(turn), std::cos(turn), 0, 0, 0, 1);
  // (x, y) on the plane goes to (x cos pan, y cos tilt) at a depth of 1 + (x sin pan + y sin tilt) / distance.
  const double far = 1 / (kDistance * side);
  const cv::Matx33d seen(std::cos(pan), 0, 0, 0, std::cos(tilt), 0, std::sin(pan) * far, std::sin(tilt) * far, 1);
  const cv::Matx33d upright = seen * turned * centre;

  double left = 1e300;
  double top = 1e300;
  double right = -1e300;
  double bottom = -1e300;
  for (const cv::Point2d& corner :
       {bounds.tl(), bounds.br(), cv::Point2d(bounds.x, bounds.br().y), cv::Point2d(bounds.br().x, bounds.y)}) {
    const cv::Point2d p = Map(upright, corner);
    left = std::min(left, p.x);
    top = std::min(top, p.y);
    right = std::max(right, p.x);
    bottom = std::max(bottom, p.y);
  }
  const double scale = camera.fill * std::min(camera.size.width / (right - left), camera.size.height / (bottom - top));
  const cv::Point2d to((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  return cv::Matx33d(scale, 0, to.x - scale * (left + right) / 2, 0, scale, to.y - scale * (top + bottom) / 2, 0, 0,
                     1) *
         upright;
}

cv::Point2d OnSensor(const CameraModel& camera, cv::Point2d ideal) {
  const cv::Point2d middle((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  const cv::Point2d off = ideal - middle;
  cv::Point2d seen = middle + off * (1 + camera.distortion_percent / 100 * off.dot(off) / middle.dot(middle));
  seen.x += camera.shutter_px * (seen.y - middle.y) / (2 * middle.y);  // the middle row is read in time
  return seen;
}

cv::Mat Expose(const CameraModel& camera, const Scene& scene, const cv::Matx33d& photo_from_scene) {
  const int s = Subpixels(camera);
  // Whole pixels, so that the tile's own pixels stay on the subpixel grid.
  const int halo =
      static_cast<int>(std::ceil(kSigmas * camera.blur_px + camera.defocus_px + cv::norm(camera.smear_px) / 2)) + 2;
  cv::Mat levels(camera.size, CV_32FC3);
  const cv::Rect whole({0, 0}, camera.size);
  for (int top = 0; top < whole.height; top += kTileRows) {
    for (int left = 0; left < whole.width; left += kTileColumns) {
      const cv::Rect tile = cv::Rect(left, top, kTileColumns, kTileRows) & whole;
      const cv::Matx33d tile_from_photo(s, 0, s * (halo - left + 0.5), 0, s, s * (halo - top + 0.5), 0, 0, 1);
      Tile drawing = {tile_from_photo * photo_from_scene,
                      nullptr,
                      kStep * s,
                      {(tile.width + 2 * halo) * s, (tile.height + 2 * halo) * s}};
      if (camera.bends()) {
        drawing.bent = [&](cv::Point2d p) { return Map(tile_from_photo, OnSensor(camera, Map(photo_from_scene, p))); };
      }
      cv::Mat drawn = camera.srgb ? DrawInLight(scene, drawing) : DrawWhole(scene, drawing);
      Blur(drawn, camera, s);
      cv::Mat part = levels(tile);
      cv::resize(drawn(cv::Rect(halo * s, halo * s, tile.width * s, tile.height * s)), part, part.size(), 0, 0,
                 cv::INTER_AREA);
      Shade(camera, part, {left, top});
    }
  }
  return levels;
}

void AddNoise(const CameraModel& camera, cv::Mat& levels, cv::RNG& random) {
  cv::Mat noise(levels.size(), CV_32FC3);
  if (camera.full_well > 0) {
    // Photon counts scatter by their root; at thousands of electrons a Gaussian stands in for Poisson.
    random.fill(noise, cv::RNG::NORMAL, 0, 1);
    cv::Mat spread;
    cv::sqrt(cv::max(levels, 0) * (255 / camera.full_well), spread);
    levels += noise.mul(spread);
  }
  if (camera.noise_percent > 0) {
    random.fill(noise, cv::RNG::NORMAL, 0, camera.noise_percent / 100 * 255);
    levels += noise;
  }
}

cv::Mat Sense(const CameraModel& camera, const cv::Mat& levels, int bits) {
  cv::RNG random(camera.seed);
  cv::Mat photo(levels.size(), bits == 16 ? CV_16UC3 : CV_8UC3);
  if (Develops(camera)) {
    cv::Mat noisy = levels.clone();
    for (int first = 0; first < levels.rows; first += kTileRows) {
      cv::Mat band = noisy.rowRange(first, std::min(first + kTileRows, levels.rows));
      AddNoise(camera, band, random);
    }
    Develop(camera, noisy).convertTo(photo, photo.depth(), bits == 16 ? 257 : 1);
    return photo;
  }
  for (int first = 0; first < levels.rows; first += kTileRows) {
    const int last = std::min(first + kTileRows, levels.rows);
    cv::Mat band = levels.rowRange(first, last).clone();
    AddNoise(camera, band, random);
    band.convertTo(photo.rowRange(first, last), photo.depth(), bits == 16 ? 257 : 1);
  }
  return photo;
}

double LensResponse(const CameraModel& camera, double frequency, cv::Point2d direction) {
  using method_law::Sinc;
  direction /= cv::norm(direction);
  const double pi2f = 2 * CV_PI * frequency;
  double response = std::exp(-pi2f * pi2f * camera.blur_px * camera.blur_px / 2);
  if (const double x = pi2f * camera.defocus_px; x > 0) response *= std::fabs(2 * std::cyl_bessel_j(1, x) / x);
  response *= std::fabs(Sinc(frequency * camera.smear_px.dot(direction)));
  return response * std::fabs(Sinc(frequency * direction.x) * Sinc(frequency * direction.y));
}

}  // namespace qv
