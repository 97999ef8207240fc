#ifndef QVTESTER_TOOLS_SCENE_H_
#define QVTESTER_TOOLS_SCENE_H_

#include <cairo.h>

#include <cstdint>
#include <opencv2/core.hpp>
#include <vector>

// What stands before the camera, as filled polygons: drawn on paper and photographed from one description.

struct FilledShape {
  std::vector<cv::Point2d> outline;
  cv::Vec3d colour;  // red, green, blue as stored levels, 0 to 255
};

struct Scene {
  std::vector<FilledShape> shapes;  // later ones cover earlier ones
  cv::Vec3d paper = {255, 255, 255};
};

struct SfrChartStyle {
  double edge_angle_deg = 5;
  int module = 25;      // of the finder marks, chart units
  double contrast = 5;  // stored level of the paper over that of the dark side of the edges
};

/// The sharpness chart, in chart units (chart/chart_layout.h).
Scene SfrChart(const SfrChartStyle& style);

/// What of the sharpness chart must be in view, in chart units.
cv::Rect2d SfrChartBounds();

/// The three marks alone, large, for aiming a preview at; in chart units, with bounds as the sharpness chart's.
Scene AimingTarget();

struct DustSpeck {
  cv::Point2d centre;  // column, row
  double diameter_px;
};

/// A plain target with specks on the lens, in photo pixels; `darkness` is how much darker than the target they are, 0
/// to 1.
Scene DustyTarget(const std::vector<DustSpeck>& specks, double darkness);

/// A textured scene with few repeats, for registration: overlapping polygons of random grey on mid grey, over a square
/// of this side. The same seed gives the same scene.
Scene TexturedScene(double side, std::uint64_t seed);

/// Fills the shapes, each corner mapped by a projective transform to the target's coordinates.
void Fill(cairo_t* cr, const Scene& scene, const cv::Matx33d& to_target);

cv::Point2d Map(const cv::Matx33d& transform, cv::Point2d point);

#endif  // QVTESTER_TOOLS_SCENE_H_
