#ifndef QVTESTER_DESK_SIMULATION_TRUTH_H_
#define QVTESTER_DESK_SIMULATION_TRUTH_H_

#include <opencv2/core.hpp>

#include "desk/base/json.h"
#include "desk/simulation/simulation.h"

// What is true of a simulated photo, from its parameters alone.

namespace qv {

Json ToJson(cv::Point2d p);
Json ToJson(const cv::Vec3d& v);

/// The camera, as the truth's "parameters".
Json Parameters(const CameraModel& camera);

/// Place of a scene's point in the photo.
cv::Point2d Seen(const CameraModel& camera, const cv::Matx33d& photo_from_scene, cv::Point2d point);

/// Pixels a chart unit in the middle of the chart.
double PixelsPerUnit(const cv::Matx33d& photo_from_scene);

/// Module of the chart's marks in chart units; "auto" suits them to an upright photo, so that turning the chart does
/// not change it.
int ModuleOf(const SimulationOptions& options);

/// The photo without noise and rounding, CV_32FC3 (BGR).
cv::Mat Stored(const CameraModel& camera, const cv::Mat& levels);

/// Grey as the tests weigh it: the first channel of a BGR photo is taken for red.
cv::Mat Gray(const cv::Mat& levels);

/// Marks and what the tests read of their places.
Json MarkTruth(const CameraModel& camera, const cv::Matx33d& photo_from_scene, double module);

/// True figure of one edge between two points of the photo, and what the measure may read of it, in units of Nyquist;
/// where the camera develops its photos also that of the whole system, of an edge of this contrast.
Json EdgeTruth(const CameraModel& camera, cv::Point2d from, cv::Point2d to, int npix, double contrast);

/// What lens, sensor and development together make of an edge, noise apart: of its light, and of its stored levels.
Json SystemTruth(const CameraModel& camera, cv::Point2d along, double contrast);

Json PatchTruth(const CameraModel& camera, const cv::Matx33d& photo_from_scene);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_TRUTH_H_
