#include "unit_tests/program.h"

#include <sys/wait.h>

#include <cstdlib>
#include <valijson/adapters/nlohmann_json_adapter.hpp>
#include <valijson/schema.hpp>
#include <valijson/schema_parser.hpp>
#include <valijson/validation_results.hpp>
#include <valijson/validator.hpp>

namespace {

std::string Quoted(const std::string& word) {
  std::string quoted = "'";
  for (const char c : word) quoted += c == '\'' ? "'\\''" : std::string(1, c);
  return quoted + "'";
}

}  // namespace

ProgramRun RunProgram(const std::vector<std::string>& arguments, const std::string& input) {
  const TemporaryFolder folder;
  std::string command = Quoted(QVTESTER_PROGRAM);
  for (const std::string& argument : arguments) command += " " + Quoted(argument);
  command +=
      " <" + Quoted(folder.Write("in", input)) + " >" + Quoted(folder.Path("out")) + " 2>" + Quoted(folder.Path("err"));
  const int status = std::system(command.c_str());  // NOLINT(cert-env33-c): every word is quoted
  return {WIFEXITED(status) ? WEXITSTATUS(status) : 1000 + WTERMSIG(status), ReadFile(folder.Path("out")),
          ReadFile(folder.Path("err"))};
}

nlohmann::json CheckedRecord(const std::string& text) {
  nlohmann::json record = nlohmann::json::parse(text);
  const nlohmann::json document = nlohmann::json::parse(ReadFile(QVTESTER_RECORD_SCHEMA));
  valijson::Schema schema;
  valijson::SchemaParser().populateSchema(valijson::adapters::NlohmannJsonAdapter(document), schema);
  valijson::ValidationResults results;
  if (!valijson::Validator().validate(schema, valijson::adapters::NlohmannJsonAdapter(record), &results)) {
    for (const auto& error : results) {
      std::string where;
      for (const std::string& step : error.context) where += step;
      ADD_FAILURE() << where << ": " << error.description;
    }
  }
  return record;
}

nlohmann::json Measured(const nlohmann::json& record, const std::string& name) {
  return record.at("phases").at(0).at("measurements").at(name).at("measured_value");
}

std::string SimulatedPhotos::Simulate(const std::vector<std::string>& options, const std::string& name) {
  std::string photo = folder_.Path(name + ".png");
  std::vector<std::string> arguments = {"simulate", "-o", photo, "--size", "1200x900", "--quiet"};
  arguments.insert(arguments.end(), options.begin(), options.end());
  const ProgramRun run = RunProgram(arguments);
  EXPECT_EQ(0, run.status) << run.err;
  return photo;
}

nlohmann::json SimulatedPhotos::Truth(const std::string& name) const {
  return nlohmann::json::parse(ReadFile(folder_.Path(name + ".truth.json")));
}
