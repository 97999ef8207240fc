#include "desk/measure/miss.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>
#include <utility>

#include "chart/chart_layout.h"
#include "chart/points.h"
#include "desk/base/text.h"
#include "desk/measure/finder_trials.h"
#include "desk/measure/histogram.h"
#include "desk/measure/legs.h"

namespace qv {

namespace {

constexpr double kLeastContrast = 20;  // grey levels between the two peaks
constexpr double kSmallestModulePx = 3;
constexpr double kMostBlurPx = 2.5;
constexpr double kMostBlurModules = 0.45;
constexpr double kModuleSlack = 0.2;  // of the legs' length in modules

// The commonest level, neighbours counted in, on each side of the level that parts dark from light best (Otsu's).
struct GreyHistogram {
  GreyPeaks peaks;
  int parting;
};

GreyHistogram LookAtLevels(const cv::Mat& gray) {
  cv::Mat light;
  const int parting = cvRound(cv::threshold(gray, light, 0, 255, cv::THRESH_BINARY | cv::THRESH_OTSU));
  std::array<double, kGreyLevels> counts = {};
  for (int i = 0; i < gray.rows; ++i) {
    const auto* row = gray.ptr<uchar>(i);
    for (int j = 0; j < gray.cols; ++j) ++counts[row[j]];
  }
  const auto commonest = [&](int first, int last) {
    constexpr int kNeighbours = 4;  // to each side, nearer ones weigh more
    int best = -1;                  // nothing there
    double most = 0;
    for (int level = first; level <= last; ++level) {
      double sum = 0;
      for (int k = std::max(first, level - kNeighbours); k <= std::min(last, level + kNeighbours); ++k) {
        sum += counts[k] * (1 + kNeighbours - std::abs(k - level));
      }
      if (sum <= most) continue;
      most = sum;
      best = level;
    }
    return static_cast<double>(best);
  };
  const double dark = commonest(0, parting);
  const double bright = commonest(std::min(parting + 1, 255), 255);
  return {{dark < 0 ? bright : dark, bright < 0 ? dark : bright}, parting};  // one level alone is both
}

// ---- Where the third mark should be ---------------------------------------------------------------------------------

// A chart's three marks, two of which were found.
struct Placed {
  std::array<cv::Point2d, 3> marks;  // corner, second, third
  int missing;                       // which of them was not found
  double module_px;
};

// How well the picture's levels at the chart's patches follow the patches' own: their correlation, where enough of
// them are in view and differ.
std::optional<double> Likeness(const cv::Mat& gray, const std::array<cv::Point2d, 3>& marks, int fewest = 10) {
  double n = 0;
  double sums[5] = {};  // of a, b, a a, b b, a b
  for (int i = 0; i < static_cast<int>(kPatches.size()); ++i) {
    const cv::Point2d place = PatchCentre(i);
    const cv::Point at = marks[0] + (place.x * (marks[1] - marks[0]) + place.y * (marks[2] - marks[0])) / kChartSide;
    if (!cv::Rect({}, gray.size()).contains(at)) continue;
    const double a = 0.299 * kPatches[i].blue + 0.587 * kPatches[i].green + 0.114 * kPatches[i].red;  // as the tests
    const double b = gray.at<uchar>(at);
    const double terms[5] = {a, b, a * a, b * b, a * b};
    for (int k = 0; k < 5; ++k) sums[k] += terms[k];
    ++n;
  }
  const double variances = (sums[2] - sums[0] * sums[0] / n) * (sums[3] - sums[1] * sums[1] / n);
  if (n < fewest || variances <= 0) return std::nullopt;
  return (sums[4] - sums[0] * sums[1] / n) / std::sqrt(variances);
}

// Whether a chart has marks of this module size, measured along the rows, on such legs: on a turned chart the rows
// cross a mark aslant, and take longer.
bool FitsLegs(double module_px, cv::Point2d leg) {
  const double length = cv::norm(leg);
  const double upright = module_px * std::max(std::fabs(leg.x), std::fabs(leg.y)) / length;
  return std::any_of(kMarkSizes.begin(), kMarkSizes.end(), [=](const MarkSize& size) {
    return std::fabs(length / upright * size.module / kChartSide - 1) < kModuleSlack;
  });
}

// The ways in which two marks can be a chart's. A chart is never seen mirrored: third - corner is second - corner
// turned from the columns' direction to the rows'.
std::vector<Placed> WaysToPlace(const Mark& first, const Mark& other) {
  const auto turned = [](cv::Point2d v) { return cv::Point2d(-v.y, v.x); };
  std::vector<Placed> ways;
  const double module = (first.module_px + other.module_px) / 2;
  for (const bool swapped : {false, true}) {
    const cv::Point2d a = swapped ? other.centre : first.centre;
    const cv::Point2d b = swapped ? first.centre : other.centre;
    if (FitsLegs(module, b - a)) {
      ways.push_back({{a, b, a + turned(b - a)}, 2, module});
      ways.push_back({{a, a - turned(b - a), b}, 1, module});
    }
    const cv::Point2d half = (b - a) / 2;
    if (FitsLegs(module, half + turned(half))) {  // second and third
      ways.push_back({{a + half + turned(half), a, b}, 0, module});
    }
  }
  return ways;
}

struct Expected {
  Placed placed;
  std::optional<double> likeness;
  bool of_one = false;  // mark alone, so that there were far more ways

  bool alike() const { return likeness && *likeness > (of_one ? 0.95 : 0.8); }
  bool unlike() const { return likeness && !alike(); }
};

// One mark may be any of three, of any size, and turned in any way. Of the two that lack, the one further out of view.
std::optional<Expected> ExpectOthers(const cv::Mat& gray, const Mark& found) {
  constexpr int kTurns = 360;
  constexpr int kFewest = 14;
  const cv::Point2d inner[3] = {{0, 0}, {1, 0}, {0, 1}};  // the marks, in legs
  const cv::Point2d middle(gray.cols / 2.0, gray.rows / 2.0);
  std::optional<Expected> best;
  for (int turn = 0; turn < kTurns; ++turn) {
    const double angle = turn * 2 * CV_PI / kTurns;
    const cv::Point2d along(std::cos(angle), std::sin(angle));
    const double upright = found.module_px * std::max(std::fabs(along.x), std::fabs(along.y));
    for (const MarkSize& size : kMarkSizes) {
      for (const double scale : {0.94, 0.97, 1.0, 1.03, 1.06}) {
        const cv::Point2d right = along * (scale * upright * kChartSide / size.module);
        const cv::Point2d down(-right.y, right.x);
        for (const cv::Point2d& role : inner) {
          const cv::Point2d corner = found.centre - role.x * right - role.y * down;
          const std::array<cv::Point2d, 3> marks = {corner, corner + right, corner + down};
          const std::optional<double> likeness = Likeness(gray, marks, kFewest);
          if (!likeness || (best && *likeness <= *best->likeness)) continue;
          const auto out = std::max_element(marks.begin(), marks.end(), [&](cv::Point2d a, cv::Point2d b) {
            return std::max(std::fabs(a.x - middle.x) - middle.x, std::fabs(a.y - middle.y) - middle.y) <
                   std::max(std::fabs(b.x - middle.x) - middle.x, std::fabs(b.y - middle.y) - middle.y);
          });
          best = {{marks, static_cast<int>(out - marks.begin()), found.module_px}, likeness, true};
        }
      }
    }
  }
  return best;
}

// The likeliest; nothing where no two of the marks lie as a chart's.
std::optional<Expected> ExpectThird(const cv::Mat& gray, const std::vector<Mark>& found) {
  std::optional<Expected> best;
  for (std::size_t i = 0; i < found.size(); ++i) {
    for (std::size_t j = 0; j < i; ++j) {
      for (const Placed& way : WaysToPlace(found[i], found[j])) {
        const std::optional<double> likeness = Likeness(gray, way.marks);
        if (!best || likeness > best->likeness) best = {way, likeness};
      }
    }
  }
  return best;
}

const char* BorderNear(cv::Point2d at, cv::Size size) {
  const std::array<std::pair<double, const char*>, 4> sides = {
      {{at.x, "left"}, {at.y, "upper"}, {size.width - at.x, "right"}, {size.height - at.y, "lower"}}};
  return std::min_element(sides.begin(), sides.end())->second;
}

// ---- The causes, the surest first -----------------------------------------------------------------------------------

class Explainer {
 public:
  Explainer(std::vector<Mark> found, int threshold, const cv::Mat& photo)
      : found_(std::move(found)), threshold_(threshold) {
    cv::cvtColor(photo, gray_, cv::COLOR_RGB2GRAY);  // as the tests weigh it: the first channel is taken for red
    const GreyHistogram levels = LookAtLevels(gray_);
    miss_.peaks = levels.peaks;
    parting_ = levels.parting;
  }

  Miss Explain() {
    const char* const counts[] = {"no finder mark was", "1 of 3 finder marks was", "2 of 3 finder marks were"};
    miss_.reasons.push_back(Format("%s found", counts[std::min<std::size_t>(found_.size(), 2)]));
    if (!TooFlat()) {
      TryThresholds();
      blur_px_ = BlurOf(gray_, miss_.peaks);
      NameCause();
    }
    return std::move(miss_);
  }

 private:
  void Because(MissCause cause, std::string reason) {
    if (!named_) miss_.cause = cause;
    named_ = true;
    miss_.reasons.push_back(std::move(reason));
  }

  // Before the candidates that it was seen by.
  void BecauseFirst(MissCause cause, std::string reason) {
    const auto candidates = static_cast<std::ptrdiff_t>(miss_.candidates.size());
    miss_.cause = cause;
    miss_.reasons.insert(miss_.reasons.end() - candidates, std::move(reason));
  }

  bool TooFlat() {
    const auto [dark, light] = miss_.peaks;
    if (light - dark >= kLeastContrast) return false;
    Because(MissCause::kContrast,
            Format("the picture has hardly any contrast (grey peaks at %.0f and %.0f)", dark, light));
    return true;
  }

  int Middle() const { return cvRound((miss_.peaks.dark + miss_.peaks.light) / 2); }

  bool ThresholdIsOff() const {
    const auto [dark, light] = miss_.peaks;
    const double margin = (light - dark) / 8;
    return threshold_ < dark + margin || threshold_ > light - margin;
  }

  // The first threshold between the peaks at which a search succeeds; and the most that any of them finds.
  void TryThresholds() {
    const auto [dark, light] = miss_.peaks;
    best_ = found_;
    for (const int threshold : {Middle(), parting_, cvRound((3 * dark + light) / 4), cvRound((dark + 3 * light) / 4)}) {
      if (threshold == threshold_) continue;
      const std::vector<Mark> marks = SearchMarks(gray_, threshold);
      if (marks.size() > best_.size() && (marks.size() < kMarks || LieAsOnChart(marks))) {
        best_ = marks;
        best_threshold_ = threshold;
      }
      if (!LieAsOnChart(marks)) continue;
      miss_.threshold = threshold;
      miss_.how = Format("found at threshold %d", threshold);
      const std::array<Mark, 3> order = InChartOrder(marks);
      miss_.marks.assign(order.begin(), order.end());
      return;
    }
  }

  void NameCause() {
    const std::string off =
        Format("the threshold of %d is far from the middle of the picture's grey peaks at %.0f and %.0f", threshold_,
               miss_.peaks.dark, miss_.peaks.light);
    if (ThresholdIsOff() && miss_.threshold) return Because(MissCause::kThreshold, off);
    if (ThresholdIsOff()) miss_.reasons.push_back(off);
    if (IsSmall() || IsBlurred() || IsNoisy()) return;
    if (miss_.threshold) {
      Because(MissCause::kThreshold,
              Format("at the threshold of %d dark and light of the marks run together", threshold_));
    } else if (!IsOblique() && !LacksThird()) {
      NameNearest();
    }
  }

  int TrialThreshold() const { return ThresholdIsOff() ? Middle() : threshold_; }

  double SmallestModule(const std::vector<Mark>& marks) const {
    double least = INFINITY;
    for (const Mark& mark : marks) least = std::min(least, mark.module_px);
    return least;
  }

  // All three, or two that no patches speak against.
  bool AreOfChart(const std::vector<Mark>& marks) const {
    if (LieAsOnChart(marks)) return true;
    const std::optional<Expected> expected = marks.size() == 2 ? ExpectThird(gray_, marks) : std::nullopt;
    return expected && !expected->unlike();
  }

  bool IsSmall() {
    std::vector<Mark> marks = best_;
    if (!AreOfChart(marks)) marks = SearchEnlarged(gray_, TrialThreshold());
    if (!AreOfChart(marks)) return false;
    const double module = SmallestModule(marks);
    if (module >= kSmallestModulePx) return false;
    ShowTrial(marks, "seen enlarged");
    Because(MissCause::kSmall,
            Format("marks of %.1f px a module: at least %.0f are needed", module, kSmallestModulePx));
    return true;
  }

  bool IsNoisy() {
    if (miss_.threshold) return false;
    const std::vector<Mark> marks = SearchSmoothed(gray_);
    if (!LieAsOnChart(marks)) return false;
    ShowTrial(marks, "seen smoothed");
    Because(MissCause::kNoise, "noise breaks up the marks: smoothed, the picture shows all three");
    return true;
  }

  bool IsBlurred() {
    const double module = SmallestModule(best_);
    const bool known = std::isfinite(module);
    if (blur_px_ < kMostBlurPx || (known && blur_px_ < kMostBlurModules * module)) return false;
    std::string reason = Format("blurred by about %.0f px (sigma)", blur_px_);
    if (known) reason += Format(", marks of %.1f px a module", module);
    Because(MissCause::kBlur, reason + ": dark and light runs don't reach the threshold");
    NearestOnly();
    return true;
  }

  bool IsOblique() {
    const std::optional<Foreshortened> seen = SearchStretched(gray_, TrialThreshold());
    if (!seen) return false;
    ShowTrial(seen->marks, "seen drawn out");
    Because(MissCause::kOblique,
            Format("the chart is seen from aside: drawn out by %.1f across, the picture shows all three marks",
                   1 / seen->share));
    return true;
  }

  // Two marks tell where the third is.
  bool LacksThird() {
    const std::optional<Expected> expected =
        best_.size() == 1 ? ExpectOthers(gray_, best_[0]) : ExpectThird(gray_, best_);
    if (!expected || !expected->alike()) return false;
    const char* const which = expected->of_one ? "a" : "the third";
    const double reach = 3.5 * expected->placed.module_px;
    const cv::Rect2d inside(reach - 0.5, reach - 0.5, gray_.cols - 2 * reach, gray_.rows - 2 * reach);
    const cv::Point2d at = expected->placed.marks[expected->placed.missing];
    const cv::Mat binary = gray_ > best_threshold_.value_or(threshold_);
    const std::string place = Format("(%.0f, %.0f)", at.x, at.y);
    const cv::Rect2d picture(-0.5, -0.5, gray_.cols, gray_.rows);
    if (!inside.contains(at)) {
      const char* const side = BorderNear(at, gray_.size());
      Because(MissCause::kCut,
              picture.contains(at)
                  ? Format("%s mark, at %s, is cut by the picture's %s border", which, place.c_str(), side)
                  : Format("%s mark's place, %s, lies beyond the picture's %s border", which, place.c_str(), side));
      if (picture.contains(at))
        miss_.candidates.push_back({{at, expected->placed.module_px}, {Check::kCut, "cut by the border"}});
      return true;
    }
    Check failed = FirstFailure(binary, at, expected->placed.module_px);
    if (failed.kind == Check::kFits) failed.text = "the search does not stop at what lies there";
    Because(MissCause::kCovered,
            Format("%s mark should be at %s, and %s: is it covered?", which, place.c_str(), failed.text.c_str()));
    miss_.candidates.push_back({{at, expected->placed.module_px}, failed});
    return true;
  }

  void NearestOnly() {
    miss_.candidates = NearestCandidates(gray_ > threshold_, found_);
    for (const Candidate& candidate : miss_.candidates) {
      miss_.reasons.push_back(Format("a candidate at (%.0f, %.0f) fails: %s", candidate.mark.centre.x,
                                     candidate.mark.centre.y, candidate.failed.text.c_str()));
    }
  }

  void NameNearest() {
    NearestOnly();
    const auto cut = std::find_if(miss_.candidates.begin(), miss_.candidates.end(), [&](const Candidate& c) {
      return c.failed.kind == Check::kCut && !found_.empty() &&
             std::fabs(std::log(c.mark.module_px / found_[0].module_px)) < 0.5;
    });
    const auto drawn_out = std::count_if(miss_.candidates.begin(), miss_.candidates.end(),
                                         [](const Candidate& c) { return c.failed.kind == Check::kSize; });
    if (cut != miss_.candidates.end()) {
      BecauseFirst(MissCause::kCut,
                   Format("the candidate at (%.0f, %.0f) is cut by the picture's %s border", cut->mark.centre.x,
                          cut->mark.centre.y, BorderNear(cut->mark.centre, gray_.size())));
    } else if (drawn_out >= 2) {
      BecauseFirst(MissCause::kOblique, "the chart may be seen from aside: marks are longer one way than the other");
    } else {
      BecauseFirst(MissCause::kNoChart, found_.empty() ? "nothing in the picture looks like a chart's mark"
                                                       : "nothing else in the picture looks like a chart's mark");
    }
  }

  // What a changed picture shows, for the drawing.
  void ShowTrial(const std::vector<Mark>& marks, const char* how) {
    if (miss_.threshold || marks.size() != kMarks) return;
    const std::array<Mark, 3> order = InChartOrder(marks);
    miss_.marks.assign(order.begin(), order.end());
    miss_.how = how;
  }

  std::vector<Mark> found_, best_;
  int threshold_;
  int parting_ = 0;
  std::optional<int> best_threshold_;
  double blur_px_ = 0;
  bool named_ = false;
  cv::Mat gray_;
  Miss miss_;
};

}  // namespace

bool LieAsOnChart(const std::vector<Mark>& marks) {
  if (marks.size() != kMarks) return false;
  const std::array<Mark, 3> order = InChartOrder(marks);
  const Legs legs = {order[1].centre - order[0].centre, order[2].centre - order[0].centre};
  if (!legs.plausible()) return false;
  const double module = (marks[0].module_px + marks[1].module_px + marks[2].module_px) / 3;
  return FitsLegs(module, legs.right);
}

Miss ExplainMiss(const std::vector<Mark>& found, int threshold, const cv::Mat& photo) {
  return Explainer(found, threshold, photo).Explain();
}

}  // namespace qv
