#ifndef QVTESTER_TOOLS_SIMULATION_H_
#define QVTESTER_TOOLS_SIMULATION_H_

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "tools/camera.h"
#include "tools/record.h"

// Photos of known scenes by a camera of known faults, with the truth of every figure that a test takes of them.

struct SimulationOptions {
  CameraModel camera;
  SfrChartStyle style;
  std::string scene = "chart";
  std::string marks = "auto";
  int specks = 5;        // dust
  double speck_px = 10;  // diameter
  double speck_darkness = 0.6;
  cv::Point2d motion_px = {4, 0};  // preview: the scene's way between the two frames
};

struct Simulation {
  std::vector<cv::Mat> levels;  // CV_32FC3 in BGR, what falls on the sensor; a photo each
  Json truth;
};

/// Names of the scenes, for help and checks.
std::vector<std::string> SceneNames();

Simulation Simulate(const SimulationOptions& options);

#endif  // QVTESTER_TOOLS_SIMULATION_H_
