#include "desk/measure/verify.h"

#include <algorithm>
#include <cmath>
#include <filesystem>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/measure/figures.h"
#include "desk/measure/measure.h"
#include "desk/measure/measurement.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

[[noreturn]] void CannotRunAgain(const std::string& why) {
  throw Failure(kCouldNotMeasure, "can't be run again: " + why);
}

// A file that the record names: seen from the record's folder, as named, or beside the record; of a photo, the first
// with the content that was measured.
std::string Locate(const std::string& named, const fs::path& folder, const std::string& sha256) {
  std::string found = named;
  bool any = false;
  for (const fs::path& place : {folder / named, fs::path(named), folder / fs::path(named).filename()}) {
    std::error_code error;
    if (!fs::is_regular_file(place, error)) continue;
    if (!any) found = place;
    any = true;
    if (sha256.empty()) break;
    if (HexDigest(ReadWholeFile(place, kCouldNotMeasure), "SHA256") == sha256) return place;
  }
  return found;
}

std::string HashOf(const Json& record, std::size_t i) {
  const Json& hash = record.at("inputs").at(i).at("sha256");
  return hash.is_string() ? hash.get<std::string>() : "";
}

// Records that hold no request are of version 0.5 or before: the phase names the measurement, inputs stand in the order
// of its slots, and properties hold threshold and reference.
Request RequestOfOldRecord(const Json& record) {
  Request request;
  request.measurement = record.at("phases").at(0).at("name");
  const Measurement* const measurement = FindMeasurement(request.measurement);
  if (measurement == nullptr) CannotRunAgain("no measurement is named " + request.measurement);
  if (request.measurement == "hdr_dots") {
    CannotRunAgain("made by an earlier version, whose records don't hold the options that it was searched with");
  }
  for (const Json& input : record.at("inputs")) {
    request.inputs.emplace_back(input.at("path").get<std::string>());
    if (LowerExtension(request.inputs.back().name) != ".nv21") continue;
    request.parameters["raw"] = Format("%dx%d", input.at("width").get<int>(), input.at("height").get<int>());
  }
  request.properties = record.at("metadata").at("properties");
  return request;
}

Request StoredRequest(const Json& stored) {
  for (const auto& [name, value] : stored.at("parameters").items()) {
    if (value.is_null()) CannotRunAgain(name + " was no file, and is gone");
  }
  for (const char* const list : {"inputs", "repeats"}) {
    for (const Json& input : stored.value(list, Json::array())) {
      if (input.is_null()) CannotRunAgain("made from standard input or a picture in memory, which is gone");
    }
  }
  return RequestFromJson(stored);
}

// The largest difference between two measured values, single or lists of pairs; infinity when they can't be compared.
double Difference(const Json& was, const Json& is) {
  if (was == is) return 0;
  if (was.is_number() && is.is_number()) return std::fabs(was.get<double>() - is.get<double>());
  if (!was.is_array() || !is.is_array() || was.size() != is.size()) return INFINITY;
  double largest = 0;
  for (std::size_t i = 0; i < was.size(); ++i) largest = std::max(largest, Difference(was[i], is[i]));
  return largest;
}

void CompareFigures(Verification& result, const Json& stored, const Json& measured) {
  for (const auto& [name, m] : stored.get_ref<const Json::object_t&>()) {
    if (!m.contains("measured_value")) continue;
    ++result.numbers;
    if (!measured.contains(name) || !measured[name].contains("measured_value")) {
      result.moved.push_back(name + " is no longer measured");
      continue;
    }
    const FigureInfo* const info = FindFigure(name);
    const double allowed = info == nullptr ? 0 : Repeatability(*info->figure);
    const Json& value = measured[name].at("measured_value");
    const double difference = Difference(m.at("measured_value"), value);
    if (difference <= allowed) continue;
    const std::string what = value.is_array() ? Format(": its values differ by up to %g", difference)
                                              : " was " + m.at("measured_value").dump() + ", is " + value.dump();
    result.moved.push_back(name + what + Format("; the same photo may differ by %g", allowed));
  }
}

Verification Compare(const Json& was, const Json& is) {
  Verification result;
  const Json& stored = was.at("phases").at(0);
  const Json& measured = is.at("phases").at(0);
  for (std::size_t i = 0; i < was.at("inputs").size(); ++i) {
    if (i < is.at("inputs").size() && HashOf(was, i) != HashOf(is, i)) {
      result.moved.push_back("the photo itself has changed: " + is.at("inputs")[i].at("path").get<std::string>());
    }
  }
  if (!result.moved.empty()) return result;  // figures of another photo say nothing
  if (stored.at("result_code") != measured.at("result_code")) {
    result.moved.push_back("the result code was " + stored.at("result_code").dump() + ", is " +
                           measured.at("result_code").dump());
  }
  CompareFigures(result, stored.at("measurements"), measured.at("measurements"));
  return result;
}

}  // namespace

Request RequestOfRecord(const Json& record, const std::string& folder) {
  try {
    Request request = record.contains("request") ? StoredRequest(record.at("request")) : RequestOfOldRecord(record);
    request = Resolved(request);
    for (std::size_t i = 0; i < request.inputs.size(); ++i) {
      const bool loaded = i < record.at("inputs").size();  // a run ends at the first input that can't be
      std::string& name = request.inputs[i].name;
      if (loaded && record.at("inputs")[i].at("path") == "standard input") CannotRunAgain("made from standard input");
      name = Locate(name, folder, loaded ? HashOf(record, i) : "");
    }
    for (std::size_t i = 0; i < request.repeats.size(); ++i) {
      const std::size_t place = request.inputs.size() + i;
      request.repeats[i].name =
          Locate(request.repeats[i].name, folder, place < record.at("inputs").size() ? HashOf(record, place) : "");
    }
    return request;
  } catch (const Json::exception& e) {
    throw Failure(kCouldNotMeasure, "not a whole record: " + SentenceOf(e));
  } catch (const Failure& e) {
    if (e.kind != kWrongUsage) throw;
    CannotRunAgain(e.what());
  }
}

Verification Verify(const Json& record, const std::string& folder) {
  QVTester tester;
  const Json again = Measure(tester, RequestOfRecord(record, folder)).ToJson();
  try {
    return Compare(record, again);
  } catch (const Json::exception& e) {
    throw Failure(kCouldNotMeasure, "not a whole record: " + SentenceOf(e));
  }
}

}  // namespace qv
