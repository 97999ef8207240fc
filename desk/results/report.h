#ifndef QVTESTER_DESK_RESULTS_REPORT_H_
#define QVTESTER_DESK_RESULTS_REPORT_H_

#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "desk/results/run.h"

// Runs as a page to read, as test results for a CI server, and as plots for a document.

namespace qv {

/// Gathers runs in columns, so that ten thousand stay small: text that repeats is kept once, curves over spatial
/// frequency stand on one axis of 101 points from 0 to Nyquist.
class Report {
 public:
  enum class Pictures { kAll, kFailures, kNone };

  Report(std::string title, Pictures pictures) : title_(std::move(title)), pictures_(pictures) {}

  void Add(const StoredRun& run);
  std::size_t runs() const { return units_.size(); }

  /// One HTML file that needs nothing else, opened from disk or mailed.
  std::string Html() const;
  /// JUnit's XML: a test case a run, its broken limits as the failure.
  std::string JUnit() const;
  /// The curves and the distributions of the figures with limits, as SVG.
  std::string Plot() const;
  /// What the page shows (docs/report.schema.json).
  Json Data() const;

 private:
  struct Column {  // of texts that repeat
    std::vector<std::string> values;
    std::map<std::string, std::size_t> places;
    std::vector<std::size_t> index;

    std::size_t Place(const std::string& text);
    void Add(const std::string& text) { index.push_back(Place(text)); }
  };
  struct FigureColumn {
    StoredFigure about;
    std::string step;
    std::vector<Bounds> bounds;  // each that was met
    std::vector<std::size_t> run, bound;
    std::vector<std::optional<double>> value, uncertainty;
    std::vector<std::string> outcome;
    std::vector<bool> marginal;
    std::map<std::size_t, std::string> list, list_limits;  // by run, of a list
  };
  struct CurveColumn {
    std::string name, step, docstring;
    std::vector<std::size_t> run;
    std::vector<std::vector<double>> points;  // NaN where there is none
  };
  struct Case {  // of JUnit
    double seconds = 0;
    std::string failure, error;
  };

  void AddFigures(std::size_t run, const std::string& step, const Json& record);
  void AddCurve(std::size_t run, const std::string& step, const std::string& name, const Json& measurement);
  Json FiguresJson() const;
  Json CurvesJson() const;
  void AddWords(std::size_t run, const StoredRun& source, bool failed);

  std::string title_;
  Pictures pictures_;
  std::vector<std::string> units_;
  std::vector<std::int64_t> starts_;
  std::vector<bool> marginal_;
  Column station_, operator_, lot_, step_, measurement_, outcome_, version_, limits_;
  std::map<std::string, Column> columns_;
  std::vector<FigureColumn> figures_;
  std::map<std::string, std::size_t> figure_places_;
  std::vector<CurveColumn> curves_;
  std::map<std::string, std::size_t> curve_places_;
  std::vector<Json> details_, inputs_, logs_;
  Json shown_pictures_ = Json::array();
  std::vector<Case> cases_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_REPORT_H_
