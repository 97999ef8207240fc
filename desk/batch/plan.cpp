#include "desk/batch/plan.h"

#include <algorithm>
#include <filesystem>
#include <set>

#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/measure/measure.h"
#include "desk/measure/measurement.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

constexpr const char* kUnit = "{unit}";

// Whether a parameter's text names a file: of an input that may be left out, or a histogram.
bool NamesFile(const Spec& spec, const std::string& parameter) {
  for (const InputSpec& input : spec.inputs) {
    if (input.optional && parameter == input.name) return true;
  }
  return std::any_of(spec.parameters.begin(), spec.parameters.end(), [&](const Parameter& known) {
    return parameter == known.name && known.type == Parameter::kHistogram;
  });
}

// A file's name from its folder, with the unit filled in: a unit's name stays below the folder that the plan names.
std::string Placed(const Plan& plan, const std::string& name, const std::string& unit) {
  const std::size_t first = name.find(kUnit);
  if (first == std::string::npos) return (fs::path(plan.folder) / name).string();
  const fs::path folder = plan.unit_folder.empty() ? plan.folder : plan.unit_folder;
  const fs::path below = (folder / fs::path(name.substr(0, first)).parent_path()).lexically_normal();
  std::string filled = name;
  for (std::size_t at = first; at != std::string::npos; at = filled.find(kUnit, at + unit.size())) {
    filled.replace(at, std::string(kUnit).size(), unit);
  }
  const fs::path place = folder / filled;
  const fs::path from_there = place.lexically_normal().lexically_relative(below);
  if (from_there.empty() || *from_there.begin() == "..") {
    throw Failure(kWrongUsage, "unit \"" + Printable(unit) + "\": " + Printable(filled) +
                                   " leads out of the folder \"" + Printable(below.empty() ? "." : below.string()) +
                                   "\" of the plan");
  }
  return place.string();
}

// The limits that are of figures of this measurement.
Limits OfMeasurement(const Limits& limits, const Spec& spec, std::set<std::string>& used) {
  Limits of = limits;
  const std::string prefix = std::string(spec.name) + "_";
  for (auto limit = of.by_name.begin(); limit != of.by_name.end();) {
    const bool is = std::any_of(spec.figures.begin(), spec.figures.end(),
                                [&](const Figure& figure) { return limit->first == prefix + figure.name; });
    if (is) used.insert(limit->first);
    limit = is ? std::next(limit) : of.by_name.erase(limit);
  }
  return of;
}

// A limits file seen from the plan's folder, or limits inline.
Limits ReadLimitsOf(const Plan& plan, const JsonView& limits) {
  if (!limits.value().is_string()) return LimitsFromJson(limits.value(), limits.where());
  return ReadLimits((fs::path(plan.folder) / limits.Text()).string());
}

PlanStep ReadStep(const Plan& plan, const JsonView& view, const Limits& common, std::set<std::string>& used) {
  view.KnowOnly({"name", "measurement", "inputs", "parameters", "properties", "fake", "limits"});
  PlanStep step;
  Json request = view.value();
  request.erase("name");
  request.erase("limits");
  try {
    step.request = RequestFromJson(request);
    Resolved(RequestFor(plan, {"", step.request, {}}, "unit"));
  } catch (const Failure& e) {
    view.Refuse(e.what());
  }
  const Spec& spec = FindMeasurement(step.request.measurement)->spec();
  step.name = view.Has("name") ? view.At("name").Text() : spec.name;
  if (!view.Has("limits")) {
    step.limits = OfMeasurement(common, spec, used);
    return step;
  }
  const Limits own = ReadLimitsOf(plan, view.At("limits"));
  std::set<std::string> own_used;
  step.limits = OfMeasurement(own, spec, own_used);
  for (const auto& [name, limit] : own.by_name) {
    if (own_used.count(name) == 0) view.Refuse("its limits hold " + name + ", which it does not measure");
  }
  return step;
}

}  // namespace

Plan ReadPlan(const std::string& path) {
  const Json json = ReadJson(path);
  const JsonView view(json, Printable(path));
  view.KnowOnly({"name", "revision", "limits", "stop_on_error", "steps"});
  Plan plan;
  plan.folder = fs::path(path).parent_path().string();
  plan.name = view.At("name").Text();
  if (plan.name.empty()) view.At("name").Refuse("is empty; results are filed under it");
  if (view.Has("revision")) plan.revision = view.At("revision").Text();
  if (view.Has("stop_on_error")) plan.stop_on_error = view.At("stop_on_error").Boolean();
  const Limits common = view.Has("limits") ? ReadLimitsOf(plan, view.At("limits")) : Limits();
  std::set<std::string> used;
  std::set<std::string> names;
  for (const JsonView& step : view.At("steps").Elements()) {
    plan.steps.push_back(ReadStep(plan, step, common, used));
    if (!names.insert(plan.steps.back().name).second) {
      step.Refuse("the name \"" + Printable(plan.steps.back().name) + "\" is given twice");
    }
  }
  if (plan.steps.empty()) view.At("steps").Refuse("is empty; nothing would be measured");
  for (const auto& [name, limit] : common.by_name) {
    if (used.count(name) == 0) view.Refuse("its limits hold " + name + ", which no step measures");
  }
  return plan;
}

Plan PlanOf(const Request& request, const Limits& limits) {
  Plan plan;
  plan.steps = {{"", request, limits}};
  return plan;
}

Request RequestFor(const Plan& plan, const PlanStep& step, const std::string& unit) {
  Request request = step.request;
  for (Input& input : request.inputs) {
    if (input.is_path()) input.name = Placed(plan, input.name, unit);
  }
  const Spec& spec = FindMeasurement(request.measurement)->spec();
  for (auto& [name, value] : request.parameters.items()) {
    if (value.is_string() && NamesFile(spec, name)) value = Placed(plan, value.get<std::string>(), unit);
  }
  return request;
}

std::string NewPlan() {
  return R"({
  "name": "phone-a cameras",
  "revision": "1",
  "limits": {
    "name": "phone-a",
    "revision": "1",
    "limits": {
      "camera_autofocus_mtf50_vertical": {"min": 0.28, "marginal_min": 0.3, "unit": "Nyquist"},
      "camera_autofocus_mtf50_horizontal": {"min": 0.28, "marginal_min": 0.3, "unit": "Nyquist"}
    }
  },
  "stop_on_error": false,
  "steps": [
    {
      "name": "main camera",
      "measurement": "camera_autofocus",
      "inputs": ["{unit}/main.jpg"],
      "parameters": {"threshold": 125}
    },
    {
      "name": "main camera colours",
      "measurement": "camera_capture",
      "inputs": ["{unit}/main.jpg"]
    }
  ]
}
)";
}

std::string Describe(const Plan& plan) {
  std::string text =
      Format("%s, revision %s: %s for each unit%s\n", Printable(plan.name).c_str(),
             plan.revision.empty() ? "-" : Printable(plan.revision).c_str(), Count(plan.steps.size(), "step").c_str(),
             plan.stop_on_error ? ", the first error ends it" : "");
  for (std::size_t i = 0; i < plan.steps.size(); ++i) {
    const PlanStep& step = plan.steps[i];
    const Request request = RequestFor(plan, step, kUnit);
    text += Format("%zu. %s: %s\n", i + 1, Printable(step.name).c_str(), request.measurement.c_str());
    for (const Input& input : request.inputs) text += "   reads " + Printable(input.name) + "\n";
    for (const auto& [name, value] : request.parameters.items())
      text += "   " + name + " = " + Printable(value.dump()) + "\n";
    for (const auto& [name, value] : request.properties.items())
      text += "   property " + name + " = " + Printable(value.dump()) + "\n";
    if (request.fake) text += "   in fake mode\n";
    if (step.limits.by_name.empty()) text += "   no limits: figures are only measured\n";
    for (const auto& [name, limit] : step.limits.by_name) text += "   judges " + name + "\n";
  }
  return text;
}

Record MeasureStep(const PlanStep& step, const Request& request, const std::string& unit, const std::string& station) {
  Record record = MeasureAnew(request, step.limits);
  record.dut_id = unit;
  record.station_id = station;
  return record;
}

}  // namespace qv
