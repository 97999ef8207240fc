#include "desk/results/study.h"

#include <algorithm>

namespace qv {

namespace {

// What a figure of a run needs to know of it, by the run's number.
class Runs {
 public:
  Runs(Store& store, const Selection& selection, Study& study) {
    store.EachRow(selection, [&](const RunRow& row) {
      const bool trusted = row.outcome != "ERROR" && row.outcome != "ABORTED";
      ++(trusted ? study.runs : study.left_out);
      const auto step = std::find(steps_.begin(), steps_.end(), row.step);
      rows_.push_back({row.id, trusted ? static_cast<int>(step - steps_.begin()) : -1});
      if (step == steps_.end()) steps_.push_back(row.step);
    });
  }

  /// Of runs in ascending order; -1 for one that is left out.
  int StepOf(std::int64_t run) {
    while (next_ < rows_.size() && rows_[next_].id < run) ++next_;
    return next_ < rows_.size() && rows_[next_].id == run ? rows_[next_].step : -1;
  }
  const std::vector<std::string>& steps() const { return steps_; }

 private:
  struct Row {
    std::int64_t id;
    int step;
  };
  std::vector<Row> rows_;
  std::vector<std::string> steps_;
  std::size_t next_ = 0;
};

bool Wanted(const std::string& name, const std::vector<std::string>& names) {
  return names.empty() || std::any_of(names.begin(), names.end(),
                                      [&](const std::string& part) { return name.find(part) != std::string::npos; });
}

void Add(FigureStudy& study, const FigureRow& figure, bool keep) {
  if (study.moments.count() + study.moments.not_finite() > 0 && !(study.bounds == figure.bounds)) {
    study.bounds_vary = true;
  }
  study.bounds = figure.bounds;
  study.moments.Add(figure.value);
  if (!keep) return;
  study.runs.push_back(figure.run);
  study.readings.push_back({figure.value, figure.uncertainty.value_or(0)});
}

}  // namespace

Study StudyFigures(Store& store, const Selection& selection, const std::vector<std::string>& names,
                   const std::map<std::string, Bounds>& limits, bool keep) {
  Study result;
  Runs runs(store, selection, result);
  std::map<std::int64_t, Quantity> quantities;
  for (const Quantity& quantity : store.Quantities()) {
    if (Wanted(quantity.name, names)) quantities.emplace(quantity.id, quantity);
  }
  const std::size_t columns = quantities.empty() ? 0 : static_cast<std::size_t>(quantities.rbegin()->first) + 1;
  std::vector<char> wanted(columns, 0);
  for (const auto& [id, quantity] : quantities) wanted[static_cast<std::size_t>(id)] = 1;
  std::vector<FigureStudy> table(runs.steps().size() * columns);
  store.EachFigure(selection, [&](const FigureRow& figure) {
    const auto column = static_cast<std::size_t>(figure.quantity);
    if (!figure.measured || column >= columns || wanted[column] == 0) return;
    const int step = runs.StepOf(figure.run);
    if (step >= 0) Add(table[static_cast<std::size_t>(step) * columns + column], figure, keep);
  });
  for (std::size_t i = 0; i < table.size(); ++i) {
    FigureStudy& study = table[i];
    if (study.moments.count() + study.moments.not_finite() == 0) continue;
    study.step = runs.steps()[i / columns];
    study.quantity = quantities.at(static_cast<std::int64_t>(i % columns));
    if (const auto given = limits.find(study.quantity.name); given != limits.end()) {
      study.bounds = given->second;
      study.bounds_vary = false;
    }
    study.capability = CapabilityOf(study.moments, study.bounds);
    result.figures.push_back(std::move(study));
  }
  return result;
}

}  // namespace qv
