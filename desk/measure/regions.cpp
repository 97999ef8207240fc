#include "desk/measure/regions.h"

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <sstream>
#include <utility>

#include "desk/base/failure.h"
#include "desk/base/files.h"

namespace qv {

namespace {

constexpr std::size_t kMost = 10'000;
constexpr const char* kSides[] = {"left", "top", "width", "height"};

[[noreturn]] void Refuse(const std::string& what, const std::string& why) {
  throw Failure(kWrongUsage, "regions: " + what + " " + why);
}

// "10,20,60,60,7;80,20,60,60,8"
Json FromWords(const std::string& text) {
  Json regions = Json::array();
  std::istringstream parts(text);
  for (std::string part; std::getline(parts, part, ';');) {
    const Json numbers = Json::parse("[" + part + "]", nullptr, false);
    if (!numbers.is_array()) Refuse(part, "is not left,top,width,height or left,top,width,height,label");
    regions.push_back(numbers);
  }
  return regions;
}

Json FromFile(const std::string& path) {
  Json json = Json::parse(ReadWholeFile(path, kWrongUsage), nullptr, false);
  if (json.is_object() && json.contains("regions")) json = json["regions"];
  if (!json.is_array()) Refuse(path, "holds no list of regions");
  return json;
}

// As an object of the truth's has it, or as it is.
Json InOrder(const Json& region) {
  if (!region.is_object()) return region;
  Json numbers = Json::array();
  for (const char* side : kSides) numbers.push_back(region.value(side, Json()));
  if (region.contains("label")) numbers.push_back(region["label"]);
  return numbers;
}

}  // namespace

Json CheckedRegions(const Json& value) {
  Json regions = value;
  if (value.is_string()) {
    const auto text = value.get<std::string>();
    const bool words = text.find_first_not_of("0123456789,;- ") == std::string::npos;
    if (!words && text.find(',') != std::string::npos && !std::filesystem::exists(text)) {
      Refuse(text, "is neither left,top,width,height,label;... in whole numbers nor a file");
    }
    regions = words ? FromWords(text) : FromFile(text);
  }
  if (!regions.is_array() || regions.empty() || regions.size() > kMost) {
    Refuse("one to " + std::to_string(kMost), "are needed");
  }
  Json checked = Json::array();
  for (const Json& given : regions) {
    Json region = InOrder(given);
    if (region.is_array() && region.size() == 4) region.push_back(checked.size());
    const bool fits =
        region.is_array() && region.size() == 5 && std::all_of(region.begin(), region.end(), [](const Json& number) {
          return number.is_number_integer() && number >= INT32_MIN && number <= INT32_MAX;
        });
    if (!fits) Refuse(given.dump(), "is not [left, top, width, height, label] in whole pixels");
    if (region[2] < 1 || region[3] < 1) Refuse(given.dump(), "has no area");
    checked.push_back(region);
  }
  return checked;
}

SetRegions::SetRegions(QVTester& tester, const Json& regions, QVRegionList QVTester::*list, int QVTester::*count)
    : tester_(tester), list_(list), count_(count), former_count_(std::exchange(tester.*count, 0)) {
  std::swap(former_list_, tester.*list);
  const int size = regions.is_array() ? static_cast<int>(regions.size()) : 0;
  if (size == 0) return;
  QVRegionList& held = tester.*list;
  held.records = std::make_unique<QVRegionRecord[]>(size);
  held.count = tester.*count = size;
  for (int i = 0; i < size; ++i) {
    for (std::size_t k = 0; k < 5; ++k) held.records[i].fields[k] = regions[i][k];
  }
}

SetRegions::~SetRegions() {
  std::swap(former_list_, tester_.*list_);
  tester_.*count_ = former_count_;
}

}  // namespace qv
