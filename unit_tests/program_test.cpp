#include <gmock/gmock.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "desk/simulation/method_law.h"
#include "unit_tests/golden.h"
#include "unit_tests/program.h"

namespace {

using nlohmann::json;
using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

using Program = SimulatedPhotos;

int PixelsOf(const cv::Scalar& colour, const std::string& picture) {
  cv::Mat same;
  cv::inRange(cv::imread(picture), colour - cv::Scalar::all(2), colour + cv::Scalar::all(2), same);
  return cv::countNonZero(same);
}

TEST_F(Program, AutofocusReportsRecordsAndDraws) {
  Simulate("--turn 3 --blur 0.8 --noise 1");
  const ProgramRun run = Run("autofocus photo.png --json record.json");
  EXPECT_THAT(run.err, IsEmpty());
  EXPECT_THAT(run.out,
              AllOf(HasSubstr("MTF50      vertical"), HasSubstr("Nyquist"), HasSubstr("c/p"), HasSubstr("MEASURED")));

  const json record = Record("autofocus photo.png --annotate seen.png --threshold 110 --dut SN0042");
  EXPECT_EQ("MEASURED", record["outcome"]) << "without a limit nothing passes";
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
  EXPECT_EQ(json({0.0, 1.0}), Measured(record, "camera_autofocus_sfr_vertical")[0]);
  EXPECT_GT(cv::imread(folder_.Path("seen.png")).cols, 1200);
}

TEST_F(Program, MarksAndTheStandardsFigureAreTheTrueOnesAtAnyTurn) {
  for (const std::string turn : {"0", "3", "-62", "90", "-170", "31"}) {
    Simulate("--blur 0.8 --size 2000x1500 --turn " + turn);
    const json truth = Truth();
    for (const auto& [command, phase] : {std::pair("autofocus", "camera_autofocus"), {"mtf", "mtf_check"}}) {
      const json record = Record(std::string(command) + " photo.png --transfer linear");
      for (std::size_t i = 0; i < 3; ++i) {
        const json mark = truth["marks"][i];
        const json seen = Measured(record, std::string(phase) + "_marks")[i];
        EXPECT_LT(cv::norm(cv::Point2d(mark["x"], mark["y"]) - cv::Point2d(seen[0], seen[1])), 1.5)
            << i << ", " << turn;
      }
      for (const std::string region : {"vertical", "horizontal"}) {
        const double mtf50 = truth["mtf50"][region]["mtf50_nyquist"];
        // 1 % is the method's, without noise.
        EXPECT_NEAR(mtf50, Measured(record, phase + ("_mtf50_iso_" + region)), 0.01 * mtf50) << turn;
      }
    }
  }
}

TEST_F(Program, AnEdgeWithoutAFigureSaysSo) {
  Simulate("--turn -5");  // against the edges' own slant; the test's own figure stands
  EXPECT_EQ(nullptr, Measured(Record("autofocus photo.png"), "camera_autofocus_mtf50_iso_vertical"));
  EXPECT_THAT(err_, HasSubstr("no MTF50 after ISO 12233 of the vertical region: the edge follows the pixel grid"));

  folder_.Write("flat.png", DrawMarks({900, 900}, 8, {{50, 50}, {50, 750}, {750, 50}}));
  const json record = Record("autofocus flat.png", 3);
  EXPECT_THAT(err_, HasSubstr("the vertical region gives no MTF50"));
  EXPECT_EQ("ERROR", record["outcome"]);
  EXPECT_EQ(nullptr, Measured(record, "camera_autofocus_mtf50_vertical"));
  EXPECT_EQ("nan", record["phases"][0]["measurements"]["camera_autofocus_mtf50_vertical"]["non_finite"]);
}

class JudgingProgram : public Program {
 protected:
  JudgingProgram() { Simulate("--blur 1"); }
  void Set(const std::string& limits) const {
    folder_.Write("limits.json", R"({"name": "a", "revision": "3", "limits": )" + limits + "}");
  }
  const std::string judge_ = "autofocus photo.png --limits limits.json";
};

TEST_F(JudgingProgram, LimitsDecideTheVerdict) {
  Set(R"({"camera_autofocus_mtf50_vertical": {"min": 0.1, "marginal_min": 0.9, "unit": "Nyquist"}})");
  json record = Record(judge_);
  EXPECT_TRUE(record["marginal"]);
  EXPECT_EQ("PASS", record["outcome"]);
  record = record["phases"][0]["measurements"]["camera_autofocus_mtf50_vertical"];
  EXPECT_EQ(0.9, record["limits"]["marginal_min"]);
  EXPECT_THAT(err_, HasSubstr("MTF50")) << "the report gives way to the record";
  Set(R"({"camera_autofocus_mtf50_vertical": {"min": 0.9}})");
  EXPECT_EQ("FAIL", Record(judge_, 1)["outcome"]);

  // What a limit asks for and nobody measured is no PASS: without a standard there is no difference.
  Set(R"({"camera_capture_delta_e_76_max": {"max": 3}})");
  record = Record("capture photo.png --limits limits.json", 3);
  EXPECT_EQ("ERROR", record["outcome"]);
  EXPECT_EQ("UNSET", record["phases"][0]["measurements"]["camera_capture_delta_e_76_max"]["outcome"]);
}

TEST_F(JudgingProgram, LimitsThatCanNotJudgeAreRefused) {
  for (const auto& [limits, complaint] :
       {std::pair(R"({"camera_autofocus_mtf51": {"min": 0}})",
                  "camera_autofocus_mtf51: no measurement has a figure of this name; did you mean"),
        {R"({"camera_autofocus_mtf50_vertical": {"min": 0, "unit": "px"}})", R"(its unit is "Nyquist", not "px")"},
        {R"({"camera_autofocus_mtf50_vertical": {"min": "0"}})", "not a number"},
        {R"({"camera_autofocus_mtf50_vertical": {"minimum": 0}})",
         R"("minimum" is not known here; did you mean "min"?)"},
        {R"({"camera_autofocus_mtf50_vertical": {"min": 2, "max": 1}})", "its min lies above its max"},
        {R"({"camera_autofocus_mtf50_vertical": {"min": 2, "marginal_min": 1}})",
         "its min lies above its marginal_min"},
        {R"({"camera_autofocus_mtf50_vertical": {"max": 1, "marginal_max": 2}})",
         "its marginal_max lies above its max"},
        {R"({"camera_autofocus_mtf50_vertical": {}})", "it has no bound"},
        {R"({"camera_autofocus_mtf50_vertical": {"each": {"min": 1}}})", "this is a single value"},
        {R"({"camera_capture_delta_e_2000": {"max": 3}})", R"(as {"patches": {"7": {"max": 2}}})"},
        {R"({"camera_autofocus_sfr_vertical": {"elements": {"7": {"max": 2}}}})", R"(takes its bounds as {"each")"},
        {R"({"camera_capture_delta_e_2000": {"patches": {"24": {"max": 2}}}})", R"("24" is the number of no patch)"},
        {R"({"camera_capture_delta_e_2000": {"patches": {"7": {"each": {"max": 2}}}}})", R"("each" is not known here)"},
        {R"({"camera_flash_mean": {"min": 1}})", "the limits hold none for camera_autofocus; they are of camera_flash"},
        {R"({})", "nothing would be judged"},
        {R"({"camera_autofocus_mtf50_vertical": 5})", "not an object"},
        {R"({"camera_flash_mean": {"min": 1}, "camera_flash_mean": {"min": 2}})", "stands there twice"},
        {R"([])", "a list, not an object"},
        {R"([)", "line 1: this is no JSON"}}) {
    Set(limits);
    ExpectComplaint(judge_, 2, complaint);
  }
  folder_.Write("limits.json", R"({"name": 5, "limits": {"camera_flash_mean": {"min": 1}}})");
  ExpectComplaint(judge_, 2, "limits.json: name: is 5, not a text");
}

TEST_F(Program, MissesSayWhy) {
  const json record = Record("autofocus --threshold 250 " + Simulate(), 3);
  EXPECT_THAT(err_, AllOf(HasSubstr("no finder mark was found"), HasSubstr("threshold of 250"), HasSubstr("code -91"),
                          HasSubstr("QV_ERROR_PATTERN_NOT_FOUND"), Not(HasSubstr("MTF50"))));
  EXPECT_EQ("ERROR", record["outcome"]);
  EXPECT_EQ(-91, record["phases"][0]["result_code"]);

  ChartView two;
  two.marks = 2;
  folder_.Write("two.png", DrawChart(two));
  Record("mtf two.png --annotate seen.png", 3);
  EXPECT_THAT(err_, AllOf(HasSubstr("two.png: 2 of 3 finder marks were found"), Not(HasSubstr("--threshold"))));
  EXPECT_GT(PixelsOf({217, 191, 0}, folder_.Path("seen.png")), 100) << "what was found is ringed in cyan";

  folder_.Write("small.png", DrawMarks({300, 300}, 2, {{50, 50}, {50, 200}}));
  ExpectComplaint("circles small.png", 3, "marks of 2.0 px a module: at least 3 are needed");
}

TEST_F(Program, AThresholdIsSuggestedOnceItHasWorked) {
  Simulate("--exposure -2 --blur 0.5", "dark.png");
  const json record = Record("autofocus dark.png --annotate seen.png", 3);
  // White paper at 0.92 of 255 and the edges' dark side at a fifth of it, both two stops down.
  EXPECT_NEAR(59, Measured(record, "camera_autofocus_grey_peak_light").get<int>(), 1);
  EXPECT_NEAR(12, Measured(record, "camera_autofocus_grey_peak_dark").get<int>(), 1);
  const std::string threshold = Measured(record, "camera_autofocus_suggested_threshold").dump();
  EXPECT_THAT(err_, HasSubstr("tried: --threshold " + threshold + " finds all three"));
  EXPECT_GT(PixelsOf({0, 204, 242}, folder_.Path("seen.png")), 300) << "the three are ringed in yellow";
  EXPECT_EQ(0, Run("autofocus dark.png --threshold " + threshold).status);

  folder_.Write("flat.png", cv::Mat(300, 300, CV_8UC1, cv::Scalar(90)));
  EXPECT_THAT(Run("autofocus flat.png").err, AllOf(HasSubstr("hardly any contrast"), Not(HasSubstr("tried"))));
  // The standard photo is searched at a threshold of its own, which --threshold does not reach.
  EXPECT_THAT(Run("capture " + Simulate() + " --standard dark.png").err,
              AllOf(HasSubstr("dark.png: no finder mark"), HasSubstr("tried: property 86 at " + threshold)));
}

TEST_F(Program, DoubtfulFindsNeverPass) {
  for (const auto& [third, status, finding] :
       {std::tuple(cv::Point(500, 50), 3, "the find is doubtful: the legs between the marks are as 1.667 to 1"),
        {cv::Point(795, 120), 3, "at 84.6 degrees"},
        {cv::Point(740, 105), 0, ""}}) {  // as 1.08 to 1, at 85.4 degrees: within bounds
    folder_.Write("marks.png", DrawMarks({900, 900}, 8, {{50, 50}, {50, 800}, third}));
    EXPECT_EQ(status == 0 ? "MEASURED" : "ERROR", Record("circles marks.png", status)["outcome"]);
    EXPECT_THAT(err_, HasSubstr(finding));
  }
  folder_.Write("marks.png", DrawMarks({900, 900}, 8, {{50, 50}, {50, 800}, {500, 50}}));
  folder_.Write("limits.json",
                R"({"accept_doubts": ["implausible_marks"], "limits": {"circle_check_marks_found": {"min": 3}}})");
  const json accepted = Record("circles marks.png --limits limits.json");
  EXPECT_EQ("PASS", accepted["outcome"]);
  EXPECT_EQ("accepted doubt", accepted["outcome_details"][0]["weight"]);
  EXPECT_EQ(json::array({"implausible_marks"}), accepted["metadata"]["limits"]["accept_doubts"]);
}

TEST_F(Program, BadInputIsACodeAndASentence) {
  const std::string png = ReadFile(folder_.Write("small.png", cv::Mat(1, 1, CV_8UC3, cv::Scalar(9, 9, 9))));
  folder_.Write("empty.jpg", std::string());
  folder_.Write("words.jpg", std::string("words"));
  folder_.Write("cut.png", png.substr(0, 25));
  folder_.Write("huge.pgm", std::string("P5 60000 60000 255\n"));
  for (const auto& [file, complaint] : {std::pair("missing.png", "no such file"),
                                        {"./", "is a directory"},
                                        {"empty.jpg", "the file is empty"},
                                        {"/dev/zero", "/dev/zero: is no regular file"},
                                        {"huge.pgm", "too many pixels: over 200 megapixels"},
                                        {"words.jpg", "not a picture that can be decoded"},
                                        {"cut.png", "not a picture that can be decoded"}}) {
    for (const std::string command : {"autofocus ", "mtf ", "flash "}) {
      EXPECT_EQ("ERROR", Record(command + file, 3)["outcome"]);
      EXPECT_THAT(err_, AllOf(HasSubstr(file), HasSubstr(complaint), HasSubstr("code -97")));
    }
  }
  EXPECT_EQ(3, Run("autofocus small.png").status);
  EXPECT_EQ(0, Run("flash small.png").status);
  folder_.Write("wide.png", cv::Mat(1000, 1001, CV_8UC3, cv::Scalar(9, 9, 9)));
  EXPECT_EQ(3, Run("--most-megapixels 1 flash wide.png").status);
  EXPECT_EQ(0, Run("--most-megapixels 2 flash wide.png").status);
  const ProgramRun mixed = Run("flash small.png --json /dev/stdout");
  EXPECT_EQ(2, mixed.status);
  EXPECT_THAT(mixed.err, HasSubstr("/dev/stdout: is where standard output goes"));
}

// What OpenCV fills up measures like a whole photo, or nearly; what libpng calls a warning has whole pixels.
TEST_F(Program, ACutPhotoIsADoubtAndVerboseShowsTheLog) {
  const auto write = [&](const std::string& name, int progressive, double share) {
    std::vector<uchar> jpeg;
    cv::imencode(".jpg", DrawChart(), jpeg, {cv::IMWRITE_JPEG_QUALITY, 95, cv::IMWRITE_JPEG_PROGRESSIVE, progressive});
    std::string content(jpeg.begin(), jpeg.end());
    const std::size_t size = share < 1 ? static_cast<std::size_t>(share * static_cast<double>(content.size()))
                                       : content.rfind("\xFF\xDA");  // whole scans, but not all
    folder_.Write(name, content.substr(0, size));
  };
  write("baseline.jpg", 0, 0.99);
  write("half.jpg", 1, 0.5);
  write("scans.jpg", 1, 1);
  for (const std::string name : {"baseline.jpg", "half.jpg", "scans.jpg"}) {
    const json details = Record("autofocus " + name, 3)["outcome_details"];
    EXPECT_EQ("decoder_complaint", details[0]["name"]) << name;
    EXPECT_EQ("doubt", details[0]["weight"]) << name;
    EXPECT_THAT(err_, AnyOf(HasSubstr("remature end"), HasSubstr("it was cut"))) << name;
  }
  folder_.Write("limits.json", R"({"accept_doubts": ["decoder_complaint", "clipped"],
                                   "limits": {"camera_autofocus_marks_found": {"min": 3}}})");
  EXPECT_EQ("PASS", Record("autofocus half.jpg --limits limits.json")["outcome"]);

  std::string png = ReadFile(folder_.Write("noted.png", DrawChart()));
  png.insert(33, std::string("\0\0\0\7tIME\7\xEA\xF\1\1\1\1\0\0\0\0", 19));  // a time with a false checksum
  folder_.Write("noted.png", png);
  EXPECT_THAT(Record("flash noted.png")["outcome_details"].dump(), HasSubstr("decoder_warning"));

  const ProgramRun verbose = Run("autofocus half.jpg --verbose --quiet");
  EXPECT_THAT(verbose.out, IsEmpty());
  EXPECT_THAT(verbose.err, AllOf(HasSubstr("[GetSFRFromImage] prop_binary_thr_working_: 125\n"), Not(HasSubstr("\r"))));
}

TEST_F(Program, FlashReadsTheOtherCameraAndStandardInput) {
  folder_.Write("flash.png", cv::Mat((cv::Mat_<cv::Vec3b>(1, 2) << cv::Vec3b(200, 1, 2), cv::Vec3b(15, 1, 2))));
  const json record = Record("flash --vt - <flash.png");
  EXPECT_EQ("standard input", record["inputs"][0]["path"]);
  EXPECT_EQ(18, record["metadata"]["test_index"]);
  EXPECT_EQ(107.5, Measured(record, "camera_flash_vt_mean"));
}

TEST_F(Program, WrongUsageIsStatusTwo) {
  for (const char* arguments :
       {"", "frobnicate", "autofocus", "autofocus a.png --threshold x", "autofocus a.png --annotate a.jpg",
        "autofocus a.png --annotate - --json -", "autofocus a.png --limits missing.json", "list colours", "simulate",
        "simulate -o a.png --size 40", "simulate -o a.png --blur nan", "simulate -o a.png --cast 1,1",
        "simulate -o a.nothing --size 40x40", "simulate -o a.nv21 --size 1201x900",
        "simulate -o a.png --scene hdr --size 40x30", "register a.png b.png -o a.xyz",
        "register a.png b.png -o - --json -", "explain sharpnes"}) {
    const ProgramRun run = Run(arguments);
    EXPECT_EQ(2, run.status) << arguments;
    EXPECT_THAT(run.err, Not(IsEmpty())) << arguments;
  }
  EXPECT_EQ(0, Run("--help").status);
  EXPECT_THAT(Run("--version").out, HasSubstr("qvtester "));
}

TEST_F(Program, NothingOfAnEarlierRunStaysAndNoFullDiskGoesUnseen) {
  folder_.Write("seen.png", cv::Mat(9, 9, CV_8UC1, cv::Scalar(3)));
  EXPECT_EQ(3, Run("flash missing.png --annotate seen.png").status);
  EXPECT_TRUE(cv::imread(folder_.Path("seen.png")).empty());
  for (const char name : {'a', 'b', 'c'}) {
    folder_.Write(std::string(1, name) + ".png", cv::Mat(9, 9, CV_8UC3, cv::Scalar::all(name)));
  }
  EXPECT_EQ(0U, Run("flash a.png --annotate -").out.find("\x89PNG")) << "and the report elsewhere";
  EXPECT_THAT(Run("flash a.png --repeat b.png --repeat c.png").out, HasSubstr("medians of 3 photos"));
  const int status =
      std::system("exec '" QVTESTER_PROGRAM "' list tests >/dev/full 2>/dev/null");  // NOLINT(cert-env33-c)
  EXPECT_EQ(4, WEXITSTATUS(status));
}

TEST_F(Program, ATerminatedRunLeavesNothingBehind) {
  std::filesystem::create_directory(folder_.Path("t"));
  folder_.Write("ffmpeg", std::string("#!/bin/sh\ntouch started\nexec sleep 9 >/dev/null 2>&1\n"));
  std::filesystem::permissions(folder_.Path("ffmpeg"), std::filesystem::perms::owner_all);
  const std::string command = "cd '" + folder_.Path("") +
                              "' && { PATH=\"$PWD:$PATH\" TMPDIR=\"$PWD/t\" '" QVTESTER_PROGRAM
                              "' simulate --scene film-flash --size 64x48 -o f.mp4 >/dev/null 2>&1 & } && "
                              "while [ ! -e started ]; do sleep 0.1; done; kill -TERM $!; wait $!";
  const int status = std::system(command.c_str());  // NOLINT(cert-env33-c): the test's own words
  EXPECT_EQ(143, WEXITSTATUS(status));
  EXPECT_TRUE(std::filesystem::is_empty(folder_.Path("t")));
}

TEST_F(Program, TheTruthToldBesideAFigureIsWhatTheMethodMakesOfIt) {
  Simulate("--turn 3 --blur 1.2 --size 2000x1500");
  const std::string told = Run("autofocus photo.png --truth photo.truth.json").out;
  const std::size_t at = told.find("  vertical ", told.find("expected of the method"));
  double figures[4] = {};  // true, from, to, measured
  ASSERT_EQ(4, std::sscanf(told.c_str() + at, "  vertical %lf %lf to %lf %lf", &figures[0], &figures[1],  // NOLINT
                           &figures[2], &figures[3]))
      << told;
  const double edge_deg = Truth()["mtf50"]["vertical"]["edge_direction_deg"];
  const auto straightened = [edge_deg](double f) {
    return qv::method_law::TrueResponse(f, 1.2, edge_deg) * std::pow(qv::method_law::Sinc(f), 2);
  };
  const auto [low, high] = qv::method_law::MeasuredMtf50(straightened, 108);
  EXPECT_THAT(told, HasSubstr("108 pixels across"));
  EXPECT_NEAR(low, figures[1], 6e-5);
  EXPECT_NEAR(high, figures[2], 6e-5);
  EXPECT_GT(figures[3], 0.98 * figures[1]);
  EXPECT_LT(figures[3], 1.02 * figures[2]);
}

TEST_F(Program, TablesAreListedAsTheyWere) {
  for (const std::string words : {"list tests", "list slots", "list properties", "list codes", "list measurements",
                                  "explain", "explain camera_autofocus", "explain uncertainty"}) {
    std::string name = words;
    std::replace(name.begin(), name.end(), ' ', '_');
    ExpectGolden(name, Run(words).out);
  }
}

}  // namespace
