#include "desk/results/run.h"

#include <cmath>
#include <limits>
#include <set>

#include "desk/base/digest.h"
#include "desk/base/failure.h"

namespace qv {

namespace {

const Json& At(const Json& object, const char* name) {
  static const Json nothing;
  const auto found = object.is_object() ? object.find(name) : object.end();
  return object.is_object() && found != object.end() ? *found : nothing;
}

std::optional<double> NumberAt(const Json& object, const char* name) {
  const Json& value = At(object, name);
  return value.is_number() ? std::optional<double>(value.get<double>()) : std::nullopt;
}

// Records without a request are told apart by what they ran and by the command that made them.
Json RequestOf(const Json& record) {
  Json request = At(record, "request");
  if (request.is_object()) {
    request.erase("inputs");  // their hashes stand for them
    return request;
  }
  const Json& phases = At(record, "phases");
  const Json& metadata = At(record, "metadata");
  return {{"measurement", phases.is_array() && !phases.empty() ? At(phases[0], "name") : Json()},
          {"properties", At(metadata, "properties")},
          {"command", At(metadata, "command")}};
}

std::optional<double> ValueOf(const Json& measurement) {
  const Json& value = At(measurement, "measured_value");
  if (value.is_number()) return value.get<double>();
  const std::string bad = TextAt(measurement, "non_finite");
  if (value.is_array() || bad.empty()) return std::nullopt;
  if (bad == "nan") return std::numeric_limits<double>::quiet_NaN();
  return bad == "-inf" ? -std::numeric_limits<double>::infinity() : std::numeric_limits<double>::infinity();
}

}  // namespace

std::string TextAt(const Json& object, const char* name) {
  const Json& value = At(object, name);
  return value.is_string() ? value.get<std::string>() : std::string();
}

std::set<std::string> DoubtsOf(const Json& record) {
  std::set<std::string> doubts;
  const Json& details = At(record, "outcome_details");
  if (!details.is_array()) return doubts;
  for (const Json& detail : details) {
    const std::string weight = TextAt(detail, "weight");
    const std::string name = TextAt(detail, "name");
    const bool doubt = weight == "doubt" || weight == "accepted doubt";
    if (doubt || weight == "no judgement") doubts.insert(doubt && !name.empty() ? name : "?");
  }
  return doubts;
}

std::string RunKey(const Json& record, const Filing& filing) {
  const Json& metadata = At(record, "metadata");
  nlohmann::json parts;  // sorted: the order of members is nobody's affair
  parts["unit"] = TextAt(record, "dut_id");
  parts["plan"] = filing.plan;
  parts["step"] = filing.step;
  parts["request"] = nlohmann::json(RequestOf(record));
  parts["limits"] = nlohmann::json(At(metadata, "limits"));
  parts["library_version"] = TextAt(metadata, "library_version");
  parts["inputs"] = nlohmann::json::array();
  if (const Json& inputs = At(record, "inputs"); inputs.is_array()) {
    for (const Json& input : inputs) {
      const std::string hash = TextAt(input, "sha256");
      parts["inputs"].push_back({nlohmann::json(At(input, "slot")), hash.empty() ? TextAt(input, "path") : hash});
    }
  }
  return HexDigest(parts.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace), "SHA256");
}

std::vector<StoredFigure> FiguresOf(const Json& record) {
  const Json& phases = At(record, "phases");
  if (TextAt(record, "schema").rfind("qvtester-record-", 0) != 0 || !phases.is_array()) {
    throw Failure(kWrongUsage, R"(no record of this program: its "schema" or its "phases" are missing)");
  }
  std::vector<StoredFigure> figures;
  std::set<std::string> seen;
  for (const Json& phase : phases) {
    const Json& measurements = At(phase, "measurements");
    if (!measurements.is_object()) continue;
    for (const auto& [name, m] : measurements.items()) {
      const Json& limits = At(m, "limits");
      if ((At(m, "measured_value").is_array() && !limits.is_object()) || !seen.insert(name).second) continue;
      const Json& doubt = At(m, "marginal");
      figures.push_back({name, TextAt(At(m, "units"), "suffix"), TextAt(m, "method"), TextAt(m, "docstring"),
                         ValueOf(m), NumberAt(At(m, "uncertainty"), "standard"), TextAt(m, "outcome"),
                         doubt.is_boolean() && doubt.get<bool>(),
                         Bounds{NumberAt(limits, "min"), NumberAt(limits, "max"), NumberAt(limits, "marginal_min"),
                                NumberAt(limits, "marginal_max")}});
    }
  }
  return figures;
}

}  // namespace qv
