#include "desk/measure/finder_trials.h"

#include <algorithm>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "qvtester/tester.h"

namespace qv {

namespace {

constexpr std::array<int, 5> kShares = {1, 1, 3, 1, 1};
constexpr double kMostPixels = 40e6;  // of a picture that is made to be searched

std::vector<Mark> MarksIn(const cv::Mat& binary) {
  QVTester trial;
  const std::size_t count = trial.GetFinderPoints(binary).size();
  std::vector<Mark> marks;
  for (std::size_t i = 0; i < count; ++i) {
    const QVFinderPattern& mark = trial.possibleCenters[i];
    marks.push_back({{mark.x - 0.5, mark.y - 0.5}, mark.estimatedModuleSize});  // the search counts from corners
  }
  return marks;
}

// Searches a picture that this map made of the given one, and takes the marks back.
std::vector<Mark> SearchMapped(const cv::Mat& gray, int threshold, const cv::Matx23d& map, cv::Size size) {
  if (static_cast<double>(size.width) * size.height > kMostPixels) return {};
  cv::Mat changed;
  cv::warpAffine(gray, changed, map, size, cv::INTER_CUBIC, cv::BORDER_REPLICATE);
  std::vector<Mark> marks = SearchMarks(changed, threshold);
  cv::Mat inverse;
  cv::invertAffineTransform(map, inverse);
  const cv::Matx23d back(inverse);
  const double scale = std::sqrt(std::fabs(back(0, 0) * back(1, 1) - back(0, 1) * back(1, 0)));
  for (Mark& mark : marks) {
    const cv::Vec2d at = back * cv::Vec3d(mark.centre.x, mark.centre.y, 1);
    mark = {{at[0], at[1]}, mark.module_px * scale};
  }
  return marks;
}

// So that the whole of the picture stays in view, pixel centres at whole numbers.
std::vector<Mark> SearchLinear(const cv::Mat& gray, int threshold, const cv::Matx22d& linear) {
  const cv::Point2d corners[] = {
      {-0.5, -0.5}, {gray.cols - 0.5, -0.5}, {-0.5, gray.rows - 0.5}, {gray.cols - 0.5, gray.rows - 0.5}};
  cv::Vec2d low(INFINITY, INFINITY);
  cv::Vec2d high = -low;
  for (const cv::Point2d& corner : corners) {
    const cv::Vec2d at = linear * cv::Vec2d(corner.x, corner.y);
    for (int k = 0; k < 2; ++k) {
      low[k] = std::min(low[k], at[k]);
      high[k] = std::max(high[k], at[k]);
    }
  }
  const cv::Matx23d map(linear(0, 0), linear(0, 1), -low[0] - 0.5, linear(1, 0), linear(1, 1), -low[1] - 0.5);
  return SearchMapped(gray, threshold, map, {cvCeil(high[0] - low[0]), cvCeil(high[1] - low[1])});
}

}  // namespace

std::vector<Mark> SearchMarks(const cv::Mat& gray, int threshold) { return MarksIn(gray > threshold); }

std::array<Mark, 3> InChartOrder(const std::vector<Mark>& marks) {
  std::array<Mark, 3> order = {marks[0], marks[1], marks[2]};
  const auto across = [&](int i) { return cv::norm(order[(i + 1) % 3].centre - order[(i + 2) % 3].centre); };
  int corner = 0;
  for (int i = 1; i < 3; ++i) corner = across(i) > across(corner) ? i : corner;
  std::rotate(order.begin(), order.begin() + corner, order.end());
  const cv::Point2d a = order[1].centre - order[0].centre;
  if (a.cross(order[2].centre - order[0].centre) < 0) std::swap(order[1], order[2]);  // rows run down
  return order;
}

std::vector<Mark> SearchEnlarged(const cv::Mat& gray, int threshold) {
  std::vector<Mark> best;
  for (const double scale : {2.0, 3.0, 4.0}) {
    std::vector<Mark> marks = SearchLinear(gray, threshold, {scale, 0, 0, scale});
    if (LieAsOnChart(marks)) return marks;
    if (marks.size() > best.size()) best = std::move(marks);
  }
  return best;
}

std::vector<Mark> SearchSmoothed(const cv::Mat& gray) {
  cv::Mat smooth;
  cv::Mat binary;
  cv::medianBlur(gray, smooth, 5);
  cv::threshold(smooth, binary, 0, 255, cv::THRESH_BINARY | cv::THRESH_OTSU);
  return MarksIn(binary);
}

std::optional<Foreshortened> SearchStretched(const cv::Mat& gray, int threshold) {
  for (const double factor : {1.5, 2.0}) {
    for (const double angle : {0.0, 90.0, 45.0, 135.0}) {  // that is stretched, from the columns' direction
      const double c = std::cos(angle * CV_PI / 180);
      const double s = std::sin(angle * CV_PI / 180);
      const cv::Matx22d stretch = cv::Matx22d(c, -s, s, c) * cv::Matx22d(factor, 0, 0, 1) * cv::Matx22d(c, s, -s, c);
      std::vector<Mark> marks = SearchLinear(gray, threshold, stretch);
      if (marks.size() < 3) continue;
      std::vector<Mark> stretched = marks;
      for (Mark& mark : stretched) {
        const cv::Vec2d at = stretch * cv::Vec2d(mark.centre.x, mark.centre.y);
        mark = {{at[0], at[1]}, mark.module_px * std::sqrt(factor)};
      }
      const std::array<Mark, 3> order = InChartOrder(stretched);
      const cv::Point2d right = order[1].centre - order[0].centre;
      const cv::Point2d down = order[2].centre - order[0].centre;
      const double cosine = right.dot(down) / cv::norm(right) / cv::norm(down);
      const double ratio = cv::norm(right) / cv::norm(down);
      if (std::fabs(cosine) > 0.35 || ratio < 0.6 || ratio > 1.7) continue;
      return Foreshortened{marks, 1 / factor};
    }
  }
  return std::nullopt;
}

double BlurOf(const cv::Mat& gray, const GreyPeaks& peaks) {
  constexpr double kOwn = 1;  // sigma that takes most of the noise, and is taken off again
  constexpr double kShare = 3e-4;
  // A disc as large as all that is dark has the shortest edge.
  const int dark = cv::countNonZero(gray <= (peaks.dark + peaks.light) / 2);
  const double count = std::min(kShare * static_cast<double>(gray.total()), 1.7 * std::sqrt(dark));
  cv::Mat smooth;
  gray.convertTo(smooth, CV_32F);
  cv::GaussianBlur(smooth, smooth, {}, kOwn);
  double blur = 0;
  for (const bool along_rows : {true, false}) {
    cv::Mat slope;
    cv::Sobel(smooth, slope, CV_32F, along_rows ? 1 : 0, along_rows ? 0 : 1, 1, 0.5);
    slope = cv::abs(slope);
    std::vector<float> slopes(slope.begin<float>(), slope.end<float>());
    const auto steep = slopes.end() - 1 - static_cast<std::ptrdiff_t>(count);
    std::nth_element(slopes.begin(), steep, slopes.end());
    const double sigma = (peaks.light - peaks.dark) / std::sqrt(2 * CV_PI) / std::max<double>(*steep, 1e-3);
    blur = std::max(blur, std::sqrt(std::max(0.0, sigma * sigma - kOwn * kOwn)));
  }
  return blur;
}

// ---- The checks, one by one -----------------------------------------------------------------------------------------

int Bands::total() const { return std::accumulate(counts.begin(), counts.end(), 0); }

double Bands::departure() const {
  const double module = total() / 7.0;
  double most = 0;
  for (int i = 0; i < 5; ++i) most = std::max(most, std::fabs(counts[i] - kShares[i] * module) / kShares[i] / module);
  return most;
}

bool Bands::fit() const { return !cut && total() >= 7 && departure() < 0.5; }

std::string Bands::Text(double module_px) const {
  const double module = module_px > 0 ? module_px : std::max(total(), 1) / 7.0;
  std::string text;
  for (const int count : counts) text += Format("%s%.2g", text.empty() ? "" : ":", count / module);
  return text;
}

std::optional<Bands> BandsThrough(const cv::Mat& binary, cv::Point core, cv::Point step) {
  const cv::Rect all({}, binary.size());
  if (!all.contains(core) || binary.at<uchar>(core) != 0) return std::nullopt;
  Bands bands;
  for (const int way : {-1, 1}) {
    cv::Point at = way < 0 ? core : core + step;
    for (int i = 2; i >= 0; --i) {
      const bool dark = i != 1;
      int& count = bands.counts[way < 0 ? i : 4 - i];
      for (; all.contains(at) && (binary.at<uchar>(at) == 0) == dark; at += way * step) ++count;
    }
    bands.cut = bands.cut || !all.contains(at);
  }
  return bands;
}

Check FirstFailure(const cv::Mat& binary, cv::Point core, double module_px) {
  struct Line {
    cv::Point step;
    const char* name;
  };
  int along_row = 0;
  for (const Line& line : {Line{{1, 0}, "row"}, Line{{0, 1}, "column"}, Line{{1, 1}, "diagonal"}}) {
    const std::optional<Bands> bands = BandsThrough(binary, core, line.step);
    if (!bands) return {Check::kNothing, "nothing dark is there"};
    if (bands->cut && (module_px <= 0 || bands->total() < 9 * module_px))
      return {Check::kCut, "it is cut by the picture's border"};
    if (!bands->fit()) {
      return {Check::kBands, Format("its bands along the %s are %s of the finder's 1:1:3:1:1", line.name,
                                    bands->Text(module_px).c_str())};
    }
    if (along_row == 0) along_row = bands->total();
    const double size = static_cast<double>(bands->total()) / along_row;
    if (line.step.x == 0 && std::fabs(size - 1) >= 0.4) {  // the finder's bound
      return {Check::kSize, Format("it is %.2f times as high as wide: 0.60 to 1.40 is needed", size)};
    }
  }
  return {};
}

namespace {

struct Place {
  Candidate candidate;
  double departure;
};

// Collects what resembles a mark and is none, each place once, at its least departure.
class Search {
 public:
  Search(const cv::Mat& binary, const std::vector<Mark>& found) : binary_(binary), found_(found) {}

  const std::vector<Place>& places() const { return places_; }

  void Consider(cv::Point core) {
    constexpr double kLoose = 0.95;
    const std::optional<Bands> row = BandsThrough(binary_, core, {1, 0});
    if (!row || !(row->cut ? row->counts[2] >= 2 : row->total() >= 7 && row->departure() <= kLoose)) return;
    const std::optional<Bands> column = BandsThrough(binary_, core, {0, 1});
    if (!column || !(row->cut ? column->fit() : column->cut ? row->fit() : column->departure() <= kLoose)) return;
    const Bands& whole = row->cut ? *column : *row;
    const Bands& other = row->cut ? *row : *column;
    if (other.counts[2] > 3 * whole.counts[2] || whole.counts[2] > 3 * other.counts[2]) return;
    const Mark mark = {cv::Point2d(core), other.cut ? whole.total() / 7.0 : (row->total() + column->total()) / 14.0};
    if (std::any_of(found_.begin(), found_.end(), [&](const Mark& known) { return Near(mark, known); })) return;
    Check failed = FirstFailure(binary_, core);
    if (failed.kind == Check::kFits) return;
    Keep({{mark, std::move(failed)}, other.cut ? whole.departure() : std::max(row->departure(), column->departure())});
  }

 private:
  static bool Near(const Mark& a, const Mark& b) {
    return cv::norm(a.centre - b.centre) < 3.5 * std::max(a.module_px, b.module_px);
  }

  void Keep(Place place) {
    const auto same = std::find_if(places_.begin(), places_.end(), [&](const Place& known) {
      return Near(known.candidate.mark, place.candidate.mark);
    });
    if (same == places_.end()) {
      places_.push_back(std::move(place));
    } else if (place.departure < same->departure) {
      *same = std::move(place);
    }
  }

  const cv::Mat& binary_;
  const std::vector<Mark>& found_;
  std::vector<Place> places_;
};

}  // namespace

std::vector<Candidate> NearestCandidates(const cv::Mat& binary, const std::vector<Mark>& found) {
  constexpr std::size_t kMost = 3;
  constexpr std::size_t kEnough = 2000;  // places; noise makes more
  Search search(binary, found);
  for (int i = 1; i < binary.rows && search.places().size() < kEnough; i += 2) {
    const auto* const row = binary.ptr<uchar>(i);
    for (int j = 0; j < binary.cols;) {  // the middle of each dark run
      const int first = j;
      while (j < binary.cols && (row[j] == 0) == (row[first] == 0)) ++j;
      if (row[first] == 0 && j - first >= 3) search.Consider({(first + j - 1) / 2, i});
    }
  }
  std::vector<Place> places = search.places();
  std::sort(places.begin(), places.end(), [](const Place& a, const Place& b) { return a.departure < b.departure; });
  std::vector<Candidate> nearest;
  for (std::size_t i = 0; i < std::min(places.size(), kMost); ++i) nearest.push_back(places[i].candidate);
  return nearest;
}

}  // namespace qv
