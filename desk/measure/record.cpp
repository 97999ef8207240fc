#include "desk/measure/record.h"

#include <algorithm>
#include <cmath>
#include <stdexcept>
#include <utility>

#include "desk/base/digest.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/measure/codes.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

Json JsonOf(const Unit& unit) {
  return {{"name", unit.name}, {"code", unit.code == nullptr ? Json() : Json(unit.code)}, {"suffix", unit.suffix}};
}

const char* NonFiniteName(double value) { return std::isnan(value) ? "nan" : value > 0 ? "inf" : "-inf"; }

Json JsonOf(double value, Number number) {
  if (!std::isfinite(value)) return nullptr;
  return number == Number::kWhole ? Json(static_cast<std::int64_t>(value)) : Json(value);
}

Json JsonOf(const Limit& limit) {
  Json json = Json::object();
  const auto add = [&](const char* key, const std::optional<double>& bound) {
    if (bound) json[key] = *bound;
  };
  add("min", limit.min);
  add("max", limit.max);
  add("marginal_min", limit.marginal_min);
  add("marginal_max", limit.marginal_max);
  return json;
}

Json JsonOf(const FigureLimit& limit, const Figure& figure) {
  if (figure.axis == nullptr) return JsonOf(limit);
  Json json = Json::object();
  if (limit.Limit::given()) json["each"] = JsonOf(static_cast<const Limit&>(limit));
  for (const auto& [number, own] : limit.by_number) {
    json[EntriesName(*figure.axis)][std::to_string(number)] = JsonOf(own);
  }
  return json;
}

// Of one value, or lists that go with the values.
Json JsonOf(const Reading& m, double Uncertainty::*part) {
  if (m.info->figure->axis == nullptr) return m.uncertainties[0].*part;
  Json list = Json::array();
  for (const Uncertainty& u : m.uncertainties) list.push_back(u.*part);
  return list;
}

// Where an entry of a list stands.
Json AxisJson(const Reading& m, std::size_t place) {
  const std::string suffix = m.info->figure->axis->suffix;
  const bool whole = suffix == "1" || suffix == "level";
  return JsonOf(m.axis[place], whole ? Number::kWhole : Number::kReal);
}

Json JsonOfUncertainty(const Reading& m) {
  return {{"standard", JsonOf(m, &Uncertainty::standard)},
          {"expanded", JsonOf(m, &Uncertainty::expanded)},
          {"coverage_factor", JsonOf(m, &Uncertainty::coverage_factor)},
          {"method", m.uncertainties[0].method}};
}

Json JsonOfRepeats(const Reading& m) {
  Json values = Json::array();
  for (const double value : m.repeats) values.push_back(JsonOf(value, m.info->figure->number));
  return {{"values", values}, {"spread", JsonOf(Spread(m.repeats), Number::kReal)}};
}

// Of one value, or lists that go with the values: null for an entry without a limit.
Json JsonOfDecision(const Reading& m, const DecisionRule& rule) {
  const bool known = !m.uncertainties.empty();
  if (m.info->figure->axis == nullptr) {
    return {{"rule", rule.Name()},
            {"guard_band", m.decision->guard_band},
            {"wrong_probability", known ? Json(m.decision->wrong_probability) : Json()}};
  }
  const Json none = Json(m.values.size(), nullptr);
  Json json = {{"rule", rule.Name()},
               {"guard_band", none},
               {"wrong_probability", none},
               {"broken", Json::array()},
               {"marginal", Json::array()}};
  for (const EntryVerdict& entry : m.entries) {
    json["guard_band"][entry.place] = entry.decision.guard_band;
    if (known) json["wrong_probability"][entry.place] = entry.decision.wrong_probability;
    if (!entry.decision.pass) json["broken"].push_back(AxisJson(m, entry.place));
    if (entry.marginal) json["marginal"].push_back(AxisJson(m, entry.place));
  }
  return json;
}

Json JsonOf(const Reading& m, const DecisionRule& rule) {
  Json json = {{"name", m.info->name}, {"outcome", Name(m.outcome)}};
  if (m.marginal) json["marginal"] = true;
  if (m.outcome == Outcome::kUnset && m.values.empty()) {
    // No value: it was asked for, and not measured.
  } else if (m.info->figure->axis != nullptr) {
    Json& points = json["measured_value"] = Json::array();
    for (std::size_t i = 0; i < m.values.size(); ++i) {
      points.push_back({AxisJson(m, i), JsonOf(m.values[i], m.info->figure->number)});
    }
    Json dimension = JsonOf(*m.info->figure->axis);
    dimension["description"] = "";
    json["dimensions"] = Json::array({dimension});  // braces alone are a copy to some compilers
  } else {
    json["measured_value"] = JsonOf(m.value(), m.info->figure->number);
  }
  const auto bad = std::find_if(m.values.begin(), m.values.end(), [](double v) { return !std::isfinite(v); });
  if (bad != m.values.end()) json["non_finite"] = NonFiniteName(*bad);
  if (!m.repeats.empty()) json["repeats"] = JsonOfRepeats(m);
  if (!m.uncertainties.empty()) json["uncertainty"] = JsonOfUncertainty(m);
  json["units"] = JsonOf(m.info->figure->unit);
  json["method"] = m.info->figure->method.name;
  if (const Json limits = JsonOf(m.limit, *m.info->figure); !limits.empty()) json["limits"] = limits;
  if (m.decision) json["decision"] = JsonOfDecision(m, rule);
  json["docstring"] = Explanation(*m.info->figure);
  return json;
}

Json JsonOf(const Remark& remark, int code) {
  Json json = {
      {"code", code}, {"description", remark.sentence()}, {"name", remark.name()}, {"weight", remark.weight()}};
  if (!remark.figure().empty()) json["figure"] = remark.figure();
  return json;
}

Json JsonOf(const RecordedInput& input) {
  return {{"slot", input.slot},
          {"path", input.path},
          {"sha256", input.sha256.empty() ? Json() : Json(input.sha256)},
          {"pixels_hash", input.pixels_hash.empty() ? Json() : Json(input.pixels_hash)},
          {"width", input.width},
          {"height", input.height}};
}

Json JsonOf(const Record& record, const Phase& phase) {
  Json measurements = Json::object();
  for (const Reading& m : phase.readings) measurements[m.info->name] = JsonOf(m, record.limits.rule);
  Json attachments = Json::object();
  for (const Attachment& a : phase.attachments) {
    attachments[a.name] = {{"mimetype", a.mimetype}, {"sha1", a.sha1}, {"path", a.path}};
  }
  return {{"name", phase.name},
          {"outcome", Name(record.outcome())},
          {"result_code", phase.code},
          {"marginal", record.marginal()},
          {"start_time_millis", phase.start_millis},
          {"end_time_millis", phase.end_millis},
          {"measurements", measurements},
          {"attachments", attachments}};
}

// What was judged by: a name and revision may stay when the bounds change, so their digest stands beside them.
Json JsonOf(const Limits& limits) {
  Json json = {{"name", limits.name}, {"revision", limits.revision}};
  if (!limits.given() && limits.accept_doubts.empty()) return json;
  Json content = {{"limits", Json::object()}, {"accept_doubts", limits.accept_doubts}};
  for (const auto& [name, limit] : limits.by_name) content["limits"][name] = JsonOf(limit, *FindFigure(name)->figure);
  if (limits.rule.kind != DecisionRule::Kind::kSimple) {
    json["decision"] = content["decision"] = {{"rule", limits.rule.Name()}, {"factor", limits.rule.factor}};
  }
  if (!limits.accept_doubts.empty()) json["accept_doubts"] = limits.accept_doubts;
  json["sha256"] = HexDigest(content.dump(), "SHA256");
  return json;
}

}  // namespace

const char* Remark::weight() const {
  constexpr const char* kNotes[] = {"warning", "miss", "no judgement"};
  return note_ ? kNotes[*note_] : accepted_ ? "accepted doubt" : "doubt";
}

const char* Name(Outcome outcome) {
  switch (outcome) {
    case Outcome::kPass: return "PASS";
    case Outcome::kFail: return "FAIL";
    case Outcome::kMeasured: return "MEASURED";
    case Outcome::kError: return "ERROR";
    default: return "UNSET";
  }
}

Reading& Phase::New(const std::string& figure) {
  Reading m;
  m.info = FindFigure(name + "_" + figure);
  if (m.info == nullptr) throw std::logic_error("no such figure: " + name + "_" + figure);
  return readings.emplace_back(std::move(m));
}

Reading& Phase::Add(const std::string& figure, double value) {
  Reading& m = New(figure);
  m.values = {value};
  return m;
}

Reading& Phase::Add(const std::string& figure, std::vector<double> axis, std::vector<double> values) {
  Reading& m = New(figure);
  m.axis = std::move(axis);
  m.values = std::move(values);
  return m;
}

Reading* Phase::Find(const std::string& figure) {
  return const_cast<Reading*>(std::as_const(*this).Find(figure));  // NOLINT(cppcoreguidelines-pro-type-const-cast)
}

const Reading* Phase::Find(const std::string& figure) const {
  for (const Reading& m : readings) {
    if (m.info->name == name + "_" + figure) return &m;
  }
  return nullptr;
}

void Reading::Trust(std::vector<Uncertainty> known) {
  const auto finite = [](const Uncertainty& u) { return std::isfinite(u.standard) && std::isfinite(u.expanded); };
  if (known.size() == values.size() && std::all_of(known.begin(), known.end(), finite))
    uncertainties = std::move(known);
}

bool Record::measured() const {
  return phase.code == QV_SUCCESS && std::none_of(remarks.begin(), remarks.end(),
                                                  [](const Remark& remark) { return remark.Is(Remark::kNoJudgement); });
}

bool Record::doubtful() const {
  return measured() &&
         std::any_of(remarks.begin(), remarks.end(), [](const Remark& remark) { return remark.doubts(); });
}

Outcome Record::outcome() const {
  const auto any = [&](Outcome outcome) {
    return std::any_of(phase.readings.begin(), phase.readings.end(),
                       [=](const Reading& m) { return m.outcome == outcome; });
  };
  if (!measured() || doubtful() || any(Outcome::kUnset)) return Outcome::kError;
  if (any(Outcome::kFail)) return Outcome::kFail;
  return limited() ? Outcome::kPass : Outcome::kMeasured;
}

bool Record::limited() const {
  return std::any_of(phase.readings.begin(), phase.readings.end(), [](const Reading& m) { return m.limit.given(); });
}

bool Record::marginal() const {
  return std::any_of(phase.readings.begin(), phase.readings.end(), [](const Reading& m) { return m.marginal; });
}

std::string Record::MissSentence() const {
  std::string text;
  for (const Remark& remark : remarks) text += (text.empty() ? "" : "; ") + remark.sentence();
  if (phase.code == QV_SUCCESS) return text;
  // The circle check answers a miss with 0.
  const ResultCode& row = FindCode(phase.code == QV_DONE ? QV_ERROR_PATTERN_NOT_FOUND : phase.code);
  if (text.empty()) {
    for (std::size_t i = 0; i < std::min<std::size_t>(inputs.size(), 2); ++i)
      text += (i == 0 ? "" : ", ") + inputs[i].path;
    text += (text.empty() ? "" : ": ") + std::string(row.meaning);
  }
  const bool advised = !advice.empty() && (row.code == QV_ERROR_INVALID_ARGUMENT || !meaning.empty());
  const std::string look_at = advised ? advice : row.look_at;
  if (row.code != phase.code) {
    return Format("%s (code %d: %s); %s", text.c_str(), phase.code, row.meaning, look_at.c_str());
  }
  // Of a refused input its own reason says more than that an argument is not valid.
  const bool told = row.code == QV_ERROR_INVALID_ARGUMENT && meaning.empty();
  const std::string meant = told ? "" : ": " + (meaning.empty() ? row.meaning : meaning);
  return Format("%s (code %d, %s%s); %s", text.c_str(), row.code, row.name, meant.c_str(), look_at.c_str());
}

Json Record::ToJson() const {
  Json json;
  json["schema"] = kRecordSchema;
  json["dut_id"] = dut_id;
  json["station_id"] = station_id;
  json["start_time_millis"] = start_millis;
  json["end_time_millis"] = end_millis;
  json["outcome"] = Name(outcome());
  json["outcome_details"] = Json::array();
  for (const Remark& remark : remarks) json["outcome_details"].push_back(JsonOf(remark, phase.code));
  json["marginal"] = marginal();
  json["metadata"] = {{"test_name", test_name},
                      {"test_index", test_index ? Json(*test_index) : Json()},
                      {"library_version", QVTESTER_VERSION},
                      {"command", command},
                      {"limits", JsonOf(limits)},
                      {"properties", properties}};
  json["request"] = qv::ToJson(request);
  json["phases"] = Json::array({JsonOf(*this, phase)});
  json["inputs"] = Json::array();
  for (const RecordedInput& input : inputs) json["inputs"].push_back(JsonOf(input));
  json["log_records"] = Json::array();
  for (const LogLine& line : log_lines) {
    json["log_records"].push_back(
        {{"level", "DEBUG"}, {"logger_name", "QVTEST"}, {"timestamp_millis", line.millis}, {"message", line.text}});
  }
  return json;
}

std::string Record::ToText() const { return ToJson().dump(2, ' ', false, Json::error_handler_t::replace) + "\n"; }

}  // namespace qv
