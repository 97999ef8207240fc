#ifndef QVTESTER_TESTS_VIDEO_FILM_H_
#define QVTESTER_TESTS_VIDEO_FILM_H_

#include <functional>
#include <opencv2/core.hpp>
#include <vector>

#include "qvtester/tester.h"

/// What the reading of a film leaves, beside what was measured in its frames.
struct Film {
  int promised = 0;          // frames, by the container; 0 where it says nothing
  int bad = 0;               // frames that could not be decoded
  int lost = 0;              // frames missing in gaps of more than 1.5 median intervals
  double mean_rate = 0;      // frames per second, by the time stamps; 0 for a single frame
  double longest_gap = 0;    // ms between two neighbours; 0 for a single frame
  std::vector<double> time;  // ms from the first frame, one a decoded frame, rising
};

/// Reads the film of a slot from its start, hands each frame that can be decoded to `measure`, and goes on after one
/// that can't. `most` limits the frames read; 0 or less: all. The frame's pixels are good until the next one.
/// The film ends with the first 8 failing grabs in a row.
/// @return 1; -98 when the slot is empty; -95 with a log line when it holds no film, or one without a frame.
int ReadFilm(QVTester& tester, int slot, const char* test, int most, const std::function<void(const cv::Mat&)>& measure,
             Film& film);

/// Fills in times, rate, gaps and lost frames, from one stamp a frame. A stamp that goes back or repeats is extended by
/// the median interval, or by `nominal` when no stamps tell one, as where they follow nearer than 0.1 ms; all in ms.
/// @return the number of stamps that were extended. At the end of films whose frames are stored out of order OpenCV
/// reads stamps of 0: they are extended too, and a gap among those frames can't be seen.
int KeepTime(const std::vector<double>& stamps, double nominal, Film& film);

/// The middle value; the mean of the middle two for an even count. NaN for none.
double Median(std::vector<double> values);

/// Copies for the result block.
template <typename T>
std::unique_ptr<T[]> ArrayOf(const std::vector<T>& values) {
  auto copy = std::make_unique<T[]>(values.size());
  std::copy(values.begin(), values.end(), copy.get());
  return copy;
}

#endif  // QVTESTER_TESTS_VIDEO_FILM_H_
