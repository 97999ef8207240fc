#ifndef QVTESTER_DESK_MEASURE_AREAS_H_
#define QVTESTER_DESK_MEASURE_AREAS_H_

#include <opencv2/core.hpp>
#include <string>
#include <utility>
#include <vector>

#include "desk/drawing/labels.h"
#include "desk/drawing/picture.h"
#include "desk/measure/measurement.h"
#include "desk/measure/record.h"

namespace qv {

// Error areas, as several measurements find them: rectangles, and how many pixels of each are wrong.

/// Merging is quadratic; so many are noise, not defects. As the library's.
inline constexpr int kMostSpots = 20'000;

struct Areas {
  std::vector<cv::Rect> rectangles;
  std::vector<int> pixels;
};

/// Of the result block's arrays.
Areas AreasOf(int count, const QVRECT* areas, const int* pixels);

/// What decides which dots make an area, and which areas count.
std::vector<Parameter> AreaParameters();

/// area_count, and of each area the middle and the figures of its size.
std::vector<Figure> AreaFigures(const Method& method);
void AddAreas(Phase& phase, const Areas& areas);

/// A line for each of the first twenty.
std::string AreaLines(const Areas& areas, const char* unit);

/// Frames with numbers (none when there are very many) and the verdicts on each; a frame keeps off what is wrong. A
/// tone each, or none: doubtful.
void DrawAreas(Picture& picture, Labels& labels, const PhotoPlace& place, const Areas& areas, const Phase& phase,
               const std::vector<Tone>& tones = {});

/// What frames and rings of these tones stand for, side by side on paper; the baseline starts at the place.
void DrawKey(Picture& picture, cv::Point2d place, const std::vector<std::pair<std::string, Tone>>& entries);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_AREAS_H_
