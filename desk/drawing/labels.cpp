#include "desk/drawing/labels.h"

#include <algorithm>

namespace qv {

cv::Rect2d BoxAbout(const std::vector<cv::Point2d>& points) {
  cv::Point2d low = points.at(0);
  cv::Point2d high = low;
  for (const cv::Point2d& p : points) {
    low = {std::min(low.x, p.x), std::min(low.y, p.y)};
    high = {std::max(high.x, p.x), std::max(high.y, p.y)};
  }
  return {low, high};
}

void Labels::Keep(const std::vector<cv::Point2d>& outline) { Keep(BoxAbout(outline)); }

cv::Rect2d Labels::Add(Picture& picture, const std::vector<std::string>& lines, const cv::Rect2d& thing, Tone tone,
                       double size) {
  constexpr double kNear = 5;
  constexpr double kTied = 24;  // further away a stroke leads to the thing
  cv::Size2d block(0, 1.35 * size * static_cast<double>(lines.size()));
  for (const std::string& line : lines) block.width = std::max(block.width, WidthOf(line, size) + 8);
  const cv::Point2d middle = (thing.tl() + thing.br()) / 2;
  cv::Rect2d best;
  double best_gap = kNear;
  double least = -1;  // that the best covers
  double gap = kNear;
  while (gap < 400 && least != 0) {
    const double x[] = {thing.x - gap - block.width, thing.x, middle.x - block.width / 2, thing.br().x - block.width,
                        thing.br().x + gap};
    const double y[] = {thing.y - gap - block.height, thing.y, middle.y - block.height / 2, thing.br().y - block.height,
                        thing.br().y + gap};
    // Below, above, right, left; then along the sides and the corners.
    const int order[][2] = {{2, 4}, {2, 0}, {4, 2}, {0, 2}, {1, 4}, {3, 4}, {1, 0}, {3, 0},
                            {4, 1}, {4, 3}, {0, 1}, {0, 3}, {4, 4}, {0, 4}, {4, 0}, {0, 0}};
    for (const auto& [i, j] : order) {
      const cv::Rect2d place({x[i], y[j]}, block);
      double covered = 3 * (place.area() - (place & inside_).area());
      for (const cv::Rect2d& taken : taken_) covered += (place & taken).area();
      if (least >= 0 && covered >= least) continue;
      best = place;
      best_gap = gap;
      least = covered;
      if (covered == 0) break;
    }
    gap *= 1.6;
  }
  if (best_gap > kTied) {
    const cv::Point2d from(std::clamp(middle.x, best.x, best.br().x), std::clamp(middle.y, best.y, best.br().y));
    const cv::Point2d to(std::clamp(from.x, thing.x, thing.br().x), std::clamp(from.y, thing.y, thing.br().y));
    picture.Line({from, to}, tone, 1);
  }
  picture.FillRectangle(best, kLabel);
  for (std::size_t i = 0; i < lines.size(); ++i) {
    picture.Text(lines[i], {best.x + best.width / 2, best.y + size * (1.05 + 1.35 * static_cast<double>(i))}, size,
                 tone, Align::kCentre, true);
  }
  Keep(best);
  return best;
}

}  // namespace qv
