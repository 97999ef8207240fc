#include "desk/results/run.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <set>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/text.h"

namespace qv {

namespace {

std::optional<double> NumberAt(const Json& object, const char* name) {
  const Json& value = MemberOf(object, name);
  return value.is_number() ? std::optional<double>(value.get<double>()) : std::nullopt;
}

// Records without a request are told apart by what they ran and by the command that made them.
Json RequestOf(const Json& record) {
  Json request = MemberOf(record, "request");
  if (request.is_object()) {
    request.erase("inputs");  // their hashes stand for them
    return request;
  }
  const Json& metadata = MemberOf(record, "metadata");
  return {{"measurement", MemberOf(FirstOf(MemberOf(record, "phases")), "name")},
          {"properties", MemberOf(metadata, "properties")},
          {"command", MemberOf(metadata, "command")}};
}

Bounds BoundsOf(const Json& limits) {
  return {NumberAt(limits, "min"), NumberAt(limits, "max"), NumberAt(limits, "marginal_min"),
          NumberAt(limits, "marginal_max")};
}

// A list's values, and which of its entries are outside their limits.
std::string ListWords(const Json& measurement) {
  const Json& points = MemberOf(measurement, "measured_value");
  double low = std::numeric_limits<double>::infinity();
  double high = -low;
  for (const Json& point : points) {
    if (!point.is_array() || point.size() < 2 || !point[1].is_number()) continue;
    low = std::min(low, point[1].get<double>());
    high = std::max(high, point[1].get<double>());
  }
  std::string words = Count(points.size(), "value");
  if (low <= high) words += Format(", %.6g to %.6g", low, high);
  const Json& broken = MemberOf(MemberOf(measurement, "decision"), "broken");
  for (std::size_t i = 0; i < broken.size(); ++i) words += (i == 0 ? "; outside: " : ", ") + broken[i].dump();
  return words;
}

// {"each": {...}, "patches": {"7": {...}}} -> "each at most 3; patches 7 at most 2"
std::string ListLimitWords(const Json& limits) {
  std::string words;
  for (const auto& [name, bounds] : limits.items()) {
    if (!bounds.is_object()) continue;
    if (name == "each") {
      words += (words.empty() ? "each " : "; each ") + BoundsText(BoundsOf(bounds));
      continue;
    }
    for (const auto& [number, own] : bounds.items()) {
      words += (words.empty() ? "" : "; ") + name + " " + number + " " + BoundsText(BoundsOf(own));
    }
  }
  return words;
}

std::optional<double> ValueOf(const Json& measurement) {
  const Json& value = MemberOf(measurement, "measured_value");
  if (value.is_number()) return value.get<double>();
  const std::string bad = TextAt(measurement, "non_finite");
  if (value.is_array() || bad.empty()) return std::nullopt;
  if (bad == "nan") return std::numeric_limits<double>::quiet_NaN();
  return bad == "-inf" ? -std::numeric_limits<double>::infinity() : std::numeric_limits<double>::infinity();
}

}  // namespace

std::string TextAt(const Json& object, const char* name) {
  const Json& value = MemberOf(object, name);
  return value.is_string() ? value.get<std::string>() : std::string();
}

std::string TextOf(const Json& record) { return record.dump(-1, ' ', false, Json::error_handler_t::replace); }

std::string BoundsText(const Bounds& bounds) {
  if (bounds.min && bounds.max) return Format("%.6g to %.6g", *bounds.min, *bounds.max);
  return bounds.min ? Format("at least %.6g", *bounds.min) : bounds.max ? Format("at most %.6g", *bounds.max) : "";
}

std::set<std::string> DoubtsOf(const Json& record) {
  std::set<std::string> doubts;
  const Json& details = MemberOf(record, "outcome_details");
  if (!details.is_array()) return doubts;
  for (const Json& detail : details) {
    const std::string weight = TextAt(detail, "weight");
    const std::string name = TextAt(detail, "name");
    if (name == "no_uncertainty") continue;  // that is asked for by the limits of then
    const bool doubt = weight == "doubt" || weight == "accepted doubt";
    if (doubt || weight == "no judgement") doubts.insert(doubt && !name.empty() ? name : "?");
  }
  return doubts;
}

std::string RunKey(const Json& record, const Filing& filing) {
  const Json& metadata = MemberOf(record, "metadata");
  nlohmann::json parts;  // sorted: the order of members is nobody's affair
  parts["unit"] = TextAt(record, "dut_id");
  parts["plan"] = filing.plan;
  parts["step"] = filing.step;
  parts["request"] = nlohmann::json(RequestOf(record));
  parts["limits"] = nlohmann::json(MemberOf(metadata, "limits"));
  parts["library_version"] = TextAt(metadata, "library_version");
  parts["inputs"] = nlohmann::json::array();
  if (const Json& inputs = MemberOf(record, "inputs"); inputs.is_array()) {
    for (const Json& input : inputs) {
      const std::string hash = TextAt(input, "sha256");
      parts["inputs"].push_back({nlohmann::json(MemberOf(input, "slot")), hash.empty() ? TextAt(input, "path") : hash});
    }
  }
  return HexDigest(parts.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace), "SHA256");
}

std::vector<StoredFigure> FiguresOf(const Json& record) {
  const Json& phases = MemberOf(record, "phases");
  if (TextAt(record, "schema").rfind("qvtester-record-", 0) != 0 || !phases.is_array()) {
    throw Failure(kWrongUsage, R"(no record of this program: its "schema" or its "phases" are missing)");
  }
  std::vector<StoredFigure> figures;
  std::set<std::string> seen;
  for (const Json& phase : phases) {
    const Json& measurements = MemberOf(phase, "measurements");
    if (!measurements.is_object()) continue;
    for (const auto& [name, m] : measurements.items()) {
      const Json& limits = MemberOf(m, "limits");
      const bool list = MemberOf(m, "measured_value").is_array();
      if ((list && !limits.is_object()) || !seen.insert(name).second) continue;
      const Json& doubt = MemberOf(m, "marginal");
      figures.push_back({name, TextAt(MemberOf(m, "units"), "suffix"), TextAt(m, "method"), TextAt(m, "docstring"),
                         ValueOf(m), NumberAt(MemberOf(m, "uncertainty"), "standard"), TextAt(m, "outcome"),
                         doubt.is_boolean() && doubt.get<bool>(), BoundsOf(limits), list ? ListWords(m) : "",
                         ListLimitWords(limits)});
    }
  }
  return figures;
}

}  // namespace qv
