#ifndef QVTESTER_DESK_SIMULATION_SIMULATION_H_
#define QVTESTER_DESK_SIMULATION_SIMULATION_H_

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/base/json.h"
#include "desk/scenes/charts.h"
#include "desk/scenes/display.h"
#include "desk/scenes/lights.h"
#include "desk/scenes/print.h"
#include "desk/simulation/camera.h"

namespace qv {

// Photos of known scenes by a camera of known faults, with the truth of every figure that a test takes of them.

struct SimulationOptions {
  CameraModel camera;
  SfrChartStyle style;
  std::string scene = "chart";
  std::string marks = "auto";
  int specks = 5;        // dust
  double speck_px = 10;  // diameter
  double speck_darkness = 0.6;
  double speck_blur_px = 0;        // Gaussian, sigma, beside the lens's own
  cv::Point2d motion_px = {4, 0};  // preview, pair: the scene's way between the two photos
  double second_turn_deg = 0;      // pair: of the scene in the second photo, counter-clockwise about its middle
  double second_scale = 1;         // pair
  double second_gain = 1;          // pair: levels of the second photo over those of the first
  int dots = 100;                  // hdr
  int dot_px = 1;                  // side of a dot
  double dot_contrast = 0.5;       // how much brighter, or darker, than the panel
  DisplayStyle display;
  int defects = 0;        // display: points at random places
  double dim_corner = 0;  // display: share of the light that its first corner lacks
  LightsStyle lights;
  int spots = 0;  // lights: dark squares at random places
  double spot_px = 4;
  PrintStyle print;  // its photo is moved, turned and scaled as the pair's second one
  int samples = 8;   // print: photos of good ones
  int missing = 0;   // print: defects at random places
  int extra = 0;
  double print_defect_px = 8;  // side
};

struct Simulation {             // NOLINT(bugprone-exception-escape): moving Json does not throw
  std::vector<cv::Mat> levels;  // CV_32FC3 in BGR, what falls on the sensor; a photo each
  bool is_hdr = false;          // the levels are the picture: noise is in them, and they are written as floats
  Json truth;
  std::vector<std::string> names = {};  // of the photos after the first, beside it: "second", "samples/00"
};

/// Names of the scenes, for help and checks.
std::vector<std::string> SceneNames();

Simulation Simulate(const SimulationOptions& options);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_SIMULATION_H_
