// Values of parameters: what they may be, and as which word or JSON they come.

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <sstream>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/measure/histogram.h"
#include "desk/measure/measurement.h"
#include "desk/measure/patch_values.h"
#include "desk/measure/properties.h"
#include "desk/measure/regions.h"
#include "desk/measure/transfer.h"

namespace qv {

namespace {

[[noreturn]] void Refuse(const Parameter& parameter, const std::string& value, const std::string& why) {
  throw Failure(kWrongUsage, std::string(parameter.name) + ": " + value + " is " + why);
}

bool IsOneOf(const std::vector<std::string>& words, const std::string& word) {
  return std::find(words.begin(), words.end(), word) != words.end();
}

[[noreturn]] void RefuseWord(const Parameter& parameter, const Json& value) {
  std::string list;
  for (const std::string& word : parameter.words) list += (list.empty() ? "" : ", ") + word;
  const std::string given = value.is_string() ? value.get<std::string>() : value.dump();
  Refuse(parameter, value.dump(), "none of " + list + DidYouMean(given, parameter.words));
}

Json CheckedNumber(const Parameter& parameter, const Json& value) {
  const bool whole = parameter.type == Parameter::kWhole;
  const bool number = whole ? value.is_number_integer() : value.is_number();
  if (!parameter.words.empty()) {
    if (!number || !IsOneOf(parameter.words, value.dump())) RefuseWord(parameter, value);
    return value;
  }
  const double real = number ? value.get<double>() : NAN;
  if (real >= parameter.low && real <= parameter.high) return value;
  Refuse(parameter, value.dump(),
         Format("no %s from %.7g to %.7g", whole ? "whole number" : "number", parameter.low, parameter.high));
}

Json CheckedWord(const Parameter& parameter, const Json& value) {
  if (!value.is_string() || !IsOneOf(parameter.words, value.get<std::string>())) RefuseWord(parameter, value);
  return value;
}

// An even width and height, as NV21 frames have.
Json CheckedSize(const Parameter& parameter, const Json& value) {
  const cv::Size size = value.is_string() ? SizeOf(value.get<std::string>()) : cv::Size();
  if (size.empty()) {
    Refuse(parameter, value.dump(), "no size: give WIDTHxHEIGHT in pixels, 16 to 30000 each, as 4000x3000");
  }
  if (size.width % 2 != 0 || size.height % 2 != 0) {
    Refuse(parameter, value.dump(), "no frame's size: an NV21 frame has an even width and height");
  }
  return value;
}

Json CheckedFlag(const Parameter& parameter, const Json& value) {
  if (!value.is_boolean()) Refuse(parameter, value.dump(), "neither true nor false");
  return value;
}

Json CheckedTransfer(const Parameter& parameter, const Json& value) {
  const auto transfer = value.is_string() ? ParseTransfer(value.get<std::string>()) : std::nullopt;
  if (!transfer) Refuse(parameter, value.dump(), "none of srgb, linear, gamma:G with G from 0.1 to 10");
  return transfer->Text();
}

}  // namespace

cv::Size SizeOf(const std::string& text) {
  int width = 0;
  int height = 0;
  char by = 0;
  std::istringstream words(text);
  words >> width >> by >> height;
  const bool fits =
      words && words.eof() && by == 'x' && std::min(width, height) >= 16 && std::max(width, height) <= 30000;
  return fits ? cv::Size(width, height) : cv::Size();
}

Json Checked(const Parameter& parameter, const Json& value) {
  switch (parameter.type) {
    case Parameter::kWhole:
    case Parameter::kReal: return CheckedNumber(parameter, value);
    case Parameter::kWord: return CheckedWord(parameter, value);
    case Parameter::kFlag: return CheckedFlag(parameter, value);
    case Parameter::kTransfer: return CheckedTransfer(parameter, value);
    case Parameter::kSize: return CheckedSize(parameter, value);
    case Parameter::kPatches: return CheckedPatches(value);
    case Parameter::kRegions: return CheckedRegions(value);
    default: return CheckedHistogram(value);
  }
}

Json Parsed(const Parameter& parameter, const std::string& text) {
  if (parameter.type != Parameter::kWhole && parameter.type != Parameter::kReal) return Checked(parameter, text);
  const Json value = Json::parse(text, nullptr, false);
  return Checked(parameter, value.is_number() ? value : Json(text));
}

Json InitialValue(const Parameter& parameter) {
  return parameter.property ? DefaultOf(*parameter.property) : parameter.initial;
}

}  // namespace qv
