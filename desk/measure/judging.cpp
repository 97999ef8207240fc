// A record's figures held against their limits.

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/record.h"

namespace qv {

namespace {

bool Within(double value, const std::optional<double>& min, const std::optional<double>& max) {
  return std::isfinite(value) && !(min && value < *min) && !(max && value > *max);
}

struct Verdict {
  Decision decision;
  bool marginal;
};

// Without marginal bounds of its own, a value near its limit is marginal.
Verdict VerdictOn(double value, const Uncertainty& u, const Limit& limit, const DecisionRule& rule) {
  const Decision decision = Decide(value, u.standard, u.expanded, {limit.min, limit.max}, rule);
  const bool bounded = limit.marginal_min || limit.marginal_max;
  const bool doubtful = decision.pass && !Within(value, limit.marginal_min, limit.marginal_max);
  return {decision, bounded ? doubtful : decision.near_limit};
}

// "patch 3 (4.2)", "0.5 Nyquist (0.31)"
std::string EntryText(const Reading& m, std::size_t place) {
  const Unit& axis = *m.info->figure->axis;
  const std::string where = EntriesName(axis).empty() ? Format("%.4g %s", m.axis[place], axis.suffix)
                                                      : Format("%s %.0f", axis.name, m.axis[place]);
  return where + Format(" (%.4g)", m.values[place]);
}

std::string BrokenSentence(const Reading& m) {
  constexpr std::size_t kMost = 10;
  std::string text;
  std::size_t broken = 0;
  for (const EntryVerdict& entry : m.entries) {
    if (entry.decision.pass || ++broken > kMost) continue;
    text += (text.empty() ? "" : ", ") + EntryText(m, entry.place);
  }
  if (broken > kMost) text += Format(" and %zu more", broken - kMost);
  return m.info->name + ": outside " + (broken == 1 ? "its limit: " : "their limits: ") + text;
}

// What a limit asks for and a run did not give: without a standard, say, or with fewer places.
std::string UnsetSentence(const Reading& m) {
  if (!m.values.empty()) return m.info->name + ": the limits ask for " + m.info->figure->axis->name + "s that it lacks";
  return m.info->name + ": the limits ask for it, and it was not measured; was it given what it compares with?";
}

bool LacksUncertainty(const Reading& m) {
  return m.uncertainties.empty() && m.info->figure->number == Number::kReal &&
         std::any_of(m.values.begin(), m.values.end(), [](double value) { return std::isfinite(value); });
}

}  // namespace

void Reading::Judge(const DecisionRule& rule) {
  if (info->figure->axis != nullptr) return JudgeEntries(rule);
  const Verdict verdict = VerdictOn(value(), uncertainty(), limit, rule);
  decision = verdict.decision;
  marginal = verdict.marginal;
  outcome = decision->pass ? Outcome::kPass : Outcome::kFail;
}

void Reading::JudgeEntries(const DecisionRule& rule) {
  entries.clear();
  marginal = false;
  decision = Decision{true, false, 0, 0};
  std::size_t numbered = 0;
  for (std::size_t i = 0; i < values.size(); ++i) {
    const Limit& own = limit.Of(axis[i]);
    numbered += &own == &limit ? 0 : 1;
    if (!own.given()) continue;
    const Verdict verdict =
        VerdictOn(values[i], i < uncertainties.size() ? uncertainties[i] : Uncertainty(), own, rule);
    entries.push_back({i, verdict.decision, verdict.marginal});
    marginal = marginal || verdict.marginal;
    // A list fails with any entry, as surely as the surest of those; it passes with all, as surely as the least sure.
    const auto rank = [](const Decision& d) {
      return std::make_pair(d.pass, d.pass ? -d.wrong_probability : d.wrong_probability);
    };
    if (entries.size() == 1 || rank(verdict.decision) < rank(*decision)) decision = verdict.decision;
  }
  outcome = decision->pass ? Outcome::kPass : Outcome::kFail;
  if (numbered < limit.by_number.size()) outcome = Outcome::kUnset;
}

void Record::Judge() {
  for (Remark& remark : remarks) {
    if (limits.accept_doubts.count(remark.name()) != 0) remark.Accept();
  }
  for (const auto& [name, limit] : limits.by_name) {  // what was asked of this test and not measured is shown as such
    const FigureInfo* const info = FindFigure(name);
    if (info->measurement != phase.name || phase.Find(info->figure->name) != nullptr) continue;
    Reading unset;
    unset.info = info;
    unset.limit = limit;
    unset.outcome = Outcome::kUnset;
    phase.readings.push_back(unset);
  }
  const bool ran = measured();  // else what is missing has been told
  for (Reading& m : phase.readings) {
    const auto limit = limits.by_name.find(m.info->name);
    if (limit == limits.by_name.end()) continue;
    if (m.outcome != Outcome::kUnset || !m.values.empty()) {
      m.limit = limit->second;
      if (limits.rule.kind != DecisionRule::Kind::kSimple && LacksUncertainty(m)) {
        m.outcome = Outcome::kUnset;
        Say(Remark::kWarning, "no_uncertainty",
            Format("%s: the limits ask for the rule \"%s\", and how far this figure may be trusted is not known%s",
                   m.info->name.c_str(), limits.rule.Name(),
                   request.parameters.contains("uncertainty") ? "; give --uncertainty" : ""),
            m.info->figure->name);
        continue;
      }
      m.Judge(limits.rule);
    }
    if (m.info->figure->axis != nullptr && m.outcome == Outcome::kFail) {
      Say(Remark::kWarning, "entries_broken", BrokenSentence(m), m.info->figure->name);
    }
    if (ran && m.outcome == Outcome::kUnset) {
      Say(Remark::kWarning, "not_measured", UnsetSentence(m), m.info->figure->name);
    }
  }
}

}  // namespace qv
