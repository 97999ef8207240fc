#include "desk/measure/request.h"

#include <algorithm>
#include <filesystem>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/measurement.h"
#include "desk/measure/properties.h"

namespace qv {

namespace {

[[noreturn]] void Refuse(const std::string& sentence) { throw Failure(kWrongUsage, sentence); }

const Spec& SpecOf(const Request& request) {
  const Measurement* const measurement = FindMeasurement(request.measurement);
  if (measurement == nullptr) {
    std::vector<std::string> names;
    for (const Measurement* known : Measurements()) names.emplace_back(known->spec().name);
    Refuse(Printable(request.measurement) + ": no such measurement; `qvtester list measurements` shows them" +
           DidYouMean(request.measurement, names));
  }
  return measurement->spec();
}

const Parameter* FindParameter(const Spec& spec, const std::string& name) {
  const auto found = std::find_if(spec.parameters.begin(), spec.parameters.end(),
                                  [&](const Parameter& parameter) { return name == parameter.name; });
  return found == spec.parameters.end() ? nullptr : &*found;
}

[[noreturn]] void RefuseParameter(const Spec& spec, const std::string& name) {
  std::vector<std::string> names;
  for (const Parameter& parameter : spec.parameters) names.emplace_back(parameter.name);
  for (const InputSpec& input : spec.inputs) {
    if (input.optional) names.emplace_back(input.name);
  }
  Refuse(std::string(spec.name) + " has no parameter " + Printable(name) + DidYouMean(name, names));
}

void TakeOptionalInputs(const Spec& spec, Request& request) {
  for (std::size_t i = 0; i < spec.inputs.size(); ++i) {
    const char* const name = spec.inputs[i].name;
    if (!spec.inputs[i].optional || !request.parameters.contains(name)) continue;
    const Json& path = request.parameters[name];
    if (!path.is_string()) Refuse(std::string(name) + ": " + path.dump() + " is no path");
    if (request.inputs.size() != i) Refuse(std::string(name) + ": given twice, or without the inputs before it");
    request.inputs.emplace_back(path.get<std::string>());
    request.parameters.erase(name);
  }
}

// The files of a folder in the order of their names; hidden ones are left out.
std::vector<Input> FilesOf(const std::string& folder) {
  constexpr std::size_t kMost = 1000;
  std::vector<std::string> names;
  std::error_code failed;
  for (std::filesystem::directory_iterator i(folder, failed), end; !failed && i != end; i.increment(failed)) {
    if (i->path().filename().string().front() != '.') names.push_back(i->path().string());
  }
  if (failed) Refuse(folder + ": " + failed.message());
  if (names.empty() || names.size() > kMost)
    Refuse(Format("%s: holds %zu files, of 1 to %zu that are needed", folder.c_str(), names.size(), kMost));
  std::sort(names.begin(), names.end());
  return {names.begin(), names.end()};
}

void ExpandFolders(const Spec& spec, Request& request) {
  if (spec.inputs.empty() || !spec.inputs.back().list) return;
  std::vector<Input> inputs;
  for (const Input& input : request.inputs) {
    const bool listed = inputs.size() + 1 >= spec.inputs.size();
    if (listed && input.is_path() && std::filesystem::is_directory(input.name)) {
      const std::vector<Input> files = FilesOf(input.name);
      inputs.insert(inputs.end(), files.begin(), files.end());
    } else {
      inputs.push_back(input);
    }
  }
  request.inputs = std::move(inputs);
}

void CheckInputs(const Spec& spec, const Request& request) {
  const auto least = static_cast<std::size_t>(
      std::count_if(spec.inputs.begin(), spec.inputs.end(), [](const InputSpec& input) { return !input.optional; }));
  const std::size_t given = request.inputs.size();
  const bool any = !spec.inputs.empty() && spec.inputs.back().list;
  if (given >= least && (any || given <= spec.inputs.size())) return;
  std::string names;
  for (const InputSpec& input : spec.inputs) {
    names += (names.empty() ? "" : ", ") + std::string(input.name) + (input.optional ? " (may be left out)" : "");
  }
  Refuse(std::string(spec.name) + ": " + std::to_string(given) + " inputs given; it takes " + names);
}

// A parameter that sets a property and the property itself are one value.
Json ValueOf(const Parameter& parameter, Request& request) {
  const std::string property = parameter.property ? std::to_string(*parameter.property) : "";
  const bool by_property = !property.empty() && request.properties.contains(property);
  const bool given = request.parameters.contains(parameter.name);
  if (!given && !by_property && parameter.required) Refuse(std::string(parameter.name) + " is needed");
  if (!given && !by_property) return InitialValue(parameter);
  Json value = Checked(parameter, given ? request.parameters[parameter.name] : request.properties[property]);
  if (!by_property) return value;
  if (given && value != request.properties[property]) {
    Refuse(std::string(parameter.name) + " and property " + property + " are one, and differ");
  }
  request.properties.erase(property);
  return value;
}

}  // namespace

Request Resolved(const Request& request) {
  Request full = request;
  const Spec& spec = SpecOf(request);
  if (!full.parameters.is_object()) Refuse("parameters: an object of values by name is needed");
  TakeOptionalInputs(spec, full);
  ExpandFolders(spec, full);
  CheckInputs(spec, full);
  for (const auto& [name, value] : full.parameters.items()) {
    if (FindParameter(spec, name) == nullptr) RefuseParameter(spec, name);
  }
  full.properties = CheckedProperties(full.properties);
  Json values = Json::object();
  for (const Parameter& parameter : spec.parameters) {
    if (Json value = ValueOf(parameter, full); !value.is_null()) values[parameter.name] = std::move(value);
  }
  full.parameters = std::move(values);
  return full;
}

Json ToJson(const Request& request) {
  const Measurement* const measurement = FindMeasurement(request.measurement);
  Json inputs = Json::array();
  Json parameters = request.parameters;
  for (std::size_t i = 0; i < request.inputs.size(); ++i) {
    const Input& input = request.inputs[i];
    const Json path = input.is_path() ? Json(input.name) : Json();
    const bool optional =
        measurement != nullptr && i < measurement->spec().inputs.size() && measurement->spec().inputs[i].optional;
    if (optional) {
      parameters[measurement->spec().inputs[i].name] = path;
    } else {
      inputs.push_back(path);
    }
  }
  Json json = {{"measurement", request.measurement},
               {"inputs", inputs},
               {"parameters", parameters},
               {"properties", request.properties},
               {"fake", request.fake}};
  for (const Input& input : request.repeats) json["repeats"].push_back(input.is_path() ? Json(input.name) : Json());
  return json;
}

Request RequestFromJson(const Json& json) {
  if (!json.is_object()) Refuse("a request is an object");
  Request request;
  for (const auto& [key, value] : json.items()) {
    const auto want = [&, &name = key, &held = value](bool fits, const char* what) {
      if (!fits) Refuse(name + ": " + held.dump() + " is not " + what);
    };
    if (key == "measurement") {
      want(value.is_string(), "a name");
      request.measurement = value.get<std::string>();
    } else if (key == "inputs" || key == "repeats") {
      want(value.is_array(), "a list of paths");
      for (const Json& path : value) {
        want(path.is_string(), "a list of paths");
        (key == "inputs" ? request.inputs : request.repeats).emplace_back(path.get<std::string>());
      }
    } else if (key == "parameters" || key == "properties") {
      want(value.is_object(), "an object");
      (key == "parameters" ? request.parameters : request.properties) = value;
    } else if (key == "fake") {
      want(value.is_boolean(), "true or false");
      request.fake = value.get<bool>();
    } else {
      Refuse("\"" + key + "\" is no part of a request");
    }
  }
  if (request.measurement.empty()) Refuse("a request names its measurement");
  SpecOf(request);
  return request;
}

}  // namespace qv
