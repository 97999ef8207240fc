#ifndef QVTESTER_DESK_DRAWING_LABELS_H_
#define QVTESTER_DESK_DRAWING_LABELS_H_

#include <limits>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/drawing/picture.h"

namespace qv {

/// Words on a photo, each beside what it names: inside the bounds, over nothing that is to be seen and over no other
/// words. Say first what is to be seen.
class Labels {
 public:
  explicit Labels(cv::Rect2d inside) : inside_(inside) {}

  void Keep(const cv::Rect2d& seen) { taken_.push_back(seen); }
  void Keep(const std::vector<cv::Point2d>& outline);
  /// Draws the lines at the nearest free place about the thing, tied to it by a stroke where that is far; answers it.
  /// Where all is taken it covers as little as it can.
  cv::Rect2d Add(Picture& picture, const std::vector<std::string>& lines, const cv::Rect2d& thing, Tone tone,
                 double size = 15);

 private:
  struct Spot {
    cv::Rect2d place;
    double gap = 0;  // to the thing
    double covered = std::numeric_limits<double>::infinity();
  };
  struct Label {
    cv::Rect2d place;
    std::vector<std::string> lines;
    Tone tone;
    double size;

    void Draw(Picture& picture) const;
  };
  double Covered(const cv::Rect2d& place) const;
  // That which covers least of all directly about the thing, and the nearest free one of all, or none.
  Spot BesideThing(const cv::Size2d& block, const cv::Rect2d& thing) const;
  Spot Anywhere(const cv::Size2d& block, const cv::Rect2d& thing) const;

  cv::Rect2d inside_;
  std::vector<cv::Rect2d> taken_;
  std::vector<Label> labels_;  // a stroke to another runs behind them
};

/// The upright box about some points.
cv::Rect2d BoxAbout(const std::vector<cv::Point2d>& points);

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_LABELS_H_
