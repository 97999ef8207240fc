#include "unit_tests/program.h"

#include <gmock/gmock.h>
#include <sys/wait.h>

#include <cstdlib>
#include <valijson/adapters/nlohmann_json_adapter.hpp>
#include <valijson/schema.hpp>
#include <valijson/schema_parser.hpp>
#include <valijson/validation_results.hpp>
#include <valijson/validator.hpp>

using nlohmann::json;
using valijson::adapters::NlohmannJsonAdapter;

json Measured(const json& record, const std::string& name) {
  return record.at("phases").at(0).at("measurements").at(name).at("measured_value");
}

ProgramRun SimulatedPhotos::Run(const std::string& arguments, const std::string& before) const {
  const TemporaryFolder streams;
  const std::string command = "cd '" + folder_.Path("") + "' && " + before + "exec '" QVTESTER_PROGRAM "' </dev/null " +
                              arguments + " >'" + streams.Path("out") + "' 2>'" + streams.Path("err") + "'";
  const int status = std::system(command.c_str());  // NOLINT(cert-env33-c): the tests' own words
  return {WIFEXITED(status) ? WEXITSTATUS(status) : 1000 + WTERMSIG(status), ReadFile(streams.Path("out")),
          ReadFile(streams.Path("err"))};
}

void SimulatedPhotos::ExpectComplaint(const std::string& arguments, int status, const std::string& complaint) const {
  const ProgramRun run = Run(arguments);
  EXPECT_EQ(status, run.status) << arguments;
  EXPECT_THAT(run.err, ::testing::HasSubstr(complaint)) << arguments;
}

json SimulatedPhotos::Record(const std::string& arguments, int status) {
  const ProgramRun run = Run(arguments + " --json -");
  EXPECT_EQ(status, run.status) << arguments << '\n' << run.err;
  err_ = run.err;
  json record = json::parse(run.out);
  const json document = json::parse(ReadFile(QVTESTER_RECORD_SCHEMA));
  valijson::Schema schema;
  valijson::SchemaParser().populateSchema(NlohmannJsonAdapter(document), schema);
  valijson::ValidationResults breaches;
  valijson::Validator().validate(schema, NlohmannJsonAdapter(record), &breaches);
  for (const auto& breach : breaches) {
    ADD_FAILURE() << ::testing::PrintToString(breach.context) << ": " << breach.description;
  }
  return record;
}

std::string SimulatedPhotos::Simulate(const std::string& options, const std::string& name) const {
  const ProgramRun run = Run("simulate -o " + name + " --size 1200x900 --quiet " + options);
  EXPECT_EQ(0, run.status) << run.err;
  return name;
}

json SimulatedPhotos::Truth(const std::string& name) const {
  return json::parse(ReadFile(folder_.Path(name + ".truth.json")));
}
