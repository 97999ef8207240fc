#include "desk/results/archive.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <sstream>
#include <valijson/adapters/nlohmann_json_adapter.hpp>
#include <valijson/schema.hpp>
#include <valijson/schema_parser.hpp>
#include <valijson/validator.hpp>

#include "desk/results/judge.h"
#include "desk/results/pack.h"
#include "desk/results/report.h"
#include "desk/results/study.h"
#include "desk/results/svg_plot.h"
#include "unit_tests/results.h"

namespace qv {
namespace {

using ::testing::HasSubstr;
using ::testing::ThrowsMessage;

constexpr char kEvil[] = "<b>&\"'\n,;\xc3\xa4</script>";

class Archive : public ::testing::Test {
 protected:
  Store Open(const std::string& name, Store::Use use = Store::Use::kWrite) {
    return {folder_.path() + "/" + name, use};
  }
  static std::string Lines(Store& store) {
    std::string lines;
    ExportLines(store, {}, true, [&](const std::string& part) { lines += part; });
    return lines;
  }
  ScratchFolder folder_;
};

void ExpectValid(const nlohmann::json& document, const std::string& schema_file) {
  const nlohmann::json text = nlohmann::json::parse(ReadWholeFile(QVTESTER_DOCS "/" + schema_file, kWrongUsage));
  valijson::Schema schema;
  valijson::SchemaParser().populateSchema(valijson::adapters::NlohmannJsonAdapter(text), schema);
  valijson::ValidationResults results;
  const valijson::adapters::NlohmannJsonAdapter adapter(document);
  if (valijson::Validator().validate(schema, adapter, &results)) return;
  valijson::ValidationResults::Error error;
  while (results.popError(error)) ADD_FAILURE() << schema_file << ": " << error.description;
}

std::vector<StoredRun> SomeRuns() {
  std::vector<StoredRun> runs = {RunOf(kEvil, 0.1 + 0.2), RunOf("B", nullptr, "nan", "FAIL"),
                                 RunOf("C", 0.05, nullptr, "FAIL"), RunOf("D", 3, nullptr, "ERROR"),
                                 RunOf("E", 4, nullptr, "ERROR", -91)};
  runs[0].filing = {"ann", "L=1", "plan", "main", {{kEvil, kEvil}}};
  runs[0].pictures = {{"a.png", "image/png", std::string("\x89PNG\0\xff", 6)}, {"a.html", "text/html", "<script>"}};
  runs[3].record["outcome_details"] =
      Json::array({{{"code", 1}, {"description", "the paper is clipped"}, {"name", "clipped"}, {"weight", "doubt"}}});
  return runs;
}

TEST_F(Archive, ComesBackAsItWentAndHoldsItsSchema) {
  Store first = Open("first.db");
  first.Put(SomeRuns());
  const std::string lines = Lines(first);
  Store second = Open("second.db");
  for (const std::size_t added : {5U, 0U}) {
    std::istringstream stream(lines);
    EXPECT_EQ(added, ImportLines(stream, "x", second).added);
  }
  EXPECT_EQ(lines, Lines(second));
  std::istringstream stream(lines);
  for (std::string line; std::getline(stream, line);) ExpectValid(nlohmann::json::parse(line), "run.schema.json");

  std::istringstream broken(lines.substr(0, lines.size() - 20));  // cut in the last line
  Store third = Open("third.db");
  EXPECT_THAT([&] { ImportLines(broken, "x", third); }, ThrowsMessage<Failure>(HasSubstr("x: line 5")));
  EXPECT_EQ(4, third.Count());
}

TEST_F(Archive, IsATableForSpreadsheets) {
  Store store = Open("store.db");
  store.Put({SomeRuns()[0], SomeRuns()[1], RunOf("x\ry", nullptr, "-inf", "FAIL")});
  std::string table;
  ExportTable(store, {}, [&](const std::string& part) { table += part; });
  const std::string quoted = "\"<b>&\"\"'\n,;\xc3\xa4</script>\"";
  EXPECT_THAT(table, HasSubstr("key," + quoted + ",flash_mean [level]\r\n"));
  EXPECT_THAT(table, HasSubstr("\r\n" + quoted + ",s,ann,L=1,plan,main,flash,PASS,0,1,2026-11-21T04:47:39Z,"));
  EXPECT_THAT(table, HasSubstr("," + quoted + ",0.30000000000000004\r\n"));
  EXPECT_THAT(table, HasSubstr(",,nan\r\n"));
  EXPECT_THAT(table, HasSubstr("\r\n\"x\ry\","));
  EXPECT_THAT(table, HasSubstr(",,-inf\r\n"));
}

struct JudgeCase {
  const char* name;
  StoredRun run;
  ArchiveLimits limits;
  const char* outcome;
};

TEST_F(Archive, IsJudgedAgainByOtherLimits) {
  const double max = std::numeric_limits<double>::max();
  const ArchiveLimits loose = {{{"flash_mean", {-max, max, {}, {}}}}, {}};
  const ArchiveLimits tight = {{{"flash_mean", {1.0, {}, {}, {}}}}, {}};
  const ArchiveLimits more = {{{"flash_mean", {0.0, {}, {}, {}}}, {"flash_else", {0.0, {}, {}, {}}}}, {}};
  ArchiveLimits accepting = loose;
  accepting.accepted_doubts = {"clipped"};
  const std::vector<StoredRun> runs = SomeRuns();
  const std::vector<JudgeCase> cases = {{"within", runs[0], loose, "PASS"},
                                        {"broken", runs[0], tight, "FAIL"},
                                        {"on the limit", RunOf("x", 1.0), tight, "PASS"},
                                        {"NaN", runs[1], loose, "FAIL"},
                                        {"infinite", RunOf("x", nullptr, "inf", "FAIL"), loose, "FAIL"},
                                        {"now passes", runs[2], loose, "PASS"},
                                        {"limit on what was not measured", runs[0], more, "ERROR"},
                                        {"doubted", runs[3], loose, "ERROR"},
                                        {"doubt accepted", runs[3], accepting, "PASS"},
                                        {"not measured", runs[4], accepting, "ERROR"}};
  for (const JudgeCase& test : cases) {
    Store store = Open(std::string(test.name) + ".db");
    store.Put(test.run);
    const Judgement judged = JudgeAgain(store, {}, test.limits, nullptr);
    EXPECT_EQ(1, judged.runs_after.of(test.outcome)) << test.name;
    EXPECT_EQ(1, judged.units_after.of(test.outcome)) << test.name;
    const bool changed = TextAt(test.run.record, "outcome") != test.outcome;
    EXPECT_EQ(changed, !judged.changes.empty() && judged.changes.back().after == test.outcome) << test.name;
  }
}

struct RuleCase {
  const char* rule;
  double factor, flash_min;
  const char* outcome;  // of the run
};

// As ALimitNearTheReadingFollowsTheRule has it of measuring.
TEST_F(Archive, IsJudgedAgainByTheRuleOfTheLimits) {
  Store store = Open("store.db");
  StoredRun run = RunOf("x", 1);
  run.record["request"]["measurement"] = run.record["phases"][0]["name"] = "camera_flash";
  Json figure = run.record["phases"][0]["measurements"]["flash_mean"];
  figure["uncertainty"] = {{"standard", 0.2}, {"expanded", 0.5}};
  Json unknown = figure;
  unknown.erase("uncertainty");
  const Json list = {{"outcome", "MEASURED"},
                     {"measured_value", {{0, 1.5}, {7, 2.5}}},
                     {"uncertainty", {{"standard", {0.2, 0.1}}, {"expanded", {0.4, 0.2}}}}};
  run.record["phases"][0]["measurements"] = {{"camera_flash_mean", figure}, {"camera_flash_mean_red", unknown}};
  run.record["outcome_details"] = Json::array({{{"name", "no_uncertainty"}, {"weight", "no judgement"}}});
  store.Put(run);
  StoredRun patches = RunOf("y", 1);
  patches.record["request"]["measurement"] = patches.record["phases"][0]["name"] = "camera_capture";
  patches.record["phases"][0]["measurements"] = {{"camera_capture_delta_e_76", list}};
  store.Put(patches);
  const auto limits = [](const RuleCase& test, const std::string& figure_name) {
    return ArchiveLimits{
        {{figure_name, {test.flash_min, {}, {}, {}}}}, {}, {}, {*ParseDecisionRule(test.rule), test.factor}};
  };
  for (const RuleCase& test : std::vector<RuleCase>{{"simple", 1, 0.9, "PASS"},
                                                    {"guarded", 1, 0.51, "FAIL"},
                                                    {"guarded", 1, 0.49, "PASS"},
                                                    {"guarded", 0.5, 0.74, "PASS"},
                                                    {"guarded", 0.5, 0.76, "FAIL"},
                                                    {"guarded_rejection", 1, 1.49, "PASS"},
                                                    {"guarded_rejection", 1, 1.51, "FAIL"}}) {
    const Selection flash = {{"measurement", "=", "camera_flash"}};
    const Judgement judged = JudgeAgain(store, flash, limits(test, "camera_flash_mean"), nullptr);
    EXPECT_EQ(1, judged.runs_after.of(test.outcome)) << test.rule << test.flash_min;
    EXPECT_EQ(1, JudgeAgain(store, flash, limits(test, "camera_flash_mean_red"), nullptr)
                     .runs_after.of(test.rule == std::string("simple") ? "PASS" : "ERROR"))
        << "without an uncertainty no guard band is known";
    const ArchiveLimits before = limits(test, "camera_flash_mean");
    EXPECT_EQ(1, JudgeAgain(store, flash, limits({"simple", 1, 0, ""}, "camera_flash_mean"), &before)
                     .runs_before.of(test.outcome))
        << test.rule << test.flash_min;
  }
  for (const auto& [rule, max, outcome] :
       {std::tuple("guarded", 2.71, "PASS"), {"guarded", 2.69, "FAIL"}, {"guarded_rejection", 2.31, "PASS"}}) {
    const ArchiveLimits own = {
        {}, {}, {{"camera_capture_delta_e_76", {{{}, max, {}, {}}, {}}}}, {*ParseDecisionRule(rule), 1}};
    EXPECT_EQ(1, JudgeAgain(store, {}, own, nullptr).runs_after.of(outcome)) << rule << max;
  }
}

TEST_F(Archive, ListsAreJudgedAgainByTheirEntries) {
  Store store = Open("lists.db");
  StoredRun run = RunOf("x", 1);
  run.record["request"]["measurement"] = run.record["phases"][0]["name"] = "camera_capture";
  run.record["phases"][0]["measurements"] = {
      {"camera_capture_delta_e_76", {{"outcome", "MEASURED"}, {"measured_value", {{0, 1.5}, {7, 2.5}}}}},
      {"camera_capture_lab_l",
       {{"outcome", "FAIL"}, {"limits", {{"each", {{"max", 1}}}}}, {"measured_value", {{0, 2}}}}}};
  store.Put(run);
  const std::string name = "camera_capture_delta_e_76";
  const ListBounds each = {{{}, 2.0, {}, {}}, {}};
  const ListBounds own = {{{}, 2.0, {}, {}}, {{7, {{}, 3.0, {}, {}}}}};
  const ListBounds lacking = {{{}, 3.0, {}, {}}, {{8, {{}, 3.0, {}, {}}}}};
  for (const auto& [bounds, outcome] : {std::pair(each, "FAIL"), {own, "PASS"}, {lacking, "ERROR"}}) {
    const Judgement judged = JudgeAgain(store, {}, {{}, {}, {{name, bounds}}}, nullptr);
    EXPECT_EQ(1, judged.runs_after.of(outcome)) << outcome;
    EXPECT_EQ(name, judged.figures.back().name);
  }
  const ArchiveLimits before = {{}, {}, {{name, each}}};
  EXPECT_EQ(1, JudgeAgain(store, {}, {{}, {}, {{name, own}}}, &before).runs_before.of("FAIL"));
  EXPECT_EQ(1, JudgeAgain(store, {}, {{}, {}, {{"camera_capture_lab_l", own}}}, nullptr).runs_after.of("ERROR"));
  EXPECT_THROW(JudgeAgain(store, {}, {{}, {}, {{"camera_capture_delta_e_2000", own}}}, nullptr), Failure);
  // The front camera's limits are not asked of the main one.
  ArchiveLimits both = {{{"camera_capture_front_delta_e_76_mean", {{}, 1.0, {}, {}}}}, {}, {{name, own}}};
  EXPECT_EQ(1, JudgeAgain(store, {}, both, nullptr).runs_after.of("PASS"));
}

TEST_F(Archive, TellsYieldByFigureBeforeAndAfter) {
  Store store = Open("store.db");
  for (int i = 0; i < 10; ++i) store.Put(RunOf(std::to_string(i), i, nullptr, i == 0 ? "FAIL" : "PASS"));
  const ArchiveLimits now = {{{"flash_mean", {4.0, {}, {}, {}}}}, {}};
  const ArchiveLimits old = {{{"flash_mean", {2.0, {}, {}, {}}}}, {}};
  EXPECT_EQ(0.9, JudgeAgain(store, {}, now, nullptr).figures.at(0).before.yield());
  const Judgement judged = JudgeAgain(store, {}, now, &old);
  EXPECT_EQ(0.8, judged.figures.at(0).before.yield());
  EXPECT_EQ(0.6, judged.figures.at(0).after.yield());
  EXPECT_EQ(4U, judged.changes.size());  // two units, each with its figure and its run
  EXPECT_THROW(JudgeAgain(store, {}, {{{"other", {1.0, {}, {}, {}}}}, {}}, nullptr), Failure);
}

TEST_F(Archive, CountsAUnitByItsLatestRuns) {
  UnitVerdicts units;
  RunRow row;
  row.unit = "A";
  row.step = "main";
  const auto add = [&](const char* step, std::int64_t start, const char* outcome) {
    row.step = step;
    row.start_millis = start;
    units.Add(row, outcome);
  };
  add("main", 2, "PASS");
  add("main", 1, "FAIL");  // earlier, stored later
  add("front", 1, "MEASURED");
  EXPECT_EQ(1, units.tally().of("PASS"));
  add("front", 3, "ERROR");
  EXPECT_EQ(1, units.tally().of("ERROR"));
  add("front", 3, "PASS");  // in the same moment: what was stored last
  EXPECT_EQ(0, units.tally().of("ERROR"));
}

TEST_F(Archive, IsStudiedWithoutWhatEndedInError) {
  Store store = Open("store.db");
  store.Put(SomeRuns());
  const Study study = StudyFigures(store, {}, {}, {}, true);
  ASSERT_EQ(2U, study.figures.size());  // of the step "main", and of no step
  EXPECT_EQ(2, study.left_out);
  EXPECT_EQ(1, study.figures[0].moments.count());
  EXPECT_EQ(1, study.figures[1].moments.count());
  EXPECT_EQ(1, study.figures[1].moments.not_finite());
  EXPECT_EQ(0.05, study.figures[1].moments.mean());
  EXPECT_FALSE(study.figures[1].bounds_vary);
  StoredRun run = RunOf("SN9", 0.2);
  run.record["phases"][0]["measurements"]["flash_mean"]["limits"]["min"] = 0.15;
  store.Put(run);
  EXPECT_TRUE(StudyFigures(store, {}, {}, {}, true).figures[1].bounds_vary);
}

TEST(SvgPlot, LiftsThePenOverGapsAndEscapesWords) {
  SvgPanel panel;
  panel.title = "a&b";
  panel.series = {{"", {{1, 1}, {2, NAN}, {3, 1}, {4, 2}}}};
  const std::string svg = SvgDocument({panel});
  EXPECT_THAT(svg, HasSubstr(">a&amp;b<"));
  EXPECT_EQ(1, std::count(svg.begin(), svg.end(), 'L')) << "one stroke, from 3 to 4";
}

// What a page holds, taken out of its HTML.
Json DataOf(const std::string& html) {
  const std::string mark = "id=\"data\">";
  const std::size_t start = html.find(mark) + mark.size();
  return Json::parse(Unpack(html.substr(start, html.find('<', start) - start)));
}

TEST_F(Archive, BecomesAReportWhoseWordsAreData) {
  Report report(kEvil, Report::Pictures::kAll);
  for (const StoredRun& run : SomeRuns()) report.Add(run);
  StoredRun list = RunOf("F", 1, nullptr, "FAIL");
  list.record["phases"][0]["measurements"]["flash_patches"] = {{"outcome", "FAIL"},
                                                               {"measured_value", {{3, 0.5}, {7, nullptr}, {8, 4}}},
                                                               {"decision", {{"broken", {7, 8}}}},
                                                               {"limits", {{"each", {{"max", 3}}}}}};
  report.Add(list);
  const std::string html = report.Html();
  const Json data = DataOf(html);
  ExpectValid(nlohmann::json(data), "report.schema.json");
  EXPECT_EQ(std::string::npos, html.find("<b>&"));
  EXPECT_EQ(kEvil, data["unit"][0]);
  EXPECT_EQ(1U, data["pictures"].size());  // a picture that is none is left out
  EXPECT_EQ(Json({0.05, 3, 4}),
            Json({data["figures"][1]["value"][1], data["figures"][1]["value"][2], data["figures"][1]["value"][3]}));
  EXPECT_EQ("nan", data["figures"][1]["value"][0]);
  EXPECT_EQ("3 values, 0.5 to 4; outside: 7, 8", data["figures"][2]["list"]["5"]);
  const Json& curve = data["curves"][0]["points"][0];  // straight from 1 at 0 to 0.25 at 0.75, then nothing
  EXPECT_EQ(Json({10000, 5000, 2500, nullptr}), Json({curve[0], curve[50], curve[75], curve[76]}));
  const std::string junit = report.JUnit();
  EXPECT_THAT(junit, HasSubstr(R"(tests="6" failures="3" errors="2")"));
  EXPECT_THAT(junit, HasSubstr("name=\"&lt;b&gt;&amp;&quot;' ,;"));
  EXPECT_THAT(junit, HasSubstr(R"(message="flash_mean: 0.05 level, limit at least 0.1")"));
  EXPECT_THAT(junit, HasSubstr("flash_patches: 3 values, 0.5 to 4; outside: 7, 8, limit each at most 3"));
  EXPECT_THAT(report.Plot(), HasSubstr("min 0.1"));
}

}  // namespace
}  // namespace qv
