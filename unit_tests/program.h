#ifndef QVTESTER_UNIT_TESTS_PROGRAM_H_
#define QVTESTER_UNIT_TESTS_PROGRAM_H_

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "unit_tests/drawing.h"

// The installed-like program, run as a user would.

struct ProgramRun {
  int status = -1;  // exit status; 1000 + signal when killed
  std::string out, err;
};

/// Runs `qvtester` with these arguments and this standard input.
ProgramRun RunProgram(const std::vector<std::string>& arguments, const std::string& input = "");

/// Parses a record file and holds it against docs/record.schema.json; a breach is a test failure.
nlohmann::json CheckedRecord(const std::string& text);

/// A measured value of the record's only phase.
nlohmann::json Measured(const nlohmann::json& record, const std::string& name);

/// Tests on photos of the program's own simulator.
class SimulatedPhotos : public ::testing::Test {
 protected:
  /// Takes a small photo with these options; answers its path.
  std::string Simulate(const std::vector<std::string>& options = {}, const std::string& name = "photo");
  nlohmann::json Truth(const std::string& name = "photo") const;

  TemporaryFolder folder_;
};

#endif  // QVTESTER_UNIT_TESTS_PROGRAM_H_
