#include "desk/scenes/scene.h"

namespace qv {

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
    cairo_close_path(cr);
    cairo_set_source_rgb(cr, shape.colour[0] / 255, shape.colour[1] / 255, shape.colour[2] / 255);
    cairo_fill(cr);
  }
}

}  // namespace qv
