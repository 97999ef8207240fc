#include "unit_tests/program.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <iostream>
#include <iterator>
#include <opencv2/core.hpp>
#include <sstream>
#include <valijson/adapters/nlohmann_json_adapter.hpp>
#include <valijson/schema.hpp>
#include <valijson/schema_parser.hpp>
#include <valijson/validation_results.hpp>
#include <valijson/validator.hpp>

#include "desk/measure/trust_table.h"

// The program lies above its tests; this is all that they call of it.
namespace qv {
int RunProgram(const std::vector<std::string>& words);
}

using nlohmann::json;
using valijson::adapters::NlohmannJsonAdapter;

json Measured(const json& record, const std::string& name) {
  return record.at("phases").at(0).at("measurements").at(name).at("measured_value");
}

SimulatedPhotos::SimulatedPhotos() {
  cv::setNumThreads(1);                        // those of the parent are not in a forked process
  setenv("OPENCV_IO_ENABLE_OPENEXR", "1", 0);  // NOLINT(concurrency-mt-unsafe): as the program does
}

// Loading the program costs more than most commands: a fork of this process has it loaded.
int SimulatedPhotos::RunForked(const std::string& arguments, const TemporaryFolder& streams) const {
  std::istringstream text(arguments);
  const std::vector<std::string> words{std::istream_iterator<std::string>(text), {}};
  std::cout.flush();
  const pid_t child = fork();
  if (child == 0) {
    dup2(open("/dev/null", O_RDONLY), 0);
    dup2(open(streams.Path("out").c_str(), O_CREAT | O_WRONLY, 0600), 1);
    dup2(open(streams.Path("err").c_str(), O_CREAT | O_WRONLY, 0600), 2);
    cv::setNumThreads(-1);
    const int status = chdir(folder_.Path("").c_str()) == 0 ? qv::RunProgram(words) : -1;
    std::cout.flush();
    _exit(status);
  }
  int status = 0;
  waitpid(child, &status, 0);
  return status;
}

ProgramRun SimulatedPhotos::Run(const std::string& arguments, const std::string& before) const {
  const TemporaryFolder streams;
  const std::string command = "cd '" + folder_.Path("") + "' && " + before + "exec '" QVTESTER_PROGRAM "' </dev/null " +
                              arguments + " >'" + streams.Path("out") + "' 2>'" + streams.Path("err") + "'";
  const bool plain = before.empty() && arguments.find_first_of("'\"<>|&;*?$`\\") == std::string::npos;
  const int status = plain ? RunForked(arguments, streams)
                           : std::system(command.c_str());  // NOLINT(cert-env33-c): the tests' own words
  return {WIFEXITED(status) ? WEXITSTATUS(status) : 1000 + WTERMSIG(status), ReadFile(streams.Path("out")),
          ReadFile(streams.Path("err"))};
}

void SimulatedPhotos::ExpectComplaint(const std::string& arguments, int status, const std::string& complaint) const {
  const ProgramRun run = Run(arguments);
  EXPECT_EQ(status, run.status) << arguments;
  EXPECT_THAT(run.err, ::testing::HasSubstr(complaint)) << arguments;
}

namespace {

// What `explain` tells of each real figure's uncertainty is so: it has one by that method, or none.
void ExpectTrustAsToldOf(const json& record) {
  const json& request = record.at("request");
  if (request.contains("repeats")) return;                                                      // all have one
  const bool tiny = !record.at("inputs").empty() && record.at("inputs").at(0).at("width") < 3;  // shows no noise
  for (const auto& [name, m] : record.at("phases").at(0).at("measurements").items()) {
    const qv::FigureInfo& info = *qv::FindFigure(name);
    const qv::TrustLaw* const law = qv::LawOf(info);
    EXPECT_EQ(info.figure->number == qv::Number::kReal, law != nullptr) << name;
    const bool has_one = m.contains("uncertainty");
    if (law == nullptr || law->method == nullptr) {
      EXPECT_FALSE(has_one) << name;
    } else if (has_one) {
      EXPECT_EQ(law->method, m.at("uncertainty").at("method")) << name;
    } else if (!law->on_request || request.at("parameters").value("uncertainty", false)) {
      const json value = m.value("measured_value", json());
      EXPECT_TRUE(tiny || record.at("outcome") == "ERROR" || value.empty()) << name << " has none";
    }
  }
}

}  // namespace

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
  ExpectTrustAsToldOf(record);
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
