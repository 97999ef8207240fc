#include "desk/measure/record.h"

#include <algorithm>
#include <cmath>

#include "desk/base/json.h"
#include "desk/base/side_output.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

Json ToJson(const Unit& unit) {
  return {{"name", unit.name}, {"code", unit.code == nullptr ? Json() : Json(unit.code)}, {"suffix", unit.suffix}};
}

const char* NonFiniteName(double value) { return std::isnan(value) ? "nan" : value > 0 ? "inf" : "-inf"; }

Json ToJson(double value, Number number) {
  if (!std::isfinite(value)) return nullptr;
  return number == Number::kWhole ? Json(static_cast<std::int64_t>(value)) : Json(value);
}

Json ToJson(const Limit& limit) {
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

Json ToJson(const Measurement& m) {
  Json json = {{"name", m.info->name}, {"outcome", Name(m.outcome)}};
  if (m.marginal) json["marginal"] = true;
  if (m.outcome == Outcome::kUnset) {
    // No value: it was asked for, and not measured.
  } else if (m.info->figure->axis != nullptr) {
    Json& points = json["measured_value"] = Json::array();
    const std::string axis_suffix = m.info->figure->axis->suffix;
    const bool whole_axis = axis_suffix == "1" || axis_suffix == "level";
    for (std::size_t i = 0; i < m.values.size(); ++i) {
      points.push_back({ToJson(m.axis[i], whole_axis ? Number::kWhole : Number::kReal),
                        ToJson(m.values[i], m.info->figure->number)});
    }
    Json dimension = ToJson(*m.info->figure->axis);
    dimension["description"] = "";
    json["dimensions"] = Json::array({dimension});  // braces alone are a copy to some compilers
  } else {
    json["measured_value"] = ToJson(m.value(), m.info->figure->number);
  }
  const auto bad = std::find_if(m.values.begin(), m.values.end(), [](double v) { return !std::isfinite(v); });
  if (bad != m.values.end()) json["non_finite"] = NonFiniteName(*bad);
  json["units"] = ToJson(m.info->figure->unit);
  json["method"] = m.info->figure->method.name;
  if (const Json limits = ToJson(m.limit); !limits.empty()) json["limits"] = limits;
  json["docstring"] = Explanation(*m.info->figure);
  return json;
}

bool Within(double value, const std::optional<double>& min, const std::optional<double>& max) {
  return std::isfinite(value) && !(min && value < *min) && !(max && value > *max);
}

}  // namespace

const char* Name(Outcome outcome) {
  switch (outcome) {
    case Outcome::kPass: return "PASS";
    case Outcome::kFail: return "FAIL";
    case Outcome::kError: return "ERROR";
    default: return "UNSET";
  }
}

Measurement& Phase::New(const std::string& figure) {
  Measurement m;
  m.info = FindMeasurement(name + "_" + figure);
  if (m.info == nullptr) throw std::logic_error("no such measurement: " + name + "_" + figure);
  return measurements.emplace_back(std::move(m));
}

void Phase::Add(const std::string& figure, double value) { New(figure).values = {value}; }

void Phase::Add(const std::string& figure, std::vector<double> axis, std::vector<double> values) {
  Measurement& m = New(figure);
  m.axis = std::move(axis);
  m.values = std::move(values);
}

const Measurement* Phase::Find(const std::string& figure) const {
  for (const Measurement& m : measurements) {
    if (m.info->name == name + "_" + figure) return &m;
  }
  return nullptr;
}

void Record::Judge() {
  for (const auto& [name, limit] : limits.by_name) {  // what was asked of this test and not measured is shown as such
    const MeasurementInfo* const info = FindMeasurement(name);
    if (info->phase != phase.name || phase.Find(info->figure->name) != nullptr) continue;
    phase.measurements.push_back({info, {}, {}, limit, Outcome::kUnset, false});
  }
  for (Measurement& m : phase.measurements) {
    const auto limit = limits.by_name.find(m.info->name);
    if (limit == limits.by_name.end() || m.outcome == Outcome::kUnset) continue;
    m.limit = limit->second;
    m.outcome = Within(m.value(), m.limit.min, m.limit.max) ? Outcome::kPass : Outcome::kFail;
    m.marginal = m.outcome == Outcome::kPass && !Within(m.value(), m.limit.marginal_min, m.limit.marginal_max);
  }
}

Outcome Record::outcome() const {
  if (phase.code != QV_SUCCESS || cannot_judge) return Outcome::kError;
  const bool failed = std::any_of(phase.measurements.begin(), phase.measurements.end(),
                                  [](const Measurement& m) { return m.outcome == Outcome::kFail; });
  return failed || doubtful ? Outcome::kFail : Outcome::kPass;
}

bool Record::limited() const {
  return std::any_of(phase.measurements.begin(), phase.measurements.end(),
                     [](const Measurement& m) { return m.limit.given(); });
}

std::string Record::ToText() const { return ToJson().dump(2, ' ', false, Json::error_handler_t::replace) + "\n"; }

bool Record::marginal() const {
  return std::any_of(phase.measurements.begin(), phase.measurements.end(),
                     [](const Measurement& m) { return m.marginal; });
}

Json Record::ToJson() const {
  Json json;
  json["schema"] = "qvtester-record-1";
  json["dut_id"] = dut_id;
  json["station_id"] = station_id;
  json["start_time_millis"] = start_millis;
  json["end_time_millis"] = end_millis;
  json["outcome"] = Name(outcome());
  json["outcome_details"] = Json::array();
  for (const std::string& sentence : details) {
    json["outcome_details"].push_back({{"code", phase.code}, {"description", sentence}});
  }
  json["marginal"] = marginal();
  json["metadata"] = {{"test_name", test_name},
                      {"test_index", test_index ? Json(*test_index) : Json()},
                      {"library_version", QVTESTER_VERSION},
                      {"command", command},
                      {"limits", {{"name", limits.name}, {"revision", limits.revision}}},
                      {"properties", properties}};

  Json measurements = Json::object();
  for (const Measurement& m : phase.measurements) measurements[m.info->name] = qv::ToJson(m);
  Json attachments = Json::object();
  for (const Attachment& a : phase.attachments) {
    attachments[a.name] = {{"mimetype", a.mimetype}, {"sha1", a.sha1}, {"path", a.path}};
  }
  json["phases"] = {{{"name", phase.name},
                     {"outcome", Name(outcome())},
                     {"result_code", phase.code},
                     {"marginal", marginal()},
                     {"start_time_millis", phase.start_millis},
                     {"end_time_millis", phase.end_millis},
                     {"measurements", measurements},
                     {"attachments", attachments}}};
  json["inputs"] = Json::array();
  for (const Input& input : inputs) {
    json["inputs"].push_back({{"slot", input.slot},
                              {"path", input.path},
                              {"sha256", input.sha256},
                              {"width", input.width},
                              {"height", input.height}});
  }
  json["log_records"] = Json::array();
  for (const LogLine& line : log_lines) {
    json["log_records"].push_back(
        {{"level", "DEBUG"}, {"logger_name", "QVTEST"}, {"timestamp_millis", line.millis}, {"message", line.text}});
  }
  return json;
}

}  // namespace qv
