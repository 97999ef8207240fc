#include "desk/results/judge.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <sstream>
#include <unordered_map>

#include "desk/measure/figures.h"
#include "desk/results/record_verdicts.h"

namespace qv {

namespace {

// From best to worst; a unit is what its worst step is.
constexpr const char* kOutcomes[] = {"MEASURED", "PASS", "FAIL", "ABORTED", "ERROR"};

std::size_t Rank(const std::string& outcome) {
  return static_cast<std::size_t>(std::find(std::begin(kOutcomes), std::end(kOutcomes), outcome) -
                                  std::begin(kOutcomes));
}

// What a run's figures come to under one set of limits.
class Judge {
 public:
  Judge(const ArchiveLimits& limits, const std::vector<Quantity>& quantities) : limits_(limits) {
    for (const Quantity& quantity : quantities) {
      const auto found = limits.by_name.find(quantity.name);
      if (found == limits.by_name.end()) continue;
      const auto at = static_cast<std::size_t>(quantity.id);
      if (bounds_.size() <= at) bounds_.resize(at + 1, nullptr);
      bounds_[at] = &found->second;
    }
  }

  /// "" for a figure without a limit.
  const char* Of(const FigureRow& figure) const {
    const auto at = static_cast<std::size_t>(figure.quantity);
    const Bounds* const bounds = at < bounds_.size() ? bounds_[at] : nullptr;
    if (bounds == nullptr) return figure.measured || figure.outcome != "UNSET" ? "MEASURED" : "UNSET";  // lists too
    return figure.measured ? VerdictOf(figure.value, *bounds) : "UNSET";
  }
  bool Limits(std::int64_t quantity) const {
    const auto at = static_cast<std::size_t>(quantity);
    return at < bounds_.size() && bounds_[at] != nullptr;
  }
  /// Figures of this measurement that must be measured.
  const std::vector<std::string>& Asked(const std::string& measurement) {
    const auto [asked, made] = asked_.try_emplace(measurement);
    if (!made) return asked->second;
    const auto ask = [&, &list = asked->second](const std::string& name) {
      const FigureInfo* const info = FindFigure(name);  // camera_capture's do not begin camera_capture_front's
      if (info != nullptr ? info->measurement == measurement : name.rfind(measurement + "_", 0) == 0)
        list.push_back(name);
    };
    for (const auto& [name, bounds] : limits_.by_name) ask(name);
    for (const auto& [name, bounds] : limits_.lists) ask(name);
    return asked->second;
  }
  bool Accepts(const std::string& doubts) const {
    std::istringstream names(doubts);
    for (std::string name; names >> name;) {
      if (limits_.accepted_doubts.count(name) == 0) return false;
    }
    return true;
  }

 private:
  const ArchiveLimits& limits_;
  std::vector<const Bounds*> bounds_;  // by quantity
  std::unordered_map<std::string, std::vector<std::string>> asked_;
};

struct RunFigures {
  const RunRow* row;
  std::vector<FigureRow> figures;  // single values
  const std::vector<RecordVerdicts>* read;

  const RecordVerdicts* Read(const std::string& name) const {
    const auto own = [&](const RecordVerdicts& verdicts) { return verdicts.name == name; };
    const auto found = std::find_if(read->begin(), read->end(), own);
    return found == read->end() ? nullptr : &*found;
  }
};

// A run's verdict, figure by figure, and of those that a limit asks for in vain.
struct RunVerdict {
  std::string outcome;
  std::vector<std::string> figures;
  std::vector<std::string> missing;
};

bool Has(const RunFigures& run, const std::string& name, const std::vector<std::string>& names) {
  return std::any_of(
             run.figures.begin(), run.figures.end(),
             [&](const FigureRow& figure) { return names[static_cast<std::size_t>(figure.quantity)] == name; }) ||
         run.Read(name) != nullptr;
}

RunVerdict Verdict(Judge& judge, const RunFigures& run, const std::vector<std::string>& names,
                   RecordVerdict RecordVerdicts::*read) {
  RunVerdict verdict;
  Tally tally;
  bool unknown_band = false;
  for (const FigureRow& figure : run.figures) {
    const RecordVerdicts* const own = run.Read(names[static_cast<std::size_t>(figure.quantity)]);
    verdict.figures.push_back(own != nullptr ? (own->*read).outcome : judge.Of(figure));
    if (judge.Limits(figure.quantity)) tally.Add(verdict.figures.back());
  }
  for (const RecordVerdicts& own : *run.read) {
    if (own.list) tally.Add((own.*read).outcome);
    unknown_band = unknown_band || (own.*read).unknown_band;
  }
  for (const std::string& name : judge.Asked(run.row->measurement)) {
    if (!Has(run, name, names)) verdict.missing.push_back(name);
  }
  const bool doubted = !judge.Accepts(run.row->doubts);
  const bool whole = run.row->result_code == 1 && verdict.missing.empty() && tally.of("UNSET") == 0;
  verdict.outcome = run.row->outcome == "ABORTED"       ? "ABORTED"
                    : !whole || doubted || unknown_band ? "ERROR"
                    : tally.of("FAIL") > 0              ? "FAIL"
                    : tally.of("PASS") > 0              ? "PASS"
                                                        : "MEASURED";
  return verdict;
}

}  // namespace

const char* VerdictOf(double value, const Bounds& bounds) {
  const bool within =
      std::isfinite(value) && !(bounds.min && value < *bounds.min) && !(bounds.max && value > *bounds.max);
  return within ? "PASS" : "FAIL";
}

std::int64_t Tally::of(const std::string& outcome) const {
  const auto found = by_outcome.find(outcome);
  return found == by_outcome.end() ? 0 : found->second;
}

std::int64_t Tally::total() const {
  std::int64_t sum = 0;
  for (const auto& [outcome, count] : by_outcome) sum += count;
  return sum;
}

double Tally::yield() const {
  const std::int64_t judged = of("PASS") + of("FAIL") + of("ERROR") + of("UNSET");
  return judged == 0 ? std::numeric_limits<double>::quiet_NaN()
                     : static_cast<double>(of("PASS")) / static_cast<double>(judged);
}

void UnitVerdicts::Add(const RunRow& row, const std::string& outcome) {
  Latest& latest = units_[row.unit][row.plan + '\n' + row.step + '\n' + row.measurement];
  if (!latest.outcome.empty() && row.start_millis < latest.start) return;
  latest = {row.start_millis, outcome};
}

Tally UnitVerdicts::tally() const {
  Tally tally;
  for (const auto& [unit, steps] : units_) {
    std::size_t worst = 0;
    for (const auto& [step, latest] : steps) worst = std::max(worst, Rank(latest.outcome));
    tally.Add(worst < std::size(kOutcomes) ? kOutcomes[worst] : "ERROR");
  }
  return tally;
}

namespace {

// Holds what grows while runs are judged.
class Session {
 public:
  Session(Store& store, const Selection& selection, const ArchiveLimits& now, const ArchiveLimits* against)
      : quantities_(store.Quantities()),
        now_(now, quantities_),
        read_(VerdictsOnRecords(store, selection, now, against)) {
    if (against != nullptr) before_.emplace(*against, quantities_);
    for (const Quantity& quantity : quantities_) {
      names_.resize(std::max(names_.size(), static_cast<std::size_t>(quantity.id) + 1));
      units_.resize(names_.size());
      names_[static_cast<std::size_t>(quantity.id)] = quantity.name;
      units_[static_cast<std::size_t>(quantity.id)] = quantity.unit;
    }
    for (const auto& [name, bounds] : now.by_name) {
      if (std::find(names_.begin(), names_.end(), name) == names_.end()) result.idle_limits.push_back(name);
    }
    std::set<std::string> listed;
    for (const auto& [run, verdicts] : read_) {
      for (const RecordVerdicts& own : verdicts) listed.insert(own.name);
    }
    for (const auto& [name, bounds] : now.lists) {
      if (listed.count(name) == 0) result.idle_limits.push_back(name);
    }
  }

  void Take(RunFigures& run) {
    TakeLists(run);
    const RunRow& row = *run.row;
    const RunVerdict after = Verdict(now_, run, names_, &RecordVerdicts::after);
    const RunVerdict before =
        before_ ? Verdict(*before_, run, names_, &RecordVerdicts::before) : RunVerdict{row.outcome, {}, {}};
    for (std::size_t i = 0; i < run.figures.size(); ++i) {
      const FigureRow& figure = run.figures[i];
      const auto quantity = static_cast<std::size_t>(figure.quantity);
      if (!now_.Limits(figure.quantity) && !(before_ && before_->Limits(figure.quantity)) &&
          figure.outcome == "MEASURED") {
        continue;
      }
      const std::string was = before_ ? before.figures[i] : figure.outcome;
      Count(row, quantity, was, after.figures[i]);
      Changed(row, names_[quantity], figure.measured ? figure.value : kNone, was, after.figures[i]);
    }
    for (const std::string& name : after.missing) {
      const bool was_missing = std::find(before.missing.begin(), before.missing.end(), name) != before.missing.end();
      Changed(row, name, kNone, was_missing ? "UNSET" : "MEASURED", "UNSET");
    }
    Changed(row, "", kNone, before.outcome, after.outcome);
    result.runs_before.Add(before.outcome);
    result.runs_after.Add(after.outcome);
    units_before_.Add(row, before.outcome);
    units_after_.Add(row, after.outcome);
  }

  Judgement Finish() {
    result.units_before = units_before_.tally();
    result.units_after = units_after_.tally();
    for (auto& [key, figure] : figures_) result.figures.push_back(std::move(figure));
    return std::move(result);
  }

  Judgement result;

 private:
  static constexpr double kNone = std::numeric_limits<double>::quiet_NaN();

  // Judged lists leave the rows, where they have no value.
  void TakeLists(RunFigures& run) {
    static const std::vector<RecordVerdicts> none;
    const auto found = read_.find(run.row->id);
    run.read = found == read_.end() ? &none : &found->second;
    for (const RecordVerdicts& list : *run.read) {
      if (!list.list) continue;
      const auto own = [&](const FigureRow& row) {
        return names_[static_cast<std::size_t>(row.quantity)] == list.name;
      };
      run.figures.erase(std::remove_if(run.figures.begin(), run.figures.end(), own), run.figures.end());
      Count(*run.row, QuantityOf(list), list.before.outcome, list.after.outcome);
      Changed(*run.row, list.name, kNone, list.before.outcome, list.after.outcome);
    }
  }

  // A list that was never judged before is none of the store's quantities.
  std::size_t QuantityOf(const RecordVerdicts& list) {
    const auto found = std::find(names_.begin(), names_.end(), list.name);
    const auto at = static_cast<std::size_t>(found - names_.begin());
    if (found != names_.end()) return at;
    names_.push_back(list.name);
    units_.push_back(list.unit);
    return at;
  }

  void Count(const RunRow& row, std::size_t quantity, const std::string& was, const std::string& is) {
    JudgedFigure& figure = figures_[{row.step, quantity}];
    if (figure.name.empty()) figure = {row.step, names_[quantity], units_[quantity], {}, {}};
    figure.before.Add(was);
    figure.after.Add(is);
  }
  void Changed(const RunRow& row, const std::string& figure, double value, const std::string& was,
               const std::string& is) {
    if (was != is) result.changes.push_back({row.unit, row.step, row.measurement, figure, value, was, is});
  }

  std::vector<Quantity> quantities_;
  Judge now_;
  std::optional<Judge> before_;
  std::map<std::int64_t, std::vector<RecordVerdicts>> read_;  // by run
  std::vector<std::string> names_, units_;                    // by quantity
  std::map<std::pair<std::string, std::size_t>, JudgedFigure> figures_;
  UnitVerdicts units_before_, units_after_;
};

}  // namespace

Judgement JudgeAgain(Store& store, const Selection& selection, const ArchiveLimits& now, const ArchiveLimits* against) {
  Session session(store, selection, now, against);
  if (session.result.idle_limits.size() == now.by_name.size() + now.lists.size()) {
    throw Failure(kWrongUsage, store.name() + ": no run measures anything that these limits hold for");
  }
  std::vector<RunRow> rows;
  store.EachRow(selection, [&](const RunRow& row) { rows.push_back(row); });
  std::size_t next = 0;
  RunFigures run = {nullptr, {}, nullptr};
  const auto take_before = [&](std::int64_t id) {
    for (; next < rows.size() && rows[next].id < id; ++next) {
      run.row = &rows[next];
      session.Take(run);
      run.figures.clear();
    }
  };
  store.EachFigure(selection, [&](const FigureRow& figure) {
    take_before(figure.run);
    run.figures.push_back(figure);
  });
  take_before(std::numeric_limits<std::int64_t>::max());
  return session.Finish();
}

}  // namespace qv
