#ifndef QVTESTER_DESK_MEASURE_MISS_H_
#define QVTESTER_DESK_MEASURE_MISS_H_

#include <opencv2/core.hpp>
#include <optional>
#include <string>
#include <vector>

namespace qv {

// Why a chart's three marks were not found. Looked for only after a miss; no test reads any of it.

struct Mark {
  cv::Point2d centre;  // column, row; pixel centres at whole numbers
  double module_px;
};

/// The two commonest grey levels of a picture: what is dark in it, and what is light.
struct GreyPeaks {
  double dark, light;
};

enum class MissCause {
  kContrast,   // hardly any: nothing there, or no light
  kThreshold,  // another one finds all three
  kSmall,      // as does the search on an enlarged photo
  kOblique,    // as does the search on one that is stretched across
  kNoise,      // as does the search on a smoothed one
  kBlur,       // dark and light run into one another
  kCut,        // a mark lies at the picture's border or beyond
  kCovered,    // a mark's place is in view, and the mark is not
  kNoChart,    // nothing that looks like one
};

/// What the finder asks of a mark, as far as it fails.
struct Check {
  enum Kind { kFits, kNothing, kCut, kBands, kSize } kind = kFits;
  std::string text;  // "its bands along the row are 1:1:2.1:1:0.6 of the finder's 1:1:3:1:1"
};

/// What looks like a mark, and why it is none.
struct Candidate {
  Mark mark;
  Check failed;
};

/// Why three marks did not come back, and what would help.
struct Miss {
  MissCause cause = MissCause::kNoChart;
  std::vector<std::string> reasons;  // a phrase each: how many were found, the cause, what else
  GreyPeaks peaks = {};
  std::optional<int> threshold;       // a search at it finds three marks that lie as a chart's
  std::vector<Mark> marks;            // which it finds there, or on the photo changed otherwise
  std::string how;                    // "found at threshold 64"
  std::vector<Candidate> candidates;  // the nearest that failed, best first
};

/// Whether three marks lie as the chart's do: legs of one length at a right angle, so many modules long. A QR code has
/// marks of the same shape, and far shorter legs.
bool LieAsOnChart(const std::vector<Mark>& marks);

/// Searches again with one thing changed at a time, and looks at the place where a mark should be. `found` are the
/// marks, at most two, that the search at the threshold found on this photo.
///
/// The finder's own search runs on the photo at other thresholds, enlarged, stretched across and smoothed: with
/// what it succeeds, that was wrong. Two marks of the chart tell where the third is (which of the places, the patches
/// tell); the runs of dark and light there are held against 1:1:3:1:1. The sharpest edges tell the blur.
Miss ExplainMiss(const std::vector<Mark>& found, int threshold, const cv::Mat& photo);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_MISS_H_
