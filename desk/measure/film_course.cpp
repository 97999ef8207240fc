#include "desk/measure/film_course.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <opencv2/videoio.hpp>

#include "desk/base/kept_stderr.h"
#include "desk/base/text.h"
#include "desk/measure/heading.h"
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
  const Heading heading(record, record.test_name + ", " + record.inputs[0].path, kWidth, Shown());
  Picture picture(static_cast<int>(kWidth), cvRound(heading.height() + kPlot * static_cast<double>(plots.size())));
  heading.Draw(picture);
  double top = heading.height();
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
  Plot::Curve lost = {"frames lost", {}, {OnPaper(kPoor), Dash::kSolid, PointShape::kCircle}};
  for (const FilmGap& gap : gaps_) {
    lost.points.emplace_back(time_[gap.before], 0);
    lost.points.emplace_back(time_[gap.after], 0);
    lost.points.emplace_back(NAN, NAN);
  }
  if (!gaps_.empty()) plot.curves.push_back(std::move(lost));
  return plot;
}

Plot::Curve FilmFinding::Course(const std::string& name, const std::vector<double>& values, std::size_t series) const {
  constexpr double kNone = std::numeric_limits<double>::quiet_NaN();
  Plot::Curve curve = {name, {}, kSeries[series]};
  curve.ends_only = true;
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

void FilmFinding::AddLimits(Plot& plot, const Reading& figure, const std::string& name, bool upright) {
  for (const auto& [limit, side] : {std::pair{figure.limit.min, "at least"}, {figure.limit.max, "at most"}}) {
    if (!limit) continue;
    plot.levels.push_back(
        {*limit, Format("%s: %s %g, %s", name.c_str(), side, *limit, Name(figure.outcome)), upright, ToneOf(figure)});
    if (!upright) plot.y_max = std::max(plot.y_max, 1.05 * *limit);
  }
}

bool RunFilmTest(QVTester& tester, const Spec& spec, const Request& request, Record& record) {
  const KeptStderr kept;
  const bool measured = RunNumberedTest(tester, spec, request, record.phase) != nullptr;
  const std::vector<std::string> chatter = kept.Lines();
  SayComplaint(record, record.inputs[0].path, chatter);
  record.chatter.insert(record.chatter.end(), chatter.begin(), chatter.end());
  return measured;
}

void DoubtCutFilm(Record& record, const QVTester& tester, QV_RESOURCE_INDEX slot, const std::vector<double>& time_ms) {
  constexpr double kLeastThere = 0.9;
  cv::VideoCapture film;
  tester.resources_[slot]->GetVideo(&film);
  const double promised_ms = 1000 * film.get(cv::CAP_PROP_FRAME_COUNT) / film.get(cv::CAP_PROP_FPS);
  if (time_ms.size() < 2 || !(promised_ms > 0)) return;
  const double interval_ms = (time_ms.back() - time_ms.front()) / static_cast<double>(time_ms.size() - 1);
  const double there_ms = time_ms.back() + 2 * interval_ms;
  if (there_ms >= kLeastThere * promised_ms) return;
  record.Say(Doubt::kFilmCut,
             Format("%s: the film ends at %.1f s of %.1f s that its container promises; it was cut",
                    record.inputs[0].path.c_str(), time_ms.back() / 1000, promised_ms / 1000),
             "frame_count");
}

double Highest(const std::vector<double>& values) {
  double highest = 0;
  for (const double value : values) {
    if (std::isfinite(value)) highest = std::max(highest, value);
  }
  return highest;
}

}  // namespace qv
