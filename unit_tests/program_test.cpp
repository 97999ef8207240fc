#include <gmock/gmock.h>

#include <cmath>
#include <opencv2/imgcodecs.hpp>

#include "unit_tests/drawing.h"
#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

class Program : public SimulatedPhotos {};

const cv::Vec3b kRed(26, 26, 230);
const cv::Vec3b kYellow(0, 204, 242);

int PixelsOf(const cv::Vec3b& colour, const std::string& picture) {
  const cv::Scalar slack = cv::Scalar::all(2);
  cv::Mat same;
  cv::inRange(cv::imread(picture), cv::Scalar(colour) - slack, cv::Scalar(colour) + slack, same);
  return cv::countNonZero(same);
}

TEST_F(Program, AutofocusReportsRecordsAndDraws) {
  const std::string photo = Simulate({"--turn", "3", "--blur", "0.8", "--noise", "1"});
  const std::string picture = folder_.Path("annotated.png");
  const std::string file = folder_.Path("record.json");
  const ProgramRun run =
      RunProgram({"autofocus", photo, "--json", file, "--annotate", picture, "--threshold", "110", "--dut", "SN0042"});
  EXPECT_EQ(0, run.status) << run.err;
  EXPECT_THAT(run.err, IsEmpty());
  EXPECT_THAT(run.out,
              AllOf(HasSubstr("MTF50      vertical"), HasSubstr("Nyquist"), HasSubstr("c/p"), HasSubstr("PASS")));

  const json record = CheckedRecord(ReadFile(file));
  EXPECT_EQ("PASS", record["outcome"]);
  EXPECT_EQ("SN0042", record["dut_id"]);
  EXPECT_EQ(14, record["metadata"]["test_index"]);
  EXPECT_EQ(json({{"93", 110}}), record["metadata"]["properties"]) << "only what differs from its default";
  EXPECT_EQ(1200, record["inputs"][0]["width"]);
  EXPECT_EQ(110, Measured(record, "camera_autofocus_threshold"));
  for (const std::string region : {"vertical", "horizontal"}) {
    const double mtf50 = Measured(record, "camera_autofocus_mtf50_" + region);
    const json expected = Truth()["mtf50"][region];
    EXPECT_GT(mtf50, 0.85 * expected["expected_low_nyquist"].get<double>());  // straightening softens
    EXPECT_LT(mtf50, 1.05 * expected["expected_high_nyquist"].get<double>());
  }
  const json curve = Measured(record, "camera_autofocus_sfr_vertical");
  EXPECT_EQ(json({0.0, 1.0}), curve[0]);
  EXPECT_GT(cv::imread(picture).cols, 1200);
}

TEST_F(Program, MarksAndTheStandardsFigureAreTheTrueOnesAtAnyTurn) {
  for (const std::string turn : {"0", "3", "-62", "90", "-170", "31"}) {
    const std::string photo = Simulate({"--turn", turn, "--blur", "0.8", "--size", "2000x1500"});
    const json truth = Truth();
    for (const auto& [command, phase] :
         {std::pair<std::string, std::string>("autofocus", "camera_autofocus"), {"mtf", "mtf_check"}}) {
      const json record = CheckedRecord(RunProgram({command, photo, "--json", "-"}).out);
      for (std::size_t i = 0; i < 3; ++i) {
        const json mark = Measured(record, phase + "_marks")[i];
        EXPECT_NEAR(truth["marks"][i]["x"], mark[0], 1.5) << "mark " << i << ", turned by " << turn;
        EXPECT_NEAR(truth["marks"][i]["y"], mark[1], 1.5) << "mark " << i << ", turned by " << turn;
      }
      for (const std::string region : {"vertical", "horizontal"}) {
        const double mtf50 = truth["mtf50"][region]["mtf50_nyquist"];
        // 1 % is the method's, without noise.
        EXPECT_NEAR(mtf50, Measured(record, phase + "_mtf50_iso_" + region), 0.01 * mtf50) << turn;
      }
    }
  }
}

TEST_F(Program, AnEdgeWithoutAFigureSaysSo) {
  const std::string along = Simulate({"--turn", "-5"});  // against the edges' own slant
  ProgramRun run = RunProgram({"autofocus", along, "--json", "-"});
  EXPECT_EQ(0, run.status) << "the test's own figure stands";
  EXPECT_THAT(run.err, HasSubstr("no MTF50 after ISO 12233 of the vertical region: the edge follows the pixel grid"));
  EXPECT_EQ(nullptr, Measured(CheckedRecord(run.out), "camera_autofocus_mtf50_iso_vertical"));

  const std::string flat = folder_.Write("flat.png", DrawMarks({900, 900}, 8, {{50, 50}, {50, 750}, {750, 50}}));
  run = RunProgram({"autofocus", flat, "--json", "-"});
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.err, HasSubstr("the vertical region gives no MTF50"));
  const json record = CheckedRecord(run.out);
  EXPECT_EQ("ERROR", record["outcome"]);
  EXPECT_EQ(nullptr, Measured(record, "camera_autofocus_mtf50_vertical"));
  EXPECT_EQ("nan", record["phases"][0]["measurements"]["camera_autofocus_mtf50_vertical"]["non_finite"]);
}

TEST_F(Program, LimitsDecideTheVerdict) {
  const std::string photo = Simulate({"--blur", "1"});
  const auto judge = [&](const std::string& limits) {
    const std::string path =
        folder_.Write("limits.json", R"({"name": "a", "revision": "3", "limits": )" + limits + "}");
    return RunProgram({"autofocus", photo, "--json", "-", "--limits", path});
  };
  const char* const kName = "camera_autofocus_mtf50_vertical";
  ProgramRun run =
      judge(R"({"camera_autofocus_mtf50_vertical": {"min": 0.1, "marginal_min": 0.9, "unit": "Nyquist"}})");
  EXPECT_EQ(0, run.status);
  json record = CheckedRecord(run.out);
  EXPECT_TRUE(record["marginal"]);
  EXPECT_EQ("PASS", record["outcome"]);
  EXPECT_EQ(0.9, record["phases"][0]["measurements"][kName]["limits"]["marginal_min"]);
  EXPECT_THAT(run.err, HasSubstr("MTF50")) << "the report gives way to the record";

  run = judge(R"({"camera_autofocus_mtf50_vertical": {"min": 0.9}})");
  EXPECT_EQ(1, run.status);
  EXPECT_EQ("FAIL", CheckedRecord(run.out)["outcome"]);

  for (const auto& [limits, complaint] :
       {std::pair(R"({"camera_autofocus_mtf51": {"min": 0}})", "camera_autofocus_mtf51: no measurement"),
        {R"({"camera_autofocus_mtf50_vertical": {"min": 0, "unit": "px"}})", R"(its unit is "Nyquist", not "px")"},
        {R"({"camera_autofocus_mtf50_vertical": {"min": "0"}})", "not a number"},
        {R"({"camera_autofocus_mtf50_vertical": {"minimum": 0}})", "neither a bound nor a unit"},
        {R"({"camera_autofocus_mtf50_vertical": {"min": 2, "max": 1}})", "its min lies above its max"},
        {R"({"camera_autofocus_mtf50_vertical": {}})", "it has no bound"},
        {R"({"camera_autofocus_mtf50_vertical": 5})", "not an object"},
        {R"({"camera_flash_mean": {"min": 1}, "camera_flash_mean": {"min": 2}})", "stands there twice"},
        {R"([])", "no object"},
        {R"([)", "not a limits file"}}) {
    run = judge(limits);
    EXPECT_EQ(2, run.status) << limits;
    EXPECT_THAT(run.err, HasSubstr(complaint));
  }
}

TEST_F(Program, MissesSayWhy) {
  const std::string sharp = Simulate();
  ProgramRun run = RunProgram({"autofocus", sharp, "--threshold", "250", "--json", folder_.Path("miss.json")});
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.out, IsEmpty());
  EXPECT_THAT(run.err, AllOf(HasSubstr("no finder mark was found"), HasSubstr("threshold of 250"),
                             HasSubstr("code -91"), HasSubstr("QV_ERROR_PATTERN_NOT_FOUND")));
  const json record = CheckedRecord(ReadFile(folder_.Path("miss.json")));
  EXPECT_EQ("ERROR", record["outcome"]);
  EXPECT_EQ(-91, record["phases"][0]["result_code"]);

  ChartView two;
  two.marks = 2;
  run = RunProgram({"mtf", folder_.Write("two.png", DrawChart(two)), "--annotate", folder_.Path("two-seen.png")});
  EXPECT_EQ(3, run.status);
  EXPECT_THAT(run.err, AllOf(HasSubstr("two.png: 2 of 3 finder marks were found"), Not(HasSubstr("--threshold"))));
  EXPECT_GT(PixelsOf(kRed, folder_.Path("two-seen.png")), 100) << "the candidates are ringed";

  const std::string small = folder_.Write("small.png", DrawMarks({300, 300}, 2, {{50, 50}, {50, 200}}));
  EXPECT_THAT(RunProgram({"circles", small}).err, HasSubstr("the marks are small (2.0 pixels a module"));
}

TEST_F(Program, AThresholdIsSuggestedOnceItHasWorked) {
  const std::string dark = Simulate({"--exposure", "-2", "--blur", "0.5"});
  const std::string picture = folder_.Path("seen.png");
  const ProgramRun run = RunProgram({"autofocus", dark, "--json", "-", "--annotate", picture});
  EXPECT_EQ(3, run.status);
  const json record = CheckedRecord(run.out);
  // White paper at 0.92 of 255 and the edges' dark side at a fifth of it, both two stops down.
  EXPECT_NEAR(59, Measured(record, "camera_autofocus_grey_peak_light").get<int>(), 1);
  EXPECT_NEAR(12, Measured(record, "camera_autofocus_grey_peak_dark").get<int>(), 1);
  const std::string threshold = Measured(record, "camera_autofocus_suggested_threshold").dump();
  EXPECT_THAT(run.err, HasSubstr("tried: --threshold " + threshold + " finds all three"));
  EXPECT_GT(PixelsOf(kYellow, picture), 300) << "the three are ringed";
  EXPECT_EQ(0, RunProgram({"autofocus", dark, "--threshold", threshold}).status);

  const std::string flat = folder_.Write("flat.png", cv::Mat(300, 300, CV_8UC1, cv::Scalar(90)));
  EXPECT_THAT(RunProgram({"autofocus", flat}).err, AllOf(HasSubstr("hardly any contrast"), Not(HasSubstr("tried"))));
  // The standard photo is searched at a threshold of its own, which --threshold does not reach.
  EXPECT_THAT(RunProgram({"capture", Simulate({}, "good"), "--standard", dark}).err,
              AllOf(HasSubstr(dark + ": no finder mark"), HasSubstr("tried: property 86 at " + threshold)));
}

TEST_F(Program, DoubtfulFindsNeverPass) {
  const auto check = [&](cv::Point third) {
    const cv::Mat marks = DrawMarks({900, 900}, 8, {{50, 50}, {50, 800}, third});
    return RunProgram({"circles", folder_.Write("marks.png", marks), "--json", "-"});
  };
  for (const auto& [third, finding] : {std::pair(cv::Point(500, 50), "the legs between the marks are as 1.667 to 1"),
                                       {cv::Point(795, 120), "at 84.6 degrees"}}) {
    const ProgramRun run = check(third);
    EXPECT_EQ(1, run.status);
    EXPECT_THAT(run.err, AllOf(HasSubstr("the find is doubtful"), HasSubstr(finding)));
    EXPECT_EQ("FAIL", CheckedRecord(run.out)["outcome"]);
  }
  EXPECT_EQ(0, check({740, 105}).status) << "as 1.08 to 1, at 85.4 degrees: within bounds";
}

TEST_F(Program, BadInputIsACodeAndASentence) {
  const std::string png = ReadFile(folder_.Write("small.png", cv::Mat(1, 1, CV_8UC3, cv::Scalar(9, 9, 9))));
  const std::vector<std::pair<std::string, std::string>> bad = {
      {folder_.Path("missing.png"), "no such file"},
      {folder_.Path(""), "is a directory"},
      {folder_.Write("empty.jpg", std::string()), "the file is empty"},
      {folder_.Write("words.jpg", std::string("words")), "not a picture that can be decoded"},
      {folder_.Write("cut.png", png.substr(0, 25)), "not a picture that can be decoded"}};
  for (const auto& [path, complaint] : bad) {
    for (const char* command : {"autofocus", "mtf", "flash"}) {
      const ProgramRun run = RunProgram({command, path, "--json", "-"});
      EXPECT_EQ(3, run.status) << path;
      EXPECT_THAT(run.err, AllOf(HasSubstr(path), HasSubstr(complaint), HasSubstr("code -97")));
      EXPECT_EQ("ERROR", CheckedRecord(run.out)["outcome"]);
    }
  }
  EXPECT_EQ(3, RunProgram({"autofocus", folder_.Path("small.png")}).status);
  EXPECT_EQ(0, RunProgram({"flash", folder_.Path("small.png")}).status);
}

TEST_F(Program, ACutPhotoIsMeasuredWithAWarningAndVerboseShowsTheLog) {
  std::vector<uchar> jpeg;
  cv::imencode(".jpg", DrawChart(), jpeg, {cv::IMWRITE_JPEG_QUALITY, 95});
  const std::string photo = folder_.Write("cut.jpg", std::string(jpeg.begin(), jpeg.end() - 400));
  const ProgramRun run = RunProgram({"autofocus", photo});
  EXPECT_EQ(0, run.status);
  EXPECT_THAT(run.err, AllOf(HasSubstr("warning: "), HasSubstr("Premature end"), HasSubstr("is the file cut?")));
  const ProgramRun verbose = RunProgram({"autofocus", photo, "--verbose", "--quiet"});
  EXPECT_THAT(verbose.out, IsEmpty());
  EXPECT_THAT(verbose.err, AllOf(HasSubstr("[GetSFRFromImage] prop_binary_thr_working_: 125\n"), Not(HasSubstr("\r"))));
}

TEST_F(Program, FlashReadsEitherCameraAndStandardInput) {
  const cv::Mat two = (cv::Mat_<cv::Vec3b>(1, 2) << cv::Vec3b(200, 1, 2), cv::Vec3b(15, 1, 2));
  const std::string png = ReadFile(folder_.Write("flash.png", two));
  json record = CheckedRecord(RunProgram({"flash", "-", "--json", "-"}, png).out);
  EXPECT_EQ(107.5, Measured(record, "camera_flash_mean"));
  EXPECT_EQ("standard input", record["inputs"][0]["path"]);
  record = CheckedRecord(RunProgram({"flash", "--vt", "-", "--json", "-"}, png).out);
  EXPECT_EQ(18, record["metadata"]["test_index"]);
  EXPECT_EQ(107.5, Measured(record, "camera_flash_vt_mean"));
}

TEST_F(Program, WrongUsageIsStatusTwo) {
  for (const std::vector<std::string>& arguments :
       std::vector<std::vector<std::string>>{{},
                                             {"frobnicate"},
                                             {"autofocus"},
                                             {"autofocus", "a.png", "--threshold", "x"},
                                             {"list", "colours"},
                                             {"simulate"},
                                             {"simulate", "-o", folder_.Path("a.png"), "--size", "40"},
                                             {"simulate", "-o", folder_.Path("a.png"), "--blur", "nan"},
                                             {"simulate", "-o", folder_.Path("a.png"), "--cast", "1,1"},
                                             {"autofocus", "a.png", "--annotate", "a.jpg"},
                                             {"autofocus", "a.png", "--annotate", "-", "--json", "-"},
                                             {"simulate", "-o", folder_.Path("a.nothing"), "--size", "40x40"},
                                             {"autofocus", "a.png", "--limits", folder_.Path("missing.json")}}) {
    const ProgramRun run = RunProgram(arguments);
    EXPECT_EQ(2, run.status) << ::testing::PrintToString(arguments);
    EXPECT_THAT(run.err, Not(IsEmpty()));
  }
  EXPECT_EQ(0, RunProgram({"--help"}).status);
  EXPECT_THAT(RunProgram({"--version"}).out, HasSubstr("qvtester "));
}

TEST_F(Program, ListsShowEveryRow) {
  EXPECT_THAT(RunProgram({"list", "tests"}).out, HasSubstr("29  QV_TEST_TOUCH_PANEL_PRINT"));
  EXPECT_THAT(RunProgram({"list", "slots"}).out, HasSubstr("17  image                QV_TEST_CAMERA_AUTOFOCUS"));
  EXPECT_THAT(RunProgram({"list", "properties"}).out, HasSubstr("93  prop_binary_thr_working_       int        125"));
  EXPECT_THAT(RunProgram({"list", "codes"}).out, HasSubstr("-91  QV_ERROR_PATTERN_NOT_FOUND"));
}

}  // namespace
