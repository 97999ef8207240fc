#ifndef QVTESTER_UNIT_TESTS_PROGRAM_H_
#define QVTESTER_UNIT_TESTS_PROGRAM_H_

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <string>

#include "unit_tests/drawing.h"

// The program, run as a user would: in a fork of the test, or by a shell where the words need one.

struct ProgramRun {
  int status = -1;  // exit status; 1000 + signal when killed
  std::string out, err;
};

/// A measured value of the record's only phase.
nlohmann::json Measured(const nlohmann::json& record, const std::string& name);

/// Tests that run the program in a folder of their own, on photos of its own simulator.
class SimulatedPhotos : public ::testing::Test {
 protected:
  SimulatedPhotos();

  /// Runs `qvtester` in the folder with these arguments, as a shell reads them, after what stands before.
  ProgramRun Run(const std::string& arguments, const std::string& before = "") const;
  void ExpectComplaint(const std::string& arguments, int status, const std::string& complaint) const;

  /// Runs a measuring command; answers its record, held against docs/record.schema.json. What it says goes to err_.
  nlohmann::json Record(const std::string& arguments, int status = 0);

  /// Takes a small photo with these options; answers its name.
  std::string Simulate(const std::string& options = "", const std::string& name = "photo.png") const;
  nlohmann::json Truth(const std::string& name = "photo") const;

  TemporaryFolder folder_;
  std::string err_;

 private:
  int RunForked(const std::string& arguments, const TemporaryFolder& streams) const;
};

#endif  // QVTESTER_UNIT_TESTS_PROGRAM_H_
