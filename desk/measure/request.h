#ifndef QVTESTER_DESK_MEASURE_REQUEST_H_
#define QVTESTER_DESK_MEASURE_REQUEST_H_

#include <opencv2/core.hpp>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "desk/base/json.h"

namespace qv {

/// What is measured: a file, a file's content, or a picture.
struct Input {
  // NOLINTBEGIN(google-explicit-constructor): a request is written down as a list of paths or pictures
  Input(std::string path) : name(std::move(path)) {}
  Input(const char* path) : name(path) {}
  Input(cv::Mat picture) : name("picture"), picture(std::move(picture)) {}
  // NOLINTEND(google-explicit-constructor)
  Input(std::string name, std::string content) : name(std::move(name)), content(std::move(content)) {}

  bool is_path() const { return !content && picture.empty(); }

  std::string name;                    // a path, or what people call it
  std::optional<std::string> content;  // of a file: encoded, or a raw frame
  cv::Mat picture;                     // 8 bits: blue, green, red; an HDR slot's: CV_32FC3, red first
};

/// All that a measurement needs to be run, and to be run again.
struct Request {
  std::string measurement;  // by its name: "camera_autofocus"
  std::vector<Input> inputs;
  Json parameters = Json::object();  // by name; of those left out the initial value counts
  Json properties = Json::object();  // of the tester, by index ("86") or name
  bool fake = false;                 // the numbered tests' fake mode
  bool publish = false;              // lets the library write its system properties; no part of what is stored
  std::vector<Input> repeats = {};   // further photos of the same unit, in place of the first input
};

/// Throws Failure (wrong usage), naming what is wrong, unless the request can be run: a known measurement, as many
/// inputs as it takes, parameters and properties that exist and lie in their ranges. Answers it in full: initial values
/// filled in, properties by index, files that parameters name read.
Request Resolved(const Request& request);

/// {"measurement", "inputs", "repeats", "parameters", "properties", "fake"}, "repeats" only where there are any. Inputs
/// that are not files are null; those that may be left out stand among the parameters.
Json ToJson(const Request& request);

/// The other way round; only "measurement" and "inputs" must be there. Throws Failure (wrong usage) for anything else.
Request RequestFromJson(const Json& json);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_REQUEST_H_
