#include "desk/measure/limits.h"

#include <array>
#include <utility>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/figures.h"

namespace qv {

namespace {

constexpr std::array<std::pair<const char*, std::optional<double> Limit::*>, 4> kBounds = {
    {{"min", &Limit::min},
     {"max", &Limit::max},
     {"marginal_min", &Limit::marginal_min},
     {"marginal_max", &Limit::marginal_max}}};

const FigureInfo& FigureOf(const JsonView& limits, const std::string& name) {
  if (const FigureInfo* const info = FindFigure(name)) return *info;
  std::vector<std::string> known;
  for (const FigureInfo& info : AllFigures()) known.push_back(info.name);
  limits.Refuse(Printable(name) + ": no measurement has a figure of this name" + DidYouMean(name, known));
}

// An outer bound that lies inside another leaves nothing to pass, or nothing between them to be marginal.
void RefuseDisorder(const JsonView& view, const Limit& limit) {
  const auto above = [](const std::optional<double>& low, const std::optional<double>& high) {
    return low && high && *low > *high;
  };
  if (above(limit.min, limit.max)) view.Refuse("its min lies above its max");
  if (above(limit.min, limit.marginal_min)) view.Refuse("its min lies above its marginal_min");
  if (above(limit.marginal_max, limit.max)) view.Refuse("its marginal_max lies above its max");
  if (above(limit.marginal_min, limit.marginal_max)) view.Refuse("its marginal_min lies above its marginal_max");
}

Limit ReadLimit(const FigureInfo& info, const JsonView& view) {
  if (info.figure->axis != nullptr) view.Refuse("a list has no limits");
  view.KnowOnly({"min", "max", "marginal_min", "marginal_max", "unit"});
  if (view.Has("unit")) {
    const std::string unit = info.figure->unit.suffix;
    const std::string given = view.At("unit").Text();
    if (given != unit) view.Refuse("its unit is \"" + unit + "\", not \"" + Printable(given) + "\"");
  }
  Limit limit;
  for (const auto& [name, bound] : kBounds) {
    if (view.Has(name)) limit.*bound = view.At(name).Number();
  }
  if (!limit.given()) view.Refuse("it has no bound");
  RefuseDisorder(view, limit);
  return limit;
}

// {"rule": "guarded", "factor": 1.0}
DecisionRule ReadRule(const JsonView& view) {
  constexpr double kLargestFactor = 10;
  view.KnowOnly({"rule", "factor"});
  DecisionRule rule;
  const std::string name = view.At("rule").Text();
  const auto kind = ParseDecisionRule(name);
  if (!kind) view.Refuse("its rule \"" + Printable(name) + "\" is none of simple, guarded, guarded_rejection");
  rule.kind = *kind;
  if (view.Has("factor")) rule.factor = view.At("factor").Number();
  if (!(rule.factor > 0 && rule.factor <= kLargestFactor)) view.Refuse("its factor does not lie above 0 and up to 10");
  return rule;
}

}  // namespace

Limits ReadLimits(const std::string& path) { return LimitsFromJson(ReadJson(path), Printable(path)); }

Limits LimitsFromJson(const Json& json, const std::string& where) {
  const JsonView view(json, where);
  view.KnowOnly({"name", "revision", "limits", "accept_doubts", "decision"});
  Limits limits;
  if (view.Has("name")) limits.name = view.At("name").Text();
  if (view.Has("revision")) limits.revision = view.At("revision").Text();
  if (view.Has("decision")) limits.rule = ReadRule(view.At("decision"));
  if (view.Has("accept_doubts")) {
    for (const JsonView& doubt : view.At("accept_doubts").Elements()) limits.accept_doubts.insert(doubt.Text());
  }
  const JsonView all = view.At("limits");
  for (const auto& [name, limit] : all.Members()) limits.by_name[name] = ReadLimit(FigureOf(all, name), limit);
  if (limits.by_name.empty()) all.Refuse("is empty; nothing would be judged");
  return limits;
}

}  // namespace qv
