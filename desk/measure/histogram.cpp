#include "desk/measure/histogram.h"

#include <algorithm>
#include <cstdint>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/files.h"

namespace qv {

namespace {

// The numbers behind the levels of a dust record; null where it has none.
Json HistogramOf(const Json& record) {
  const Json phases = record.value("phases", Json::array());
  if (!phases.is_array() || phases.empty() || !phases[0].is_object()) return nullptr;
  const Json measurements = phases[0].value("measurements", Json::object());
  Json counts = Json::array();
  for (const char* name : {"lens_dust_histogram", "lens_dust_front_histogram"}) {
    if (!measurements.contains(name)) continue;
    for (const Json& bin : measurements[name].value("measured_value", Json::array())) {
      if (bin.is_array() && bin.size() == 2) counts.push_back(bin[1]);
    }
  }
  return counts;
}

Json BareNumbers(const std::string& text) {
  Json counts = Json::array();
  std::istringstream words(text);
  for (std::int64_t count = 0; words >> count;) counts.push_back(count);
  return words.eof() ? counts : Json();
}

}  // namespace

Json CheckedHistogram(const Json& value) {
  Json counts = value;
  if (value.is_string()) {
    const std::string text = ReadWholeFile(value.get<std::string>(), kWrongUsage);
    counts = Json::parse(text, nullptr, false);
    if (counts.is_object()) {
      counts = HistogramOf(counts);
    } else if (!counts.is_array()) {
      counts = BareNumbers(text);
    }
  }
  const bool fits = counts.is_array() && counts.size() == kGreyLevels &&
                    std::all_of(counts.begin(), counts.end(), [](const Json& count) {
                      return count.is_number_integer() && count >= 0 && count <= INT32_MAX;
                    });
  if (fits) return counts;
  throw Failure(kWrongUsage, (value.is_string() ? value.get<std::string>() : "histogram") +
                                 ": neither a dust record nor 256 whole numbers");
}

}  // namespace qv
