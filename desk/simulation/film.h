#ifndef QVTESTER_DESK_SIMULATION_FILM_H_
#define QVTESTER_DESK_SIMULATION_FILM_H_

#include <functional>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/base/json.h"
#include "desk/simulation/simulation.h"

namespace qv {

// Films of known courses: a lens that finds its focus, a flash, a turning chart; with frames that were lost.

struct FilmStyle {
  int frames = 90;  // filmed, lost ones among them
  double rate = 30;
  double jitter = 0;          // a frame's time departs by up to this share of an interval, up and down by turns
  std::vector<int> lost;      // numbers of frames, from 0
  double from_px = 3;         // focus: defocus at the start, Gaussian sigma beside the camera's own blur
  double sweep_ms = 1000;     // focus: until the lens first comes to its best
  double overshoot_px = 1.5;  // focus: how far it goes beyond
  double return_ms = 400;     // focus: until it is back for good
  double base = 0.25;         // flash: light without it, over that with it
  double pulse_ms = 300;      // flash: width at half height
  double pulse_at_ms = 1200;  // flash: time of its peak
  double turn_deg_s = 20;     // chart: how fast it turns, counter-clockwise
};

struct Film {                                // NOLINT(bugprone-exception-escape): moving Json does not throw
  std::vector<int> kept;                     // numbers of the frames that were not lost
  std::function<cv::Mat(int number)> frame;  // as the sensor makes it, CV_8UC3
  Json truth;
};

/// Names of the scenes, for help and checks.
const std::vector<std::string>& FilmScenes();

/// The film of `options.scene`, by its camera.
Film SimulateFilm(const SimulationOptions& options, const FilmStyle& style);

/// Its content as an .mp4, .mkv or .mov file, H.264, by the program ffmpeg; times and gaps are in the stamps. Throws
/// Failure for another kind of file, a size that can't be encoded, or without that program.
std::string EncodeFilm(const Film& film, const FilmStyle& style, const std::string& path);

}  // namespace qv

#endif  // QVTESTER_DESK_SIMULATION_FILM_H_
