#include "desk/results/list_verdicts.h"

#include <limits>
#include <set>

#include "desk/measure/figures.h"

namespace qv {

namespace {

std::set<std::string> NamesOf(const ArchiveLimits& now, const ArchiveLimits* against) {
  std::set<std::string> names;
  for (const auto& [name, bounds] : now.lists) names.insert(name);
  if (against == nullptr) return names;
  for (const auto& [name, bounds] : against->lists) names.insert(name);
  return names;
}

std::string Under(const ArchiveLimits& limits, const std::string& name, const Json& points) {
  const auto found = limits.lists.find(name);
  return found == limits.lists.end() ? "MEASURED" : VerdictOf(points, found->second);
}

}  // namespace

const char* VerdictOf(const Json& points, const ListBounds& bounds) {
  if (!points.is_array()) return "UNSET";
  std::size_t own = 0;
  bool broken = false;
  for (const Json& point : points) {
    if (!point.is_array() || point.size() < 2 || !point[0].is_number()) return "UNSET";
    const auto found = bounds.by_number.find(static_cast<int>(point[0].get<double>()));
    own += found == bounds.by_number.end() ? 0 : 1;
    const Bounds& held = found == bounds.by_number.end() ? bounds.each : found->second;
    if (held == Bounds()) continue;
    const double value = point[1].is_number() ? point[1].get<double>() : std::numeric_limits<double>::quiet_NaN();
    broken = broken || *VerdictOf(value, held) == 'F';
  }
  return own < bounds.by_number.size() ? "UNSET" : broken ? "FAIL" : "PASS";
}

std::map<std::int64_t, std::vector<ListVerdict>> VerdictsOnLists(Store& store, const Selection& selection,
                                                                 const ArchiveLimits& now,
                                                                 const ArchiveLimits* against) {
  std::map<std::string, std::vector<std::string>> by_measurement;
  for (const std::string& name : NamesOf(now, against)) {
    if (const FigureInfo* const info = FindFigure(name)) by_measurement[info->measurement].push_back(name);
  }
  std::map<std::int64_t, std::vector<ListVerdict>> verdicts;
  for (const auto& [measurement, names] : by_measurement) {
    Selection own = selection;
    own.push_back({"measurement", "=", measurement});
    store.EachRun(own, false, [&, &wanted = names](const RunRow& row, const StoredRun& run) {
      const Json& figures = run.record.at("phases").at(0).at("measurements");
      for (const std::string& name : wanted) {
        const auto found = figures.find(name);
        if (found == figures.end() || !found->contains("measured_value")) continue;
        const Json& points = found->at("measured_value");
        const std::string before = against == nullptr ? TextAt(*found, "outcome") : Under(*against, name, points);
        verdicts[row.id].push_back(
            {name, TextAt(found->value("units", Json::object()), "suffix"), before, Under(now, name, points)});
      }
    });
  }
  return verdicts;
}

}  // namespace qv
