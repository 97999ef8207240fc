// Measurements in process: requests, inputs, findings.

#include "desk/measure/measure.h"

#include <gmock/gmock.h>

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/doubt_names.h"
#include "desk/measure/measurement.h"
#include "desk/measure/promises.h"
#include "desk/measure/sharpness.h"
#include "desk/simulation/simulation.h"
#include "qvtester/host_properties.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

using ::testing::AllOf;
using ::testing::HasSubstr;
using ::testing::Not;

cv::Mat DustPhoto(double gain) {
  SimulationOptions options;
  options.scene = "dust";
  options.camera.size = {400, 300};
  options.camera.gain = gain;
  return Sense(options.camera, Simulate(options).levels[0], 8);
}

cv::Mat DecodePng(const std::string& file) {
  return cv::imdecode(std::vector<uchar>(file.begin(), file.end()), cv::IMREAD_COLOR);
}

std::string Refusal(const Request& request) {
  try {
    Resolved(request);
  } catch (const Failure& e) {
    EXPECT_EQ(kWrongUsage, e.kind);
    return e.what();
  }
  return "";
}

TEST(Measure, APictureAndItsFileGiveTheSameRecord) {
  const cv::Mat photo = DrawChart();
  const TemporaryFolder folder;
  const Request by_path = {"camera_autofocus", {folder.Write("photo.png", photo)}};
  Json of_file = MeasureAnew(by_path).ToJson();
  Json of_picture = MeasureAnew({"camera_autofocus", {photo}}).ToJson();
  EXPECT_EQ(of_file["phases"][0]["measurements"], of_picture["phases"][0]["measurements"]);
  EXPECT_EQ(of_file["inputs"][0]["pixels_hash"], of_picture["inputs"][0]["pixels_hash"]);
  cv::Mat other = photo.clone();
  other.at<cv::Vec3b>(500, 3)[1] ^= 1;
  EXPECT_NE(of_file["inputs"][0]["pixels_hash"],
            MeasureAnew({"camera_autofocus", {other}}).ToJson()["inputs"][0]["pixels_hash"]);
  EXPECT_EQ(nullptr, of_picture["inputs"][0]["sha256"]);
  EXPECT_EQ(nullptr, of_picture["request"]["inputs"][0]) << "can't be measured again";

  const Record again = MeasureAnew(RequestFromJson(of_file["request"]));
  EXPECT_EQ(of_file["phases"][0]["measurements"], again.ToJson()["phases"][0]["measurements"]);
}

TEST(Measure, PropertiesAreSetByIndexOrNameAndStoredOnce) {
  const cv::Mat photo = DrawChart();
  for (const Json& properties : {Json{{"93", 110}}, Json{{"prop_binary_thr_working_", 110}}}) {
    const Record record = MeasureAnew({"mtf_check", {photo}, Json::object(), properties});
    EXPECT_EQ(110, record.phase.Find("threshold")->value());
    EXPECT_EQ(110, record.request.parameters["threshold"]);
    EXPECT_TRUE(record.request.properties.empty());
  }
  Input standard(photo);
  const Record miss = MeasureAnew({"camera_capture", {photo, standard}, Json::object(), {{"86", 254}}});
  EXPECT_EQ(QV_ERROR_PATTERN_NOT_FOUND, miss.phase.code);
  EXPECT_THAT(miss.MissSentence(), HasSubstr("tried: property 86"));
}

TEST(Measure, LightThatFallsAcrossTheEdgesIsTheCauseThatIsNamed) {
  cv::Mat photo = DrawChart({3, 3, 0.09, {800, 800}, 0.8});
  photo.forEach<cv::Vec3b>([](cv::Vec3b& pixel, const int* at) { pixel *= 1 - 0.6 * (at[0] + at[1]) / 1600; });
  std::vector<std::string> said;
  for (const Remark& remark : MeasureAnew({"camera_autofocus", {photo}}).remarks) said.emplace_back(remark.name());
  EXPECT_THAT(said, ::testing::ElementsAre("uneven_light"));
}

TEST(Measure, RequestsThatCantBeRunAreRefusedInASentence) {
  const std::vector<Input> photo = {Input("photo.png")};
  for (const auto& [request, complaint] : {
           std::pair<Request, const char*>{{"camera_autofokus", photo}, "no such measurement"},
           {{"camera_autofocus", {}}, "0 inputs given; it takes photo"},
           {{"camera_autofocus", photo, {{"treshold", 1}}}, "has no parameter treshold"},
           {{"camera_autofocus", photo, {{"threshold", 256}}}, "threshold: 256 is no whole number from 0 to 255"},
           {{"camera_autofocus", photo, {{"threshold", 1.5}}}, "threshold: 1.5 is no whole number"},
           {{"camera_autofocus", photo, {{"threshold", 1}}, {{"93", 2}}},
            "threshold and property 93 are one, and differ"},
           {{"circle_check", photo, {{"camera", 1}}}, "camera: 1 is none of 0, 2"},
           {{"lcd", photo}, "pattern is needed"},
           {{"camera_capture", photo, {{"reference", {{9, 95, 0}}}}}, "neither a capture record nor numbers"},
           {{"camera_capture", photo, {{"reference", {{9, 95, 0, 1e5}}}}}, "neither a capture record nor numbers"},
           {{"circle_check", photo, {{"raw", "640x481"}}}, "an NV21 frame has an even width and height"},
           {{"hdr_dots", photo, {{"channel", "cyan"}}}, "none of red, green, blue"},
           {{"lens_dust", photo, {{"reference", {1, 2}}}}, "neither a dust record nor 256 whole numbers"},
           {{"mtf_check", photo, Json::object(), {{"3", 1}}}, "3: no such property"},
           {{"mtf_check", photo, Json::object(), {{"86", "x"}}}, "property 86: \"x\" is not a whole number"},
           {{"mtf_check", photo, Json::object(), {{"64", {1, 2}}}}, "property 64: [1,2] is not 5 numbers"},
           {{"mtf_check", photo, Json::object(), {{"86", 1}, {"prop_param_86_", 2}}}, "given twice"},
       }) {
    EXPECT_THAT(Refusal(request), HasSubstr(complaint));
  }
  EXPECT_EQ("", Refusal({"camera_capture", photo, {{"standard", "golden.png"}}}));
}

TEST(Measure, TheRefusedInputIsNamed) {
  Input photo(DrawChart());
  Input gray(cv::Mat(90, 90, CV_8UC1, cv::Scalar(90)));
  photo.name = "photo.png";
  gray.name = "gray.png";
  EXPECT_THAT(MeasureAnew({"camera_capture", {photo, gray}}).MissSentence(),
              AllOf(HasSubstr("gray.png: "), HasSubstr("code -95"), Not(HasSubstr("photo.png"))));
  EXPECT_THAT(MeasureAnew({"camera_capture", {gray, photo}}).MissSentence(),
              AllOf(HasSubstr("gray.png: "), Not(HasSubstr("photo.png"))));
}

// Patches 0 to 3 read 1, 2, 3 and NaN.
Reading JudgedPatches(const std::string& limit, const char* rule, double uncertainty) {
  Record record;
  record.phase.name = "camera_capture";
  record.phase.code = QV_SUCCESS;
  const Uncertainty u = {uncertainty / 2, uncertainty, 2, kPixelMethod};
  Reading& m = record.phase.Add("delta_e_2000", {0, 1, 2, 3}, {1, 2, 3, NAN});
  if (uncertainty > 0) m.Trust({u, u, u, u});
  record.limits = LimitsFromJson(ParseJson(R"({"decision": {"rule": ")" + std::string(rule) +
                                               R"("}, "limits": {"camera_capture_delta_e_2000": )" + limit + "}}",
                                           "limits"),
                                 "limits");
  record.Judge();
  EXPECT_EQ(record.outcome() == Outcome::kPass, record.remarks.empty()) << "what broke, or lacks";
  return record.phase.readings.at(0);
}

TEST(Measure, AListIsHeldAgainstItsLimitsEntryByEntry) {
  for (const auto& [limit, rule, uncertainty, outcome, broken, marginal] :
       {std::tuple(R"({"each": {"max": 2.5}})", "simple", 0.0, Outcome::kFail, "[2,3]", "[]"),
        {R"({"patches": {"0": {"max": 2.5}, "1": {"min": 2}}})", "simple", 0.0, Outcome::kPass, "[]", "[]"},
        {R"({"each": {"max": 2.5}, "patches": {"2": {"max": 3}, "1": {"max": 1.5}}})", "simple", 0.0, Outcome::kFail,
         "[1,3]", "[]"},
        {R"({"patches": {"0": {"max": 2.5, "marginal_max": 0.5}}})", "simple", 0.4, Outcome::kPass, "[]", "[0]"},
        {R"({"patches": {"0": {"max": 1.2}, "1": {"max": 3}}})", "simple", 0.4, Outcome::kPass, "[]", "[0]"},
        {R"({"patches": {"0": {"max": 1.2}, "1": {"max": 3}}})", "guarded", 0.4, Outcome::kFail, "[0]", "[0]"},
        {R"({"each": {"max": 9}})", "guarded", 0.0, Outcome::kUnset, "[]", "[]"},
        {R"({"patches": {"0": {"max": 0.8}}})", "guarded_rejection", 0.4, Outcome::kPass, "[]", "[0]"},
        {R"({"patches": {"0": {"max": 2}, "7": {"max": 2}}})", "simple", 0.0, Outcome::kUnset, "[]", "[]"}}) {
    const Reading m = JudgedPatches(limit, rule, uncertainty);
    EXPECT_EQ(outcome, m.outcome) << limit;
    std::string outside;
    std::string near;
    for (const EntryVerdict& entry : m.entries) {
      if (!entry.decision.pass) outside += (outside.empty() ? "" : ",") + std::to_string(entry.place);
      if (entry.marginal) near += (near.empty() ? "" : ",") + std::to_string(entry.place);
    }
    EXPECT_EQ(broken, "[" + outside + "]") << limit;
    EXPECT_EQ(marginal, "[" + near + "]") << limit;
    EXPECT_EQ(marginal != std::string("[]"), m.marginal) << limit;
  }
}

TEST(Measure, AListFailsAsSurelyAsItsSurestEntryAndPassesAsSurelyAsItsLeastSure) {
  const auto wrong = [](const char* limit) { return JudgedPatches(limit, "simple", 0.4).decision->wrong_probability; };
  const double one_deviation = 0.158655;  // of the normal distribution, beyond
  EXPECT_NEAR(one_deviation, wrong(R"({"patches": {"0": {"max": 1.2}, "1": {"max": 3}}})"), 1e-5);
  EXPECT_NEAR(one_deviation, wrong(R"({"patches": {"1": {"max": 3}, "0": {"max": 1.2}, "2": {"max": 9}}})"), 1e-5);
  EXPECT_NEAR(one_deviation, wrong(R"({"patches": {"0": {"max": 0.8}, "1": {"max": 3}}})"), 1e-5)
      << "the one that fails";
  EXPECT_NEAR(0, wrong(R"({"patches": {"0": {"max": 0.8}, "2": {"max": 1}}})"), 1e-5) << "surely broken by the other";
}

TEST(Measure, OfManyBrokenEntriesTheNumberIsTold) {
  const Json limits = {{"limits", {{"lens_dust_histogram", {{"each", {{"max", -1}}}}}}}};
  QVTester tester;
  const Record record = Measure(tester, {"lens_dust", {DustPhoto(0.92)}}, LimitsFromJson(limits, "limits"));
  EXPECT_EQ(Outcome::kFail, record.outcome());
  EXPECT_THAT(record.MissSentence(), HasSubstr(" and 246 more"));
}

TEST(Measure, OnlyARequestToPublishReachesTheStore) {
  const TemporaryFolder folder;
  const std::string store = folder.Path("store");
  const std::string place = store + "/t82.vi7_mung_loc";
  Request request = {"lens_dust", {DustPhoto(0.92)}, {{"step", 7}}};
  SetHostPropertyStore(store.c_str());
  MeasureAnew(request);
  EXPECT_EQ(nullptr, std::fopen(place.c_str(), "r"));
  request.publish = true;
  const Record record = MeasureAnew(request);
  SetHostPropertyStore(nullptr);
  std::string places;
  const Reading& blobs = *record.phase.Find("blobs");
  for (std::size_t i = 0; i < blobs.values.size(); ++i) {
    places += Format("[%.0f,%.0f]", blobs.axis[i], blobs.values[i]);
  }
  EXPECT_FALSE(places.empty());
  EXPECT_EQ(places, ReadFile(place));
}

cv::Mat DisplayPhoto(const std::string& pattern) {
  SimulationOptions options;
  options.scene = "display";
  options.display.pattern = pattern;
  options.camera.size = {320, 240};
  return Sense(options.camera, Simulate(options).levels[0], 8);
}

TEST(Measure, ADisplayThatShowsSomethingElseFailsWithoutLimitsToo) {
  const Record right = MeasureAnew({"lcd", {DisplayPhoto("tick")}, {{"pattern", "result"}}});
  EXPECT_EQ(Outcome::kPass, right.outcome());
  EXPECT_EQ(1, right.phase.Find("verdict")->value());
  EXPECT_EQ(4U, right.phase.Find("corners")->values.size());
  const Record wrong = MeasureAnew({"lcd", {DisplayPhoto("cross")}, {{"pattern", "result"}}});
  EXPECT_EQ(Outcome::kFail, wrong.outcome());
  EXPECT_THAT(wrong.remarks.at(0).sentence(), HasSubstr("red cross field"));
  const Record none = MeasureAnew({"lcd", {cv::Mat(90, 90, CV_8UC3, cv::Scalar::all(60))}, {{"pattern", "black"}}});
  EXPECT_EQ(QV_ERROR_PATTERN_NOT_FOUND, none.phase.code);
  EXPECT_THAT(none.MissSentence(), AllOf(HasSubstr("no screen is seen"), Not(HasSubstr("chart"))));
}

TEST(Measure, PatchValuesStandInForAStandardPhoto) {
  const TemporaryFolder folder;
  const cv::Mat photo = DrawChart();
  const Record first = MeasureAnew({"camera_capture", {photo}});
  EXPECT_EQ(nullptr, first.phase.Find("delta_e_2000"));
  const std::string earlier = folder.Write("earlier.json", first.ToText());
  const Record same = MeasureAnew({"camera_capture", {photo}, {{"reference", earlier}}});
  EXPECT_EQ(0, same.phase.Find("delta_e_2000_max")->value());
  const std::vector<double>& lightness = same.phase.Find("lab_d65_l")->values;
  const std::string values =
      folder.Write("values.txt", Format("# number, L*, a*, b*\n9, %.9f, 0, 0\n", lightness.at(9) - 1));
  const Record one = MeasureAnew({"camera_capture", {photo}, {{"reference", values}}});
  EXPECT_EQ(std::vector<double>{9}, one.phase.Find("delta_e_2000")->axis);
  EXPECT_EQ(one.phase.Find("delta_e_2000_max")->value(), one.phase.Find("delta_e_2000_mean")->value()) << "of one";
  // A step of 1 in L* alone is 1 / (1 + 0.015 d^2 / sqrt(20 + d^2)), d from 50 to the mean of both.
  const double d = lightness.at(9) - 0.5 - 50;
  EXPECT_NEAR(1 / (1 + 0.015 * d * d / std::sqrt(20 + d * d)), one.phase.Find("delta_e_2000_max")->value(), 1e-6);
}

TEST(Measure, EveryChannelOfAFlashPhotoIsCounted) {
  cv::Mat photo(10, 20, CV_8UC3, cv::Scalar(10, 20, 30));
  photo(cv::Rect(0, 0, 5, 10)) = cv::Scalar(10, 255, 30);
  const Record record = MeasureAnew({"camera_flash", {photo}});
  for (const auto& [figure, value] : {std::pair<const char*, double>{"mean_blue", 10},
                                      {"mean_green", 78.75},
                                      {"mean_red", 30},
                                      {"clipped_blue", 0},
                                      {"clipped_green", 0.25},
                                      {"mean", 10}}) {
    EXPECT_DOUBLE_EQ(value, record.phase.Find(figure)->value()) << figure;
  }
}

std::vector<std::string> Remarks(const Record& record) {
  std::vector<std::string> names;
  for (const Remark& remark : record.remarks) names.emplace_back(remark.name());
  return names;
}

TEST(Measure, DustIsJudgedFromLevel126OnAndOutsideTheCorners) {
  for (const int level : {125, 126}) {
    const Record record = MeasureAnew({"lens_dust", {cv::Mat(300, 400, CV_8UC3, cv::Scalar::all(level))}});
    EXPECT_THAT(Remarks(record), ::testing::Contains("too_dark").Times(126 - level));
  }
  cv::Mat dusty(300, 400, CV_8UC3, cv::Scalar::all(180));
  for (const cv::Point& at : {cv::Point(388, 288), {200, 150}}) cv::circle(dusty, at, 4, cv::Scalar::all(60), -1);
  const Record record = MeasureAnew({"lens_dust", {dusty}});
  EXPECT_EQ(1, record.phase.Find("blob_count")->value());
  EXPECT_THAT(record.phase.Find("blobs")->axis, ::testing::ElementsAre(::testing::DoubleNear(200, 0.5)));
}

TEST(Measure, MarksAreToldWhereTheyLieAndUnequalLegsDoubted) {
  cv::Mat photo = DrawChart();
  const Record straight = MeasureAnew({"camera_capture", {photo}});
  const Reading& marks = *straight.phase.Find("marks");
  const std::vector<cv::Point2d> truth = MarkCentres({});
  for (std::size_t i = 0; i < truth.size(); ++i) {
    EXPECT_NEAR(truth[i].x, marks.axis.at(i), 0.4) << i;
    EXPECT_NEAR(truth[i].y, marks.values.at(i), 0.4) << i;
  }
  EXPECT_THAT(Remarks(straight), Not(::testing::Contains("oblique")));
  cv::Mat oblique;
  cv::resize(photo, oblique, {}, 1.03, 1);
  EXPECT_THAT(Remarks(MeasureAnew({"camera_capture", {oblique}})), ::testing::Contains("oblique"));
  EXPECT_THAT(Remarks(MeasureAnew({"camera_capture", {photo, oblique}})), ::testing::Contains("oblique")) << "standard";
  EXPECT_THAT(Remarks(MeasureAnew({"camera_capture", {photo, photo}})), ::testing::IsEmpty());
}

TEST(Measure, TheReasonsOfAMissStandAboveThePicture) {
  cv::Mat photo(600, 900, CV_8UC3, cv::Scalar::all(255));
  DrawMark(photo, 100, 700, 2);
  const Record record = MeasureAnew({"circle_check", {photo}, {{"threshold", 3}}});
  const cv::Mat seen = DecodePng(record.finding->Draw(record)->Png());
  cv::Mat words;
  cv::inRange(seen.rowRange(0, seen.rows - 600), cv::Scalar(0, 0, 150), cv::Scalar(60, 60, 220), words);
  EXPECT_GT(cv::boundingRect(words).height, 2 * 14) << "two lines at least";
}

TEST(Measure, SoftAndLargeSpotsStandBesideTheTestsOwnBlobs) {
  SimulationOptions options;
  options.scene = "dust";
  options.camera.size = {900, 700};
  options.camera.noise_percent = 1;
  options.camera.blur_px = 4;
  options.specks = 3;
  options.speck_px = 50;
  options.speck_darkness = 0.05;
  const Record record = MeasureAnew({"lens_dust", {Sense(options.camera, Simulate(options).levels[0], 8)}});
  EXPECT_EQ(0, record.phase.Find("blob_count")->value());
  EXPECT_EQ(3, record.phase.Find("spot_count")->value());
  EXPECT_NEAR(50 * 50 * CV_PI / 4, record.phase.Find("spot_largest_area")->value(), 200);
}

TEST(Measure, APhotoTooDarkForDustIsDrawnWithoutBlobs) {
  const Record dark = MeasureAnew({"lens_dust", {DustPhoto(0.3)}});
  EXPECT_FALSE(dark.measured());
  EXPECT_THAT(dark.MissSentence(), HasSubstr("too dark to judge"));
  EXPECT_TRUE(dark.finding->Draw(dark).has_value());
}

// The regions are outlined where the chart has them, at any turn.
TEST(Measure, OutlinesLieOnTheChart) {
  ::ChartView view;
  view.size = {1400, 1400};
  for (const double turn : {0.0, 30.0, -100.0}) {
    view.turn_deg = turn;
    const Record record = MeasureAnew({"camera_autofocus", {DrawChart(view)}});
    const auto& finding = dynamic_cast<const SharpnessFinding&>(*record.finding);
    const std::vector<cv::Point2d> marks = MarkCentres(view);
    const cv::Point2d right = (marks[1] - marks[0]) / kChartSide;
    const cv::Point2d down = (marks[2] - marks[0]) / kChartSide;
    ASSERT_EQ(2u, finding.regions.size());
    const ChartRegion regions[] = {kVerticalRegion, kHorizontalRegion};
    for (int i : {0, 1}) {
      const ChartRegion& r = regions[i];
      const cv::Point corners[] = {
          {r.x, r.y}, {r.x + r.width, r.y}, {r.x + r.width, r.y + r.height}, {r.x, r.y + r.height}};
      for (int k = 0; k < 4; ++k) {
        const cv::Point2d expected = marks[0] + corners[k].x * right + corners[k].y * down;
        // The chart is straightened by whole degrees, cut; what is measured lies off by up to one, as is drawn.
        const double most = 3 + cv::norm(expected - marks[0]) * CV_PI / 180;
        EXPECT_LT(cv::norm(expected - finding.regions[i].outline[k]), most) << turn << ", " << k;
      }
    }
    EXPECT_TRUE(finding.Draw(record).has_value());
  }
}

TEST(Doubts, DocumentsListThemAndNoneLacksAName) {
  EXPECT_THAT(ReadFile(std::string(QVTESTER_SOURCE) + "/docs/results.md"), HasSubstr(DoubtTable()));
  for (int i = 0; i <= static_cast<int>(Doubt::kPrintCutOff); ++i) EXPECT_NO_THROW(Info(static_cast<Doubt>(i))) << i;
}

// Made by `scripts/accuracy --promises`.
TEST(Promises, TextsAndDocumentsHoldTheNumbers) {
  const std::string source = QVTESTER_SOURCE;
  EXPECT_THAT(ReadFile(source + "/README.md"), HasSubstr(PromiseTable()));
  EXPECT_THAT(ReadFile(source + "/docs/accuracy.md"), HasSubstr(PromiseList()));
  std::string said = PromiseTable();
  for (const FigureInfo& info : AllFigures()) said += Explanation(*info.figure);  // throws for an unknown name
  EXPECT_THAT(said, Not(HasSubstr("{")));
  for (const char* made : {"median 0.9 px", "all of", "none of"}) EXPECT_THAT(said, HasSubstr(made));
}

}  // namespace
}  // namespace qv
