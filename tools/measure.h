#ifndef QVTESTER_TOOLS_MEASURE_H_
#define QVTESTER_TOOLS_MEASURE_H_

#include <functional>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "desk/drawing/picture.h"
#include "desk/measure/record.h"
#include "qvtester/api.h"
#include "qvtester/tester.h"
#include "tools/options.h"

namespace qv {

// The road every measuring command takes: a fresh tester, its properties and slots, one test, a record, a verdict.

struct MeasureOptions {
  std::string json, annotate, limits, dut, station;
  std::optional<int> threshold;
  double pixel_pitch_um = 0;  // 0: not known
  bool verbose = false, quiet = false, publish = false;
  std::string raw_size;  // inputs are NV21 frames of this size; none: they are files to decode

  /// Declares the options that all measuring commands share; the picture's may go by a name of its own.
  void DeclareOn(Options& command, const char* picture = "--annotate",
                 const char* shows = "Write a picture of what was measured");
  /// Declares what commands that look for the chart share.
  void DeclareThresholdOn(Options& command);
  /// Declares --raw, for commands that take preview frames.
  void DeclareRawOn(Options& command);
  /// Declares --publish, for tests that write system properties.
  void DeclarePublishOn(Options& command);
};

struct SlotInput {
  QV_RESOURCE_INDEX slot;
  std::string path;  // "-" is standard input
};

/// What one command adds to the common road.
struct Measuring {
  std::string phase, test_name;
  std::string look_at;  // advice when an input is refused, where the code's own does not fit
  std::optional<int> test_index;
  std::vector<SlotInput> inputs;
  std::function<void()> prepare;                             // before the slots are loaded
  std::function<int(const std::string& path)> load;          // for inputs that SetResource does not take
  std::function<int()> run;                                  // answers the library's code
  std::function<void(Phase&, const QVResultData&)> collect;  // after code 1
  std::function<void(Record&)> look;                         // after any code, while the search state is fresh
  std::function<std::string(const Record&)> report;          // lines for a person, after code 1
  std::function<std::string(const Record&)> annotate;        // a PNG file's content
  bool publishes = false;                                    // writes system properties
  bool annotates_misses = false;                             // also when the finder marks were not found
};

/// Measures, prints, writes what was asked for, and answers the exit status.
int Measure(const MeasureOptions& options, const Measuring& measuring);

/// Throws Failure (wrong usage) when a file to be written is one that is read.
void RefuseInputAsOutput(const std::string& output, const std::vector<SlotInput>& inputs);

/// The image that a slot of the tester holds.
cv::Mat SlotPhoto(QV_RESOURCE_INDEX slot);

/// "0.3124 Nyquist  0.1562 c/p  937 LW/PH", and lp/mm when the pixel pitch is known.
std::string FrequencyText(double nyquist, int photo_height, double pixel_pitch_um);

/// "  (limit 0.38 to 0.6: FAIL)" for a figure with a limit, nothing for one without.
std::string LimitText(const Measurement& m);

}  // namespace qv

#endif  // QVTESTER_TOOLS_MEASURE_H_
