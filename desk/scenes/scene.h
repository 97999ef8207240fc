#ifndef QVTESTER_DESK_SCENES_SCENE_H_
#define QVTESTER_DESK_SCENES_SCENE_H_

#include <cairo.h>

#include <functional>
#include <opencv2/core.hpp>
#include <vector>

namespace qv {

// What stands before the camera, as filled polygons: drawn on paper and photographed from one description.

struct FilledShape {
  std::vector<cv::Point2d> outline;
  cv::Vec3d colour;  // red, green, blue as stored levels, 0 to 255
};

/// A grey of this stored level.
inline cv::Vec3d Grey(double level) { return {level, level, level}; }

/// A square of twice this side, upright.
FilledShape Square(cv::Point2d centre, double half, const cv::Vec3d& colour);

struct Scene {
  std::vector<FilledShape> shapes;  // later ones cover earlier ones
  cv::Vec3d paper = {255, 255, 255};
};

/// Light of a stored level and the level of light, both 0 to 255: sRGB's transfer function.
double LightOf(double level);
double LevelOf(double light);

/// The scene with light in place of stored levels.
Scene InLight(const Scene& scene);

/// Fills the shapes, each corner mapped by a projective transform to the target's coordinates.
void Fill(cairo_t* cr, const Scene& scene, const cv::Matx33d& to_target);

/// The same by any map; edges are bent between points that lie at most `step` apart on the target.
void Fill(cairo_t* cr, const Scene& scene, const std::function<cv::Point2d(cv::Point2d)>& to_target, double step);

cv::Point2d Map(const cv::Matx33d& transform, cv::Point2d point);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_SCENE_H_
