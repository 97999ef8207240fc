#ifndef QVTESTER_DESK_MEASURE_FINDER_TRIALS_H_
#define QVTESTER_DESK_MEASURE_FINDER_TRIALS_H_

#include <array>
#include <opencv2/core.hpp>
#include <optional>
#include <string>
#include <vector>

#include "desk/measure/miss.h"

namespace qv {

// The finder's own search on a grey picture that is changed in one way, and its checks taken one by one.

/// The marks that the search finds at this threshold, at most three, as on the picture that was given.
std::vector<Mark> SearchMarks(const cv::Mat& gray, int threshold);

/// Three marks as corner, second, third: the corner lies across the longest side.
std::array<Mark, 3> InChartOrder(const std::vector<Mark>& marks);

/// As SearchMarks, on the picture changed; nothing where that is too large a picture to make.
std::vector<Mark> SearchEnlarged(const cv::Mat& gray, int threshold);
std::vector<Mark> SearchSmoothed(const cv::Mat& gray);

/// Marks that are foreshortened, by how much and along which direction in the picture.
struct Foreshortened {
  std::vector<Mark> marks;
  double share;  // of the length across
};
std::optional<Foreshortened> SearchStretched(const cv::Mat& gray, int threshold);

/// Standard deviation of a Gaussian that the picture's sharpest edges are blurred by, in pixels; along rows or columns,
/// whichever is more.
double BlurOf(const cv::Mat& gray, const GreyPeaks& peaks);

/// Lengths of the runs dark, light, dark, light, dark along a line through a core.
struct Bands {
  std::array<int, 5> counts = {};
  bool cut = false;  // the picture ended first

  int total() const;
  /// Within half of 1:1:3:1:1, as the finder has it.
  bool fit() const;
  /// The largest departure from it, as a share.
  double departure() const;
  /// "1:1:2.1:1:0.6", in seventh parts of the whole or in modules of this size.
  std::string Text(double module_px = 0) const;
};
/// Through a dark pixel; none through a light one.
std::optional<Bands> BandsThrough(const cv::Mat& binary, cv::Point core, cv::Point step);

/// Places that would pass with looser bands, best first, at most three; those near `found` are left out.
std::vector<Candidate> NearestCandidates(const cv::Mat& binary, const std::vector<Mark>& found);

/// Why the finder refuses what lies here, check by check; kFits where it does not.
Check FirstFailure(const cv::Mat& binary, cv::Point core, double module_px = 0);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_FINDER_TRIALS_H_
