#include "desk/measure/film_course.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "desk/base/kept_stderr.h"
#include "desk/measure/load.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr double kGap = 1.5;  // median intervals, as the tests have it

}  // namespace

const Method kStampMethod = {
    "time stamps of the frames as the container holds them",
    "Exact to the stamps' own step (a millisecond in Matroska). The last two to four frames of films that are decoded "
    "with a delay, H.264 among them, have no stamps: they are taken to follow at the median interval, and a gap among "
    "them can't be seen.",
    "Moved by what encodes the film, where it sets stamps by its own clock; a film that changes to half its rate "
    "counts "
    "as losing frames."};

std::vector<FilmGap> FindGaps(const std::vector<double>& time) {
  std::vector<FilmGap> gaps;
  std::vector<double> intervals;
  for (std::size_t i = 1; i < time.size(); ++i) intervals.push_back(time[i] - time[i - 1]);
  if (intervals.empty()) return gaps;
  const double usual = Median(intervals);
  for (std::size_t i = 0; i < intervals.size(); ++i) {
    if (!(intervals[i] > kGap * usual)) continue;
    const int before = static_cast<int>(i);
    gaps.push_back({before, before + 1, static_cast<int>(std::min(std::round(intervals[i] / usual) - 1, 1e9))});
  }
  return gaps;
}

std::optional<Picture> FilmFinding::Draw(const Record& record) const {
  constexpr double kWidth = 1100;
  constexpr double kPlot = 400;
  const std::vector<Plot> plots = Plots(record);
  Picture picture(static_cast<int>(kWidth), cvRound(kHeadPx + kPlot * static_cast<double>(plots.size())));
  picture.Text(record.test_name + ", " + record.inputs[0].path + ": " + Name(record.outcome()), {12, 28}, 18, kInk);
  double top = kHeadPx;
  for (const Plot& plot : plots) {
    DrawPlot(picture, plot, {0, top, kWidth, kPlot});
    top += kPlot;
  }
  return picture;
}

Plot FilmFinding::OverTime(const std::string& title, const std::string& y_label, double y_max) const {
  Plot plot;
  plot.title = title;
  plot.x_label = "time, ms";
  plot.y_label = y_label;
  plot.x_max = time_.back() > 0 ? time_.back() : 1;
  plot.y_max = y_max > 0 ? y_max : 1;
  for (const FilmGap& gap : gaps_) {
    plot.more_curves.push_back({{{time_[gap.before], 0}, {time_[gap.after], 0}}, kPoor});
  }
  return plot;
}

Plot::Curve FilmFinding::Course(const std::vector<double>& values, Colour colour) const {
  constexpr double kNone = std::numeric_limits<double>::quiet_NaN();
  Plot::Curve curve = {{}, colour, false};
  auto gap = gaps_.begin();
  for (std::size_t i = 0; i < time_.size(); ++i) {
    if (gap != gaps_.end() && gap->after == static_cast<int>(i)) {
      curve.points.emplace_back(kNone, kNone);
      ++gap;
    }
    curve.points.emplace_back(time_[i], values[i]);
  }
  return curve;
}

bool RunFilmTest(QVTester& tester, const Spec& spec, const Request& request, Record& record) {
  const KeptStderr kept;
  const bool measured = RunNumberedTest(tester, spec, request, record.phase) != nullptr;
  const std::vector<std::string> chatter = kept.Lines();
  SayComplaint(record, record.inputs[0].path, chatter);
  record.chatter.insert(record.chatter.end(), chatter.begin(), chatter.end());
  return measured;
}

double Highest(const std::vector<double>& values) {
  double highest = 0;
  for (const double value : values) {
    if (std::isfinite(value)) highest = std::max(highest, value);
  }
  return highest;
}

}  // namespace qv
