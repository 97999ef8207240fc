#ifndef QVTESTER_DESK_MEASURE_FILM_COURSE_H_
#define QVTESTER_DESK_MEASURE_FILM_COURSE_H_

#include <string>
#include <vector>

#include "desk/drawing/plot.h"
#include "desk/measure/measurement.h"
#include "desk/measure/record.h"

namespace qv {

// What the measurements of films share.

inline constexpr Unit kMillisecond = {"millisecond", "C26", "ms", 0.01};
inline constexpr Unit kPerSecond = {"hertz", "HTZ", "Hz", 0.01};
inline constexpr Unit kTimeAxis = {"time", "C26", "ms"};

/// How frames are counted and timed.
extern const Method kStampMethod;

/// When a film is refused.
inline constexpr const char* kFilmAdvice =
    "is it a whole film of a kind that ffmpeg reads, such as .mp4, .mov or .mkv?";

/// Two neighbouring frames with frames missing between them, by their place in the film.
struct FilmGap {
  int before, after;
  int lost;
};

/// Where frames are missing: intervals of more than 1.5 times the median.
std::vector<FilmGap> FindGaps(const std::vector<double>& time);

/// Values over the time of a film, drawn as plots below each other.
class FilmFinding : public Finding {
 public:
  explicit FilmFinding(std::vector<double> time) : time_(std::move(time)), gaps_(FindGaps(time_)) {}

  std::optional<Picture> Draw(const Record& record) const override;

 protected:
  virtual std::vector<Plot> Plots(const Record& record) const = 0;
  /// Figures that stand above them.
  virtual std::vector<std::string> Shown() const = 0;

  /// Lines at a figure's limits.
  static void AddLimits(Plot& plot, const Reading& figure, const std::string& name, bool upright = false);

  /// An empty plot over time, with the gaps as red bars on its axis.
  Plot OverTime(const std::string& title, const std::string& y_label, double y_max) const;
  /// One value a frame, broken at gaps and where there is none.
  Plot::Curve Course(const std::string& name, const std::vector<double>& values, std::size_t series = 0) const;

  const std::vector<double> time_;
  const std::vector<FilmGap> gaps_;
};

/// Nothing was measured.
class NoFilm : public Finding {
 public:
  std::string Report(const Record& /*record*/) const override { return ""; }
  std::optional<Picture> Draw(const Record& /*record*/) const override { return std::nullopt; }
};

/// Runs the row's numbered test on a film; what decoders say goes into the record, with a doubt. True with code 1.
bool RunFilmTest(QVTester& tester, const Spec& spec, const Request& request, Record& record);

/// A doubt where the last frame's time stamp lies well before the end that the container promises.
void DoubtCutFilm(Record& record, const QVTester& tester, QV_RESOURCE_INDEX slot, const std::vector<double>& time_ms);

/// The largest finite one, or 0.
double Highest(const std::vector<double>& values);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_FILM_COURSE_H_
