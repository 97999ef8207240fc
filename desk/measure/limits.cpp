#include "desk/measure/limits.h"

#include <array>
#include <utility>

#include "chart/chart_layout.h"
#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/doubt_names.h"
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

void CheckUnit(const Figure& figure, const JsonView& view) {
  if (!view.Has("unit")) return;
  const std::string unit = figure.unit.suffix;
  const std::string given = view.At("unit").Text();
  if (given != unit) view.Refuse("its unit is \"" + unit + "\", not \"" + Printable(given) + "\"");
}

Limit ReadBounds(const Figure& figure, const JsonView& view) {
  view.KnowOnly({"min", "max", "marginal_min", "marginal_max", "unit"});
  CheckUnit(figure, view);
  Limit limit;
  for (const auto& [name, bound] : kBounds) {
    if (view.Has(name)) limit.*bound = view.At(name).Number();
  }
  if (!limit.given()) view.Refuse("it has no bound");
  RefuseDisorder(view, limit);
  return limit;
}

// The bounds of entries by their numbers: {"7": {"max": 2}}.
std::map<int, Limit> ReadNumbered(const Figure& figure, const JsonView& view) {
  constexpr std::size_t kMostDigits = 6;
  std::map<int, Limit> limits;
  for (const auto& [number, bounds] : view.Members()) {
    const bool whole = !number.empty() && number.size() <= kMostDigits && (number[0] != '0' || number.size() == 1) &&
                       number.find_first_not_of("0123456789") == std::string::npos;
    if (!whole || (figure.axis == &kPatchAxis && std::stoul(number) >= kPatches.size())) {
      view.Refuse("\"" + Printable(number) + "\" is the number of no " + figure.axis->name);
    }
    limits[std::stoi(number)] = ReadBounds(figure, bounds);
  }
  if (limits.empty()) view.Refuse("is empty");
  return limits;
}

// {"each": {"max": 3}, "patches": {"7": {"max": 2}}}
FigureLimit ReadListLimit(const Figure& figure, const JsonView& view) {
  const std::string entries = EntriesName(*figure.axis);
  const bool numbered = !entries.empty();
  if (!view.Has("each") && !(numbered && view.Has(entries.c_str()))) {
    view.Refuse(R"(a list takes its bounds as {"each": {"max": 3}})" +
                (numbered ? R"( or by number, as {")" + entries + R"(": {"7": {"max": 2}}})" : std::string()));
  }
  view.KnowOnly(numbered ? std::vector<std::string>{"each", entries, "unit"}
                         : std::vector<std::string>{"each", "unit"});
  CheckUnit(figure, view);
  FigureLimit limit;
  if (view.Has("each")) static_cast<Limit&>(limit) = ReadBounds(figure, view.At("each"));
  if (numbered && view.Has(entries.c_str())) limit.by_number = ReadNumbered(figure, view.At(entries));
  return limit;
}

FigureLimit ReadLimit(const FigureInfo& info, const JsonView& view) {
  if (info.figure->axis != nullptr) return ReadListLimit(*info.figure, view);
  if (view.Has("each")) view.Refuse(R"("each" is for lists, and this is a single value)");
  return {ReadBounds(*info.figure, view), {}};
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

std::set<std::string> ReadAccepted(const JsonView& view) {
  std::vector<std::string> known;
  for (const DoubtInfo& info : Doubts()) known.emplace_back(info.name);
  std::set<std::string> accepted;
  for (const JsonView& doubt : view.Elements()) {
    const std::string name = doubt.Text();
    if (FindDoubt(name) == nullptr) {
      doubt.Refuse("\"" + Printable(name) + "\" is no doubt; `qvtester explain doubts` lists them" +
                   DidYouMean(name, known));
    }
    accepted.insert(name);
  }
  return accepted;
}

}  // namespace

const Limit& FigureLimit::Of(double number) const {
  const auto own = by_number.empty() ? by_number.end() : by_number.find(static_cast<int>(number));
  return own == by_number.end() ? *this : own->second;
}

std::string EntriesName(const Unit& axis) {
  const std::string name = axis.name;
  if (axis.suffix != std::string("1")) return "";
  const bool hissing = name.size() > 2 && name.compare(name.size() - 2, 2, "ch") == 0;
  return name + (hissing ? "es" : "s");
}

Limits ReadLimits(const std::string& path) { return LimitsFromJson(ReadJson(path), Printable(path)); }

Limits LimitsFromJson(const Json& json, const std::string& where) {
  const JsonView view(json, where);
  view.KnowOnly({"name", "revision", "limits", "accept_doubts", "decision"});
  Limits limits;
  if (view.Has("name")) limits.name = view.At("name").Text();
  if (view.Has("revision")) limits.revision = view.At("revision").Text();
  if (view.Has("decision")) limits.rule = ReadRule(view.At("decision"));
  if (view.Has("accept_doubts")) limits.accept_doubts = ReadAccepted(view.At("accept_doubts"));
  const JsonView all = view.At("limits");
  for (const auto& [name, limit] : all.Members()) limits.by_name[name] = ReadLimit(FigureOf(all, name), limit);
  if (limits.by_name.empty()) all.Refuse("is empty; nothing would be judged");
  return limits;
}

}  // namespace qv
