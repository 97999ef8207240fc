#include "desk/measure/verify.h"

#include <algorithm>
#include <cmath>
#include <filesystem>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/measure/doubt_names.h"
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

// The record's own: bounds stand beside the figures, the rest with the limits' name.
Limits LimitsOfRecord(const Json& record) {
  const Json& about = record.at("metadata").at("limits");
  Json file = {{"limits", Json::object()}};
  for (const char* const key : {"name", "revision", "accept_doubts", "decision"}) {
    if (about.contains(key)) file[key] = about[key];
  }
  if (file.contains("accept_doubts")) {  // once a name that is no doubt's was taken; it accepts nothing
    Json& names = file["accept_doubts"];
    const auto unknown = [](const Json& name) {
      return name.is_string() && FindDoubt(name.get<std::string>()) == nullptr;
    };
    names.erase(std::remove_if(names.begin(), names.end(), unknown), names.end());
  }
  for (const auto& [name, m] : record.at("phases").at(0).at("measurements").items()) {
    if (m.contains("limits")) file["limits"][name] = m["limits"];
  }
  return file["limits"].empty() ? Limits() : LimitsFromJson(file, "its limits");
}

// Those that the record holds as loaded must still be there.
void RefuseLostFiles(const Json& record, const Request& request) {
  std::vector<Input> files = request.inputs;
  files.insert(files.end(), request.repeats.begin(), request.repeats.end());
  for (std::size_t i = 0; i < std::min(files.size(), record.at("inputs").size()); ++i) {
    std::error_code error;
    if (fs::is_regular_file(files[i].name, error)) continue;
    throw Failure(kCouldNotMeasure, files[i].name + ": no such file any more, nor one of its name beside the record");
  }
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

std::string Moved(const std::string& what, const Json& was, const Json& is) {
  return what + " was " + was.dump() + ", is " + is.dump();
}

void CompareFigure(Verification& result, const std::string& name, const Json& was, const Json& is) {
  const FigureInfo* const info = FindFigure(name);
  const double allowed = info == nullptr ? 0 : Repeatability(*info->figure);
  const Json& value = is.at("measured_value");
  const double difference = Difference(was.at("measured_value"), value);
  if (difference > allowed) {
    const std::string what = value.is_array() ? name + Format(": its values differ by up to %g", difference)
                                              : Moved(name, was.at("measured_value"), value);
    result.moved.push_back(what + Format("; the same photo may differ by %g", allowed));
  }
}

void CompareFigures(Verification& result, const Json& stored, const Json& measured) {
  for (const auto& [name, m] : stored.get_ref<const Json::object_t&>()) {
    if (!m.contains("measured_value")) continue;
    ++result.numbers;
    if (measured.contains(name) && measured[name].contains("measured_value")) {
      CompareFigure(result, name, m, measured[name]);
    } else {
      result.moved.push_back(name + " is no longer measured");
    }
  }
}

// Earlier versions passed what no limit was set for.
void CompareOutcomes(Verification& result, const Json& was, const Json& is) {
  if (!was.contains("request")) return;
  if (was.at("outcome") != is.at("outcome"))
    result.moved.push_back(Moved("the outcome", was["outcome"], is["outcome"]));
  const Json& measured = is.at("phases").at(0).at("measurements");
  for (const auto& [name, m] : was.at("phases").at(0).at("measurements").items()) {
    if (measured.contains(name) && m.at("outcome") != measured[name].at("outcome"))
      result.moved.push_back(Moved("the outcome of " + name, m["outcome"], measured[name]["outcome"]));
  }
}

void ComparePhotos(Verification& result, const Json& was, const Json& is) {
  for (std::size_t i = 0; i < std::min(was.size(), is.size()); ++i) {
    const std::string path = is[i].at("path");
    const Json pixels = was[i].value("pixels_hash", Json());
    if (was[i].at("sha256") != is[i].at("sha256")) {
      result.moved.push_back("the photo itself has changed: " + path);
    } else if (pixels.is_string() && pixels != is[i].at("pixels_hash")) {
      result.notes.push_back("another decoder: it makes other pixels of " + path + " than the record's");
    }
  }
}

Verification Compare(const Json& was, const Record& again) {
  Verification result;
  const Json is = again.ToJson();
  ComparePhotos(result, was.at("inputs"), is.at("inputs"));
  if (!result.moved.empty()) return result;  // figures of another photo say nothing
  const Json& stored = was.at("phases").at(0);
  const Json& measured = is.at("phases").at(0);
  if (stored.at("result_code") != measured.at("result_code")) {
    const std::string why = again.measured() ? "" : ": " + again.MissSentence();
    result.moved.push_back(Moved("the result code", stored["result_code"], measured["result_code"]) + why);
    return result;
  }
  CompareFigures(result, stored.at("measurements"), measured.at("measurements"));
  CompareOutcomes(result, was, is);
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
  const Request request = RequestOfRecord(record, folder);
  try {
    RefuseLostFiles(record, request);
    return Compare(record, MeasureAnew(request, LimitsOfRecord(record)));
  } catch (const Json::exception& e) {
    throw Failure(kCouldNotMeasure, "not a whole record: " + SentenceOf(e));
  } catch (const Failure& e) {
    if (e.kind != kWrongUsage) throw;
    CannotRunAgain(e.what());
  }
}

}  // namespace qv
