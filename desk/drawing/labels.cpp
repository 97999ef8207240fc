#include "desk/drawing/labels.h"

#include <algorithm>
#include <cmath>

namespace qv {

namespace {

constexpr double kNear = 5;  // of a label and what it names, at least

}  // namespace

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

double Labels::Covered(const cv::Rect2d& place) const {
  double covered = 3 * (place.area() - (place & inside_).area());
  for (const cv::Rect2d& taken : taken_) covered += (place & taken).area();
  return covered;
}

Labels::Spot Labels::BesideThing(const cv::Size2d& block, const cv::Rect2d& thing) const {
  const cv::Point2d middle = (thing.tl() + thing.br()) / 2;
  Spot best;
  double gap = kNear;
  while (gap < 400 && best.covered != 0) {
    const double x[] = {thing.x - gap - block.width, thing.x, middle.x - block.width / 2, thing.br().x - block.width,
                        thing.br().x + gap};
    const double y[] = {thing.y - gap - block.height, thing.y, middle.y - block.height / 2, thing.br().y - block.height,
                        thing.br().y + gap};
    // Below, above, right, left; then along the sides and the corners.
    const int order[][2] = {{2, 4}, {2, 0}, {4, 2}, {0, 2}, {1, 4}, {3, 4}, {1, 0}, {3, 0},
                            {4, 1}, {4, 3}, {0, 1}, {0, 3}, {4, 4}, {0, 4}, {4, 0}, {0, 0}};
    for (const auto& [i, j] : order) {
      const cv::Rect2d place({x[i], y[j]}, block);
      const double covered = Covered(place);
      if (covered >= best.covered) continue;
      best = {place, gap, covered};
      if (covered == 0) break;
    }
    gap *= 1.6;
  }
  return best;
}

Labels::Spot Labels::Anywhere(const cv::Size2d& block, const cv::Rect2d& thing) const {
  constexpr int kStep = 12;
  Spot best;
  for (int down = 0; down + block.height <= inside_.height; down += kStep) {
    for (int across = 0; across + block.width <= inside_.width; across += kStep) {
      const cv::Rect2d place(inside_.tl() + cv::Point2d(across, down), block);
      const double gap = std::hypot(std::max({thing.x - place.br().x, place.x - thing.br().x, 0.0}),
                                    std::max({thing.y - place.br().y, place.y - thing.br().y, 0.0}));
      if ((best.covered != 0 || gap < best.gap) && Covered(place) == 0) best = {place, gap, 0};
    }
  }
  return best;
}

cv::Rect2d Labels::Add(Picture& picture, const std::vector<std::string>& lines, const cv::Rect2d& thing, Tone tone,
                       double size) {
  constexpr double kTied = 24;  // further away a stroke leads to the thing
  cv::Size2d block(0, 1.35 * size * static_cast<double>(lines.size()));
  for (const std::string& line : lines) block.width = std::max(block.width, WidthOf(line, size) + 8);
  Spot spot = BesideThing(block, thing);
  if (spot.covered != 0) {
    const Spot free = Anywhere(block, thing);
    if (free.covered == 0) spot = free;
  }
  const cv::Rect2d& best = spot.place;
  if (spot.gap > kTied) {
    const cv::Point2d middle = (thing.tl() + thing.br()) / 2;
    const cv::Point2d from(std::clamp(middle.x, best.x, best.br().x), std::clamp(middle.y, best.y, best.br().y));
    const cv::Point2d to(std::clamp(from.x, thing.x, thing.br().x), std::clamp(from.y, thing.y, thing.br().y));
    picture.Line({from, to}, tone, 1);
    const cv::Rect2d crossed(from, to);
    for (const Label& label : labels_) {
      if (crossed.x <= label.place.br().x && label.place.x <= crossed.br().x && crossed.y <= label.place.br().y &&
          label.place.y <= crossed.br().y)
        label.Draw(picture);
    }
  }
  labels_.push_back({best, lines, tone, size});
  labels_.back().Draw(picture);
  Keep(best);
  return best;
}

void Labels::Label::Draw(Picture& picture) const {
  picture.FillRectangle(place, kLabel);
  for (std::size_t i = 0; i < lines.size(); ++i) {
    picture.Text(lines[i], {place.x + place.width / 2, place.y + size * (1.05 + 1.35 * static_cast<double>(i))}, size,
                 tone, Align::kCentre, true);
  }
}

}  // namespace qv
