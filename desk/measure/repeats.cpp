#include "desk/measure/repeats.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <map>
#include <string>

#include "desk/base/text.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

// Of whole numbers the middle one, or the larger of two, that the median is one of them.
double MiddleOf(std::vector<double> values, Number number) {
  if (!std::all_of(values.begin(), values.end(), [](double value) { return std::isfinite(value); })) return NAN;
  if (number == Number::kReal) return Median(std::move(values));
  std::sort(values.begin(), values.end());
  return values[values.size() / 2];
}

// False where one of the runs has no such values.
bool JoinReading(Reading& reading, const std::vector<Record>& others) {
  std::vector<const Reading*> all = {&reading};
  for (const Record& other : others) {
    const Reading* const same = other.phase.Find(reading.info->figure->name);
    if (same == nullptr || same->values.size() != reading.values.size()) return false;
    all.push_back(same);
  }
  const Number number = reading.info->figure->number;
  std::vector<double> medians;
  std::vector<Uncertainty> known;
  for (std::size_t i = 0; i < reading.values.size(); ++i) {
    std::vector<double> values;
    for (const Reading* one : all) values.push_back(one->values[i]);
    medians.push_back(MiddleOf(values, number));
    known.push_back(OfMedian(values));
    if (reading.info->figure->axis == nullptr) reading.repeats = std::move(values);
  }
  reading.values = std::move(medians);
  reading.uncertainties.clear();
  if (number == Number::kReal) reading.Trust(std::move(known));
  return true;
}

template <typename List>
void Append(List& list, const List& more) {
  list.insert(list.end(), more.begin(), more.end());
}

// Photos with the same pixels are one photo, whose spread of nought would pass for certainty.
void RefuseCopies(Record& record) {
  std::map<std::string, std::string> seen;
  for (const RecordedInput& input : record.inputs) {
    const auto [first, is_new] = seen.try_emplace(input.pixels_hash, input.path);
    if (is_new || input.pixels_hash.empty()) continue;
    record.Say(Remark::kNoJudgement, "same_photo",
               Format("%s holds the very pixels of %s: one photo does not tell how photos of a unit differ",
                      input.path.c_str(), first->second.c_str()));
  }
}

}  // namespace

void JoinRepeats(Record& first, const std::vector<Record>& others) {
  auto& readings = first.phase.readings;
  readings.erase(
      std::remove_if(readings.begin(), readings.end(), [&](Reading& reading) { return !JoinReading(reading, others); }),
      readings.end());
  for (const Record& other : others) {
    if (!other.inputs.empty()) first.inputs.push_back(other.inputs[0]);  // none when it could not be loaded
    Append(first.remarks, other.remarks);
    Append(first.log_lines, other.log_lines);
    Append(first.chatter, other.chatter);
    if (first.phase.code == QV_SUCCESS) first.phase.code = other.phase.code;
    first.phase.end_millis = other.phase.end_millis;
    first.end_millis = other.end_millis;
  }
  RefuseCopies(first);
}

}  // namespace qv
