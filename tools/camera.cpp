#include "tools/camera.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <opencv2/imgproc.hpp>

#include "tools/program.h"

namespace {

constexpr int kBandRows = 128;          // of the photo, drawn and blurred at a time
constexpr double kReach = 5;            // sigmas to which a Gaussian is carried
constexpr double kSmallestSigma = 1.2;  // in subpixels: a sampled Gaussian narrower than this is not the continuous one

// Subpixels a side, so that the blur is well sampled and the drawing's own smoothing does not show.
int Subpixels(double blur_px) {
  if (blur_px <= 0) return 4;
  return std::clamp(static_cast<int>(std::ceil(kSmallestSigma / blur_px)), 2, 8);
}

// Rows [first, first + rows) of the scene at `subpixels` a pixel, CV_32FC3 in BGR; each value a mean over its subpixel.
cv::Mat DrawBand(const Scene& scene, const cv::Matx33d& photo_from_scene, int width, int first, int rows,
                 int subpixels) {
  const std::unique_ptr<cairo_surface_t, void (*)(cairo_surface_t*)> surface(
      cairo_image_surface_create(CAIRO_FORMAT_RGB24, width, rows), cairo_surface_destroy);
  const std::unique_ptr<cairo_t, void (*)(cairo_t*)> cr(cairo_create(surface.get()), cairo_destroy);
  if (cairo_status(cr.get()) != CAIRO_STATUS_SUCCESS) throw Failure(kInternalFault, "no memory to draw the scene");
  cairo_set_antialias(cr.get(), CAIRO_ANTIALIAS_BEST);
  cairo_set_source_rgb(cr.get(), scene.paper[0] / 255, scene.paper[1] / 255, scene.paper[2] / 255);
  cairo_paint(cr.get());
  const double s = subpixels;
  const cv::Matx33d band_from_photo(s, 0, s * 0.5, 0, s, s * 0.5 - first, 0, 0, 1);
  Fill(cr.get(), scene, band_from_photo * photo_from_scene);
  cairo_surface_flush(surface.get());

  const cv::Mat drawn(rows, width, CV_8UC4, cairo_image_surface_get_data(surface.get()),
                      static_cast<std::size_t>(cairo_image_surface_get_stride(surface.get())));
  cv::Mat levels;
  cv::cvtColor(drawn, levels, cv::COLOR_BGRA2BGR);
  levels.convertTo(levels, CV_32F);
  return levels;
}

}  // namespace

cv::Matx33d PhotoFromScene(const CameraModel& camera, const cv::Rect2d& bounds) {
  const double angle = camera.turn_deg * CV_PI / 180;
  const double wide = bounds.width * std::fabs(std::cos(angle)) + bounds.height * std::fabs(std::sin(angle));
  const double high = bounds.width * std::fabs(std::sin(angle)) + bounds.height * std::fabs(std::cos(angle));
  const double scale = camera.fill * std::min(camera.size.width / wide, camera.size.height / high);
  const double c = scale * std::cos(angle);
  const double s = scale * std::sin(angle);
  const cv::Point2d from = (bounds.tl() + bounds.br()) / 2;
  const cv::Point2d to((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  return {c, s, to.x - c * from.x - s * from.y, -s, c, to.y + s * from.x - c * from.y, 0, 0, 1};
}

cv::Mat TakePhoto(const CameraModel& camera, const Scene& scene, const cv::Rect2d& bounds) {
  const cv::Matx33d photo_from_scene = PhotoFromScene(camera, bounds);
  const int s = Subpixels(camera.blur_px);
  const double sigma = camera.blur_px * s;
  // Whole pixels, so that the band's own rows stay on the subpixel grid.
  const int halo = static_cast<int>(std::ceil(kReach * camera.blur_px));
  const cv::Point2d middle((camera.size.width - 1) / 2.0, (camera.size.height - 1) / 2.0);
  const double corner2 = middle.dot(middle);
  cv::RNG random(camera.seed);

  cv::Mat photo(camera.size, CV_8UC3);
  for (int first = 0; first < camera.size.height; first += kBandRows) {
    const int rows = std::min(kBandRows, camera.size.height - first);
    const int wide = (camera.size.width + 2 * halo) * s;
    const cv::Matx33d shifted = cv::Matx33d(1, 0, halo, 0, 1, 0, 0, 0, 1) * photo_from_scene;
    cv::Mat band = DrawBand(scene, shifted, wide, (first - halo) * s, (rows + 2 * halo) * s, s);
    if (sigma > 0) {
      const cv::Mat kernel = cv::getGaussianKernel(2 * static_cast<int>(std::ceil(kReach * sigma)) + 1, sigma, CV_32F);
      cv::sepFilter2D(band, band, CV_32F, kernel, kernel, {-1, -1}, 0, cv::BORDER_REPLICATE);
    }
    cv::resize(band(cv::Rect(halo * s, halo * s, camera.size.width * s, rows * s)), band,
               cv::Size(camera.size.width, rows), 0, 0, cv::INTER_AREA);

    for (int i = 0; i < rows; ++i) {
      auto* pixel = band.ptr<cv::Vec3f>(i);
      for (int j = 0; j < band.cols; ++j) {
        const cv::Point2d off = cv::Point2d(j, first + i) - middle;
        const double shade = 1 - camera.shading_percent / 100 * off.dot(off) / corner2;
        pixel[j] *= static_cast<float>(camera.gain * shade);
      }
    }
    if (camera.noise_percent > 0) {
      cv::Mat noise(band.size(), CV_32FC3);
      random.fill(noise, cv::RNG::NORMAL, 0, camera.noise_percent / 100 * 255);
      band += noise;
    }
    band.convertTo(photo.rowRange(first, first + rows), CV_8U);
  }
  return photo;
}
