#include "desk/measure/patch_values.h"

#include <algorithm>
#include <cmath>
#include <sstream>

#include "chart/chart_layout.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"

namespace qv {

namespace {

// The patches of a capture record; null where it has none.
Json PatchesOf(const Json& record) {
  const Json phases = record.value("phases", Json::array());
  if (!phases.is_array() || phases.empty() || !phases[0].is_object()) return nullptr;
  const Json measurements = phases[0].value("measurements", Json::object());
  Json patches;
  for (const std::string name : {"camera_capture", "camera_capture_front"}) {
    for (const char* part : {"_lab_d65_l", "_lab_d65_a", "_lab_d65_b"}) {
      if (!measurements.contains(name + part)) continue;
      const Json values = measurements[name + part].value("measured_value", Json::array());
      if (patches.is_null()) patches = Json::array();
      for (std::size_t i = 0; i < values.size(); ++i) {
        if (!values[i].is_array() || values[i].size() != 2) return nullptr;
        if (patches.size() <= i) patches.push_back(Json::array({values[i][0]}));
        patches[i].push_back(values[i][1]);
      }
    }
  }
  return patches;
}

Json Lines(const std::string& text) {
  Json patches = Json::array();
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    line = line.substr(0, line.find('#'));
    std::replace(line.begin(), line.end(), ',', ' ');
    if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
    std::istringstream words(line);
    int number = 0;
    cv::Vec3d lab;
    if (!(words >> number >> lab[0] >> lab[1] >> lab[2]) || !(words >> std::ws).eof()) return nullptr;
    patches.push_back({number, lab[0], lab[1], lab[2]});
  }
  return patches;
}

bool IsPatch(const Json& patch) {
  if (!patch.is_array() || patch.size() != 4 || !patch[0].is_number_integer()) return false;
  const auto number = patch[0].get<std::int64_t>();
  if (number < 0 || number >= static_cast<std::int64_t>(kPatches.size())) return false;
  return std::all_of(patch.begin(), patch.end(),
                     [](const Json& v) { return v.is_number() && std::abs(v.get<double>()) < 1000; });
}

}  // namespace

Json CheckedPatches(const Json& value) {
  Json patches = value;
  if (value.is_string()) {
    const std::string text = ReadWholeFile(value.get<std::string>(), kWrongUsage);
    patches = Json::parse(text, nullptr, false);
    if (patches.is_object()) {
      patches = PatchesOf(patches);
    } else if (!patches.is_array()) {
      patches = Lines(text);
    }
  }
  const std::string where = value.is_string() ? value.get<std::string>() : "patch values";
  if (!patches.is_array() || patches.empty() || !std::all_of(patches.begin(), patches.end(), IsPatch)) {
    throw Failure(kWrongUsage, where + ": neither a capture record nor numbers, L*, a* and b* of patches 0 to 23");
  }
  if (ReferencePatches(patches).size() != patches.size())
    throw Failure(kWrongUsage, where + ": a patch is given twice");
  return patches;
}

std::map<int, cv::Vec3d> ReferencePatches(const Json& checked) {
  std::map<int, cv::Vec3d> values;
  for (const Json& patch : checked) {
    values[patch[0].get<int>()] = {patch[1].get<double>(), patch[2].get<double>(), patch[3].get<double>()};
  }
  return values;
}

}  // namespace qv
