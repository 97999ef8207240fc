// The commands on a store, as a user gives them.

#include <gmock/gmock.h>

#include <filesystem>
#include <regex>
#include <sstream>

#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::HasSubstr;
using ::testing::Not;

class StoreProgram : public SimulatedPhotos {
 protected:
  std::string Read(const std::string& name) const { return ReadFile(folder_.Path(name)); }
  void Write(const std::string& name, const std::string& text) const { folder_.Write(name, text); }

  // A store of one run of a flash photo, a record beside it.
  void Measure() {
    Simulate("--size 400x300");
    Write("limits.json", R"({"name": "l", "revision": "1", "limits": {"camera_flash_mean": {"min": 1}}})");
    Run("flash photo.png --dut 'SN<1>' --limits limits.json --json record.json --quiet");
    ASSERT_THAT(Run("import record.json record.json -o store.db").out, HasSubstr("2 runs read, 1 new"));
  }
};

TEST_F(StoreProgram, ShowsJudgesAndReportsWhatWasMeasured) {
  Measure();
  Write("dark.json", R"({"name": "l", "revision": "2", "limits": {"camera_flash_mean": {"max": 1}}})");
  EXPECT_THAT(Run("show store.db").out, HasSubstr("1 run: 1 PASS; yield 100.0 %"));
  EXPECT_THAT(Run("show store.db 'SN<1>'").out, HasSubstr("camera_flash_mean           PASS"));
  EXPECT_EQ(0, Run("judge store.db --limits limits.json").status);
  const ProgramRun judged = Run("judge store.db --limits dark.json");
  EXPECT_EQ(1, judged.status);
  EXPECT_THAT(judged.out, HasSubstr("2 verdicts changed"));
  EXPECT_EQ(1, Run("judge store.db --limits dark.json --against limits.json").status);
  EXPECT_THAT(Run("study store.db --where 'unit=SN<1>'").out, HasSubstr("camera_flash_mean [level]"));
  // Of many changes the first forty are listed; a unit has two, its figure's and its run's.
  const std::string record = Read("record.json");
  for (int i = 0; i < 21; ++i) {
    Write("more" + std::to_string(i) + ".json",
          std::regex_replace(record, std::regex("SN<1>"), "SN" + std::to_string(i)));
  }
  EXPECT_THAT(Run("import more*.json -o many.db").out, HasSubstr("21 new"));
  EXPECT_THAT(Run("judge many.db --limits dark.json").out, HasSubstr("\n... and 2 more; --all shows them"));
  // Another bound makes another run, though nobody raised the revision.
  Write("limits.json", R"({"name": "l", "revision": "1", "limits": {"camera_flash_mean": {"min": 2}}})");
  Run("flash photo.png --dut 'SN<1>' --limits limits.json --json again.json --quiet");
  EXPECT_THAT(Run("import again.json -o copy.db").out, HasSubstr("1 new"));
  EXPECT_THAT(Run("import record.json -o copy.db").out, HasSubstr("1 new"));
  EXPECT_EQ(0, Run("report store.db -o page.html --junit tests.xml --plot plot.svg").status);
  EXPECT_THAT(Read("tests.xml"), HasSubstr("SN&lt;1&gt;"));
  EXPECT_EQ(0, Run("report record.json -o one.html").status);
  EXPECT_EQ(0, Run("export store.db -o all.jsonl").status);
  json line = json::parse(Read("all.jsonl"));
  line["pictures"] = {{{"name", "a.png"}, {"mimetype", "image/png"}, {"content", "iVBORw=="}}};
  Write("pictured.jsonl", line.dump());
  Run("import pictured.jsonl -o pictured.db");
  EXPECT_THAT(Run("export pictured.db -o -").out, HasSubstr("iVBORw=="));
  EXPECT_THAT(Run("export pictured.db -o - --no-pictures").out, Not(HasSubstr("iVBORw==")));
  EXPECT_THAT(Run("import all.jsonl -o store.db").out, HasSubstr("1 run read, 0 new"));
  EXPECT_EQ(json::parse(Read("record.json")), json::parse(Read("all.jsonl"))["record"]);
}

TEST_F(StoreProgram, RefusesWrongUseInASentence) {
  Measure();
  Write("broken.jsonl", "{\"schema\": \"qvtester-run-1\"}\n");
  const char* const kUses[][2] = {
      {"show none.db", "none.db: no such store"},
      {"show record.json", "can't be opened as a store"},
      {"show store.db SN9", "holds no run of unit SN9"},
      {"show store.db --where lto=3", "no run has a column or a figure named \"lto\""},
      {"show store.db --where lot", "is no condition"},
      {"show store.db --where time=today", "is no time"},
      {"show store.db --where \"lot' OR 1=1 --=x\"", "no run has a column"},
      {"judge store.db --limits none.json", "none.json: no such file"},
      {"study store.db --parts unit", "--parts and --operators belong together"},
      {"study store.db --parts unit --operators station", "at least 2 parts and 2 operators"},
      {"study store.db --figure nothing", "no figure whose name holds it"},
      {"study store.db --labels unit", "a label is"},
      {"report store.db", "nothing to write"},
      {"report store.db -o store.db", "store.db"},
      {"report store.db --lot L9 -o page.html", "no run is chosen"},
      {"export store.db -o all.txt", "name a .jsonl file"},
      {"import broken.jsonl -o other.db", "broken.jsonl: line 1: "},
      {"import none.jsonl -o other.db", "none.jsonl"},
      {"import record.json -o none/there.db", "none/there.db"},
  };
  for (const auto& [use, complaint] : kUses) ExpectComplaint(use, 2, complaint);
}

TEST_F(StoreProgram, KeepsWhatWasStoredWhenTheDiskIsFull) {
  Measure();
  std::string lines;
  for (int i = 0; i < 400; ++i) {
    json record = json::parse(Read("record.json"));
    record["dut_id"] = std::to_string(i);
    lines += record.dump() + "\n";
  }
  Write("many.jsonl", lines);
  // A file may not grow beyond this: what a full disk looks like to SQLite.
  const ProgramRun filled = Run("import many.jsonl -o store.db", "ulimit -f 300; ");
  EXPECT_EQ(4, filled.status) << filled.err;
  EXPECT_THAT(filled.err, HasSubstr("what was stored before is whole"));
  EXPECT_THAT(Run("show store.db 'SN<1>'").out, HasSubstr("PASS"));
  EXPECT_THAT(Run("import many.jsonl -o store.db").out, HasSubstr("400 runs read"));
  EXPECT_THAT(Run("show store.db").out, HasSubstr("401 runs"));
}

// A unit's photo is measured by three steps; the first can't, one has a standard, the last is judged by limits of its
// own.
TEST_F(StoreProgram, PlansCarryNothingOverAndStopWhereTheySay) {
  std::filesystem::create_directory(folder_.Path("SN1"));
  Simulate("--noise 0", "SN1/chart.png");
  Write("SN1/broken.png", "\x89PNG\r\n\x1a\n no picture");
  const auto plan = [](const char* stop) {
    return std::string(R"({"name": "p", "stop_on_error": )") + stop + R"(, "steps": [
      {"name": "broken", "measurement": "camera_flash", "inputs": ["{unit}/broken.png"]},
      {"name": "compared", "measurement": "camera_capture", "inputs": ["{unit}/chart.png"],
       "parameters": {"standard": "SN1/chart.png"}, "properties": {"93": 120}},
      {"name": "alone", "measurement": "camera_capture", "inputs": ["{unit}/chart.png"],
       "limits": {"limits": {"camera_capture_marks_found": {"min": 4}}}}]})";
  };
  const auto records = [&](const char* stop) {
    Write("p.json", plan(stop));
    EXPECT_EQ(3, Run("run p.json --unit SN1 --json - --quiet --junit p.xml -o " + std::string(stop) + ".db").status);
    std::vector<json> lines;
    std::istringstream stream(Run("run p.json --unit SN1 --json -").out);
    for (std::string line; std::getline(stream, line);) lines.push_back(json::parse(line));
    return lines;
  };
  EXPECT_EQ(1U, records("true").size());
  const std::vector<json> all = records("false");
  ASSERT_EQ(3U, all.size());
  EXPECT_EQ("ERROR", all[0]["outcome"]);
  EXPECT_EQ(0.0, Measured(all[1], "camera_capture_delta_e_76_max"));  // its own standard
  EXPECT_FALSE(all[2]["phases"][0]["measurements"].contains("camera_capture_delta_e_76_max"));
  EXPECT_EQ(120, Measured(all[1], "camera_capture_threshold"));
  EXPECT_NE(120, Measured(all[2], "camera_capture_threshold"));
  EXPECT_EQ("MEASURED", all[1]["outcome"]);
  EXPECT_EQ("FAIL", all[2]["outcome"]);
  EXPECT_THAT(Read("p.xml"), HasSubstr(R"(tests="3" failures="1" errors="1")"));
  // In fake mode blobs are not looked for, and a limit on them can't pass.
  Simulate("--scene dust --specks 2", "SN1/plain.png");
  Write("f.json", R"({"name": "f", "limits": {"limits": {"lens_dust_blob_count": {"max": 0}}}, "steps": [
      {"measurement": "lens_dust", "inputs": ["{unit}/plain.png"], "fake": true}]})");
  EXPECT_THAT(Run("plan f.json").out, HasSubstr("in fake mode"));
  EXPECT_EQ(3, Run("run f.json --unit SN1 --quiet").status);
  Write("f.json", Read("f.json").replace(Read("f.json").find("true"), 4, "false"));
  EXPECT_EQ(1, Run("run f.json --unit SN1 --quiet").status);
  // A batch over the folder that holds the unit stores the same runs; a standard is seen from the plan's folder.
  EXPECT_THAT(Run("batch p.json . -o false.db -j 1 --junit b.xml").out, HasSubstr("0 runs stored, 3 there before"));
  EXPECT_THAT(Read("b.xml"), HasSubstr(R"(tests="3" failures="1" errors="1")"));
}

TEST_F(StoreProgram, WhatIsNoNumberPassesNowhere) {
  folder_.Write("sn1.png", DrawMarks({900, 900}, 8, {{50, 50}, {50, 750}, {750, 50}}));  // marks, and no edges
  const std::string limit = R"({"limits": {"camera_autofocus_mtf50_vertical": {"min": -1e300, "max": 1e300}}})";
  Write("wide.json", limit);
  Write("plan.json", R"({"name": "p", "limits": )" + limit +
                         R"(, "steps": [{"measurement": "camera_autofocus", "inputs": ["{unit}.png"]}]})");
  Write("units.csv", "unit\nsn1\n");
  EXPECT_THAT(Run("run plan.json --unit sn1").out, Not(HasSubstr("PASS")));
  EXPECT_EQ(3, Run("batch plan.json units.csv -o results.db --quiet").status);
  EXPECT_EQ(3, Run("judge results.db --limits wide.json").status);
  EXPECT_THAT(Run("show results.db sn1").out, Not(HasSubstr("PASS")));
}

}  // namespace
