#ifndef QVTESTER_UNIT_TESTS_PROGRAM_H_
#define QVTESTER_UNIT_TESTS_PROGRAM_H_

#include <nlohmann/json.hpp>
#include <string>
#include <vector>

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

#endif  // QVTESTER_UNIT_TESTS_PROGRAM_H_
