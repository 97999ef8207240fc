#include "desk/results/record_verdicts.h"

#include <cmath>
#include <limits>
#include <set>

#include "desk/measure/figures.h"

namespace qv {

namespace {

constexpr double kNoNumber = std::numeric_limits<double>::quiet_NaN();

bool MovesLimits(const DecisionRule& rule) { return rule.kind != DecisionRule::Kind::kSimple; }

std::set<std::string> NamesOf(const ArchiveLimits& now, const ArchiveLimits* against) {
  std::set<std::string> names;
  for (const ArchiveLimits* const limits : {&now, against}) {
    if (limits == nullptr) continue;
    for (const auto& [name, bounds] : limits->lists) names.insert(name);
    if (!MovesLimits(limits->rule)) continue;
    for (const auto& [name, bounds] : limits->by_name) names.insert(name);
  }
  return names;
}

double NumberOf(const Json& value) { return value.is_number() ? value.get<double>() : kNoNumber; }

// Of the value at a place, or of the only one; nothing is known where it is not finite.
double ExpandedOf(const Json& measurement, std::size_t place) {
  const auto uncertainty = measurement.find("uncertainty");
  if (uncertainty == measurement.end() || !uncertainty->is_object()) return kNoNumber;
  const Json expanded = uncertainty->value("expanded", Json());
  return expanded.is_array() ? place < expanded.size() ? NumberOf(expanded[place]) : kNoNumber : NumberOf(expanded);
}

bool Keeps(double value, double expanded, const Bounds& bounds, const DecisionRule& rule) {
  return Decide(value, 0, std::isfinite(expanded) ? expanded : 0, {bounds.min, bounds.max}, rule).pass;
}

RecordVerdict OfValue(const Json& measurement, const Bounds& bounds, const DecisionRule& rule, bool real) {
  const double value = NumberOf(measurement.at("measured_value"));
  const double expanded = ExpandedOf(measurement, 0);
  const bool unknown = MovesLimits(rule) && real && std::isfinite(value);
  return {Keeps(value, expanded, bounds, rule) ? "PASS" : "FAIL", unknown && !std::isfinite(expanded)};
}

RecordVerdict OfList(const Json& measurement, const ListBounds& bounds, const DecisionRule& rule, bool real) {
  const Json& points = measurement.at("measured_value");
  if (!points.is_array()) return {"UNSET"};
  std::size_t own = 0;
  bool broken = false;
  RecordVerdict verdict;
  for (std::size_t i = 0; i < points.size(); ++i) {
    const Json& point = points[i];
    if (!point.is_array() || point.size() < 2 || !point[0].is_number()) return {"UNSET"};
    const auto found = bounds.by_number.find(static_cast<int>(point[0].get<double>()));
    own += found == bounds.by_number.end() ? 0 : 1;
    const Bounds& held = found == bounds.by_number.end() ? bounds.each : found->second;
    const double value = NumberOf(point[1]);
    const double expanded = ExpandedOf(measurement, i);
    const bool moved = MovesLimits(rule) && real && std::isfinite(value);
    verdict.unknown_band = verdict.unknown_band || (moved && !std::isfinite(expanded));
    if (held == Bounds()) continue;
    broken = broken || !Keeps(value, expanded, held, rule);
  }
  verdict.outcome = own < bounds.by_number.size() ? "UNSET" : broken ? "FAIL" : "PASS";
  return verdict;
}

RecordVerdict Under(const ArchiveLimits& limits, const FigureInfo& info, const Json& measurement) {
  const bool real = info.figure->number == Number::kReal;
  if (const auto list = limits.lists.find(info.name); list != limits.lists.end()) {
    return OfList(measurement, list->second, limits.rule, real);
  }
  const auto single = limits.by_name.find(info.name);
  if (single != limits.by_name.end()) return OfValue(measurement, single->second, limits.rule, real);
  return {"MEASURED"};
}

}  // namespace

std::map<std::int64_t, std::vector<RecordVerdicts>> VerdictsOnRecords(Store& store, const Selection& selection,
                                                                      const ArchiveLimits& now,
                                                                      const ArchiveLimits* against) {
  std::map<std::string, std::vector<const FigureInfo*>> by_measurement;
  for (const std::string& name : NamesOf(now, against)) {
    if (const FigureInfo* const info = FindFigure(name)) by_measurement[info->measurement].push_back(info);
  }
  std::map<std::int64_t, std::vector<RecordVerdicts>> verdicts;
  for (const auto& [measurement, infos] : by_measurement) {
    Selection own = selection;
    own.push_back({"measurement", "=", measurement});
    store.EachRun(own, false, [&, &wanted = infos](const RunRow& row, const StoredRun& run) {
      const Json& figures = run.record.at("phases").at(0).at("measurements");
      for (const FigureInfo* const info : wanted) {
        const auto found = figures.find(info->name);
        if (found == figures.end() || !found->contains("measured_value")) continue;
        const RecordVerdict before =
            against == nullptr ? RecordVerdict{TextAt(*found, "outcome")} : Under(*against, *info, *found);
        verdicts[row.id].push_back({info->name, TextAt(found->value("units", Json::object()), "suffix"),
                                    info->figure->axis != nullptr, before, Under(now, *info, *found)});
      }
    });
  }
  return verdicts;
}

}  // namespace qv
