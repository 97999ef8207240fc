#include "desk/scenes/scene.h"

#include <algorithm>
#include <cmath>

namespace qv {

namespace {

cv::Vec3d ColourInLight(const cv::Vec3d& colour) {
  return {LightOf(colour[0]), LightOf(colour[1]), LightOf(colour[2])};
}

void FillPath(cairo_t* cr, const cv::Vec3d& colour) {
  cairo_close_path(cr);
  cairo_set_source_rgb(cr, colour[0] / 255, colour[1] / 255, colour[2] / 255);
  cairo_fill(cr);
}

}  // namespace

double LightOf(double level) {
  const double v = level / 255;
  return 255 * (v <= 0.04045 ? v / 12.92 : std::pow((v + 0.055) / 1.055, 2.4));
}

double LevelOf(double light) {
  const double v = light / 255;
  return 255 * (v <= 0.0031308 ? v * 12.92 : 1.055 * std::pow(v, 1 / 2.4) - 0.055);
}

Scene InLight(const Scene& scene) {
  Scene lit = scene;
  lit.paper = ColourInLight(scene.paper);
  for (FilledShape& shape : lit.shapes) shape.colour = ColourInLight(shape.colour);
  return lit;
}

FilledShape Square(cv::Point2d centre, double half, const cv::Vec3d& colour) {
  return {{centre + cv::Point2d(-half, -half), centre + cv::Point2d(half, -half), centre + cv::Point2d(half, half),
           centre + cv::Point2d(-half, half)},
          colour};
}

cv::Point2d Map(const cv::Matx33d& transform, cv::Point2d point) {
  const cv::Vec3d p = transform * cv::Vec3d(point.x, point.y, 1);
  return {p[0] / p[2], p[1] / p[2]};
}

void Fill(cairo_t* cr, const Scene& scene, const cv::Matx33d& to_target) {
  for (const FilledShape& shape : scene.shapes) {
    for (const cv::Point2d& corner : shape.outline) {
      const cv::Point2d p = Map(to_target, corner);
      cairo_line_to(cr, p.x, p.y);
    }
    FillPath(cr, shape.colour);
  }
}

void Fill(cairo_t* cr, const Scene& scene, const std::function<cv::Point2d(cv::Point2d)>& to_target, double step) {
  constexpr double kMostParts = 4096;
  for (const FilledShape& shape : scene.shapes) {
    for (std::size_t i = 0; i < shape.outline.size(); ++i) {
      const cv::Point2d from = shape.outline[i];
      const cv::Point2d to = shape.outline[(i + 1) % shape.outline.size()];
      const int parts = cvCeil(std::clamp(cv::norm(to_target(to) - to_target(from)) / step, 1.0, kMostParts));
      for (int part = 0; part < parts; ++part) {
        const cv::Point2d p = to_target(from + (to - from) * (static_cast<double>(part) / parts));
        cairo_line_to(cr, p.x, p.y);
      }
    }
    FillPath(cr, shape.colour);
  }
}

}  // namespace qv
