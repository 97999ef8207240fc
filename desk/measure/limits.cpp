#include "desk/measure/limits.h"

#include <stdexcept>

#include "desk/base/failure.h"
#include "desk/base/json.h"
#include "desk/measure/figures.h"

namespace qv {

namespace {

Limit ReadLimit(const std::string& where, const std::string& name, const Json& json) {
  const auto refuse = [&](const std::string& why) { throw Failure(kWrongUsage, where + why); };
  const FigureInfo* info = FindFigure(name);
  if (info == nullptr) refuse("no measurement has this name");
  if (info->figure->axis != nullptr) refuse("a list has no limits");
  if (!json.is_object()) refuse("it is " + json.dump() + ", not an object of bounds");
  Limit limit;
  for (const auto& [key, value] : json.items()) {
    if (key == "unit") {
      const char* const unit = info->figure->unit.suffix;
      if (value != unit) refuse(std::string("its unit is \"") + unit + "\", not " + value.dump());
      continue;
    }
    std::optional<double>* const bound = key == "min"            ? &limit.min
                                         : key == "max"          ? &limit.max
                                         : key == "marginal_min" ? &limit.marginal_min
                                         : key == "marginal_max" ? &limit.marginal_max
                                                                 : nullptr;
    if (bound == nullptr) refuse("\"" + key + "\" is neither a bound nor a unit");
    if (!value.is_number()) refuse(key + " is " + value.dump() + ", not a number");
    *bound = value.get<double>();
  }
  if (!limit.given()) refuse("it has no bound");
  if (limit.min && limit.max && *limit.min > *limit.max) refuse("its min lies above its max");
  return limit;
}

// "decision": {"rule": "guarded", "factor": 1.0}; simple where there is none.
DecisionRule ReadRule(const std::string& where, const Json& json) {
  DecisionRule rule;
  if (!json.contains("decision")) return rule;
  const auto refuse = [&](const std::string& why) { throw Failure(kWrongUsage, where + why); };
  const Json& decision = json["decision"];
  if (!decision.is_object() || !decision.contains("rule"))
    refuse("it is " + decision.dump() + ", not an object with a rule");
  for (const auto& [key, value] : decision.items()) {
    if (key == "rule") {
      const auto kind = value.is_string() ? ParseDecisionRule(value.get<std::string>()) : std::nullopt;
      if (!kind) refuse(value.dump() + " is none of simple, guarded, guarded_rejection");
      rule.kind = *kind;
    } else if (key == "factor") {
      rule.factor = value.is_number() ? value.get<double>() : -1;
      if (!(rule.factor > 0 && rule.factor <= 10))
        refuse("factor is " + value.dump() + ", no number above 0 and up to 10");
    } else {
      refuse("\"" + key + "\" is neither rule nor factor");
    }
  }
  return rule;
}

}  // namespace

Limits ReadLimits(const std::string& path) {
  try {
    const Json json = ReadJson(path);
    if (!json.is_object() || !json.contains("limits") || !json["limits"].is_object()) {
      throw std::runtime_error("it holds no object \"limits\"");
    }
    Limits limits = {json.value("name", ""), json.value("revision", ""), ReadRule(path + ": decision: ", json), {}};
    for (const auto& [name, limit] : json["limits"].items()) {
      limits.by_name[name] = ReadLimit(path + ": limit of " + name + ": ", name, limit);
    }
    return limits;
  } catch (const Failure&) {
    throw;
  } catch (const std::exception& e) {
    throw Failure(kWrongUsage, path + ": not a limits file (" + e.what() + ")");
  }
}

}  // namespace qv
