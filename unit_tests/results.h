#ifndef QVTESTER_UNIT_TESTS_RESULTS_H_
#define QVTESTER_UNIT_TESTS_RESULTS_H_

#include <string>

#include "desk/results/run.h"

// Runs for the tests of the store and of what is made of it.

namespace qv {

/// As the program records one, with one figure of this value, of at least 0.1, and a curve.
inline StoredRun RunOf(const std::string& unit, const Json& value, const char* non_finite = nullptr,
                       const char* outcome = "PASS", int code = 1) {
  Json figure = {{"name", "flash_mean"},     {"outcome", outcome == std::string("ERROR") ? "PASS" : outcome},
                 {"measured_value", value},  {"units", {{"name", "grey level"}, {"suffix", "level"}}},
                 {"method", "mean"},         {"docstring", "Mean."},
                 {"limits", {{"min", 0.1}}}, {"uncertainty", {{"standard", 0.25}}}};
  if (non_finite != nullptr) figure["non_finite"] = non_finite;
  const Json curve = {{"name", "flash_sfr"},
                      {"outcome", "MEASURED"},
                      {"measured_value", {{0.0, 1.0}, {0.75, 0.25}}},
                      {"dimensions", Json::array({{{"name", "frequency"}, {"suffix", "Nyquist"}}})},
                      {"units", {{"name", "one"}, {"suffix", "1"}}}};
  StoredRun run;
  run.record = {{"schema", "qvtester-record-1"},
                {"dut_id", unit},
                {"station_id", "s"},
                {"outcome", outcome},
                {"outcome_details", Json::array()},
                {"start_time_millis", 1795236459000},
                {"end_time_millis", 1795236459038},
                {"marginal", false},
                {"metadata", {{"library_version", "1"}, {"limits", {{"name", "l"}, {"revision", "2"}}}}},
                {"request", {{"measurement", "flash"}, {"inputs", {"a.jpg"}}}},
                {"inputs", {{{"slot", 1}, {"path", "a.jpg"}, {"sha256", "00ff"}}}},
                {"log_records", Json::array({{{"message", "a line"}}})}};
  run.record["phases"] = Json::array(
      {{{"name", "flash"}, {"result_code", code}, {"measurements", {{"flash_mean", figure}, {"flash_sfr", curve}}}}});
  return run;
}

}  // namespace qv

#endif  // QVTESTER_UNIT_TESTS_RESULTS_H_
