// Lights, prints and registrations measured in process, on simulated photos whose truth is known.

#include <gmock/gmock.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <opencv2/imgcodecs.hpp>

#include "desk/base/failure.h"
#include "desk/measure/measure.h"
#include "desk/measure/measurement.h"
#include "desk/simulation/simulation.h"
#include "unit_tests/drawing.h"

namespace qv {
namespace {

using ::testing::HasSubstr;

bool Says(const Record& record, const std::string& name) {
  return std::any_of(record.remarks.begin(), record.remarks.end(),
                     [&](const Remark& remark) { return remark.name() == name; });
}

class PanelPhotos : public ::testing::Test {
 protected:
  // The photos as files: p.png, then those beside it.
  std::vector<std::string> Write(const SimulationOptions& options, const Simulation& simulation) const {
    std::vector<std::string> paths;
    CameraModel sensor = options.camera;
    std::filesystem::create_directories(folder_.Path("samples"));
    for (const cv::Mat& levels : simulation.levels) {
      const std::string name = paths.empty() ? "p.png" : "samples/" + std::to_string(paths.size()) + ".png";
      paths.push_back(folder_.Write(name, Sense(sensor, levels, 8)));
      sensor.seed += 1000;
    }
    return paths;
  }

  TemporaryFolder folder_;
};

TEST_F(PanelPhotos, LightsAreMeasuredRegionByRegion) {
  SimulationOptions options;
  options.scene = "lights";
  options.camera.size = {450, 300};
  options.camera.gain = 1;
  options.lights.colour = {200, 150, 100};
  options.spots = 3;
  options.spot_px = 6;
  const Simulation simulation = Simulate(options);
  const cv::Mat photo = Sense(options.camera, simulation.levels[0], 8);
  const std::string truth = folder_.Write("truth.json", simulation.truth.dump());
  const Record record = MeasureAnew({"led_light", {photo}, {{"regions", truth}}});
  ASSERT_EQ(1, record.phase.code);
  for (const char* axis : {"x", "y"}) {
    const Reading& reading = *record.phase.Find(std::string("chromaticity_") + axis);
    ASSERT_EQ(6U, reading.values.size());
    for (const double value : reading.values) EXPECT_NEAR(simulation.truth["chromaticity"][axis], value, 3e-3);
    EXPECT_GE(record.phase.Find(std::string("chromaticity_") + axis + "_max")->value(), reading.values[3]);
  }
  EXPECT_EQ(3, record.phase.Find("area_count")->value());
  const Reading& areas = *record.phase.Find("areas");
  EXPECT_NEAR(simulation.truth["spots"].size(), areas.values.size(), 0);
  EXPECT_NEAR(simulation.truth["spots"][0]["side_px"], record.phase.Find("area_width")->values.at(0), 2);
  EXPECT_EQ(Json({199, 0, 9, 9, 0}),
            MeasureAnew({"touch_panel_led", {photo}, {{"regions", "199,0,9,9"}}}).request.parameters["regions"][0]);

  const Record outside = MeasureAnew({"led_light", {photo}, {{"regions", "0,0,9,9;440,290,20,9,5"}}});
  EXPECT_EQ(-95, outside.phase.code);
  EXPECT_THAT(outside.MissSentence(), HasSubstr("region with label 5"));
  EXPECT_TRUE(Says(MeasureAnew({"led_light", {photo}, {{"regions", "5,5,9,9"}}}), "region_smaller_than_window"));
  EXPECT_TRUE(Says(MeasureAnew({"led_light", {cv::Mat(99, 99, CV_8UC3, cv::Scalar(0, 0, 255))}}), "clipped"));
  for (const Json& regions : {Json("1,2,3"), Json("1,2,0,4"), Json::array(), Json({{1, 2, 3, "4"}}), Json("no.json")}) {
    EXPECT_THROW(MeasureAnew({"led_light", {photo}, {{"regions", regions}}}), Failure) << regions;
  }
}

TEST_F(PanelPhotos, PrintsAreHeldAgainstTheFilesOfAFolder) {
  SimulationOptions options;
  options.scene = "print";
  options.camera.size = {560, 420};
  options.camera.fill = 0.85;
  options.camera.noise_percent = 2;
  options.camera.blur_px = 0.7;
  options.motion_px = {7, -4};
  options.second_turn_deg = 2;
  options.missing = options.extra = 1;
  options.print_defect_px = 9;
  options.samples = 3;
  const Simulation simulation = Simulate(options);
  const std::vector<std::string> paths = Write(options, simulation);
  folder_.Write("samples/.half.png", std::string("still being copied"));
  const Request request = {"touch_panel_print", {paths[0], folder_.Path("samples")}};
  const Json& move = simulation.truth["matrix"];
  for (const auto& [place, sign] : {std::pair(1, 1), {3, -1}})
    EXPECT_NEAR(sign * std::sin(CV_PI / 90), move[place], 1e-9);
  const Record record = MeasureAnew(request);
  ASSERT_EQ(1, record.phase.code) << record.MissSentence();
  EXPECT_EQ(4U, record.inputs.size());
  EXPECT_EQ(4U, record.ToJson()["request"]["inputs"].size()) << "the files, not the folder";
  EXPECT_TRUE(record.remarks.empty());
  const Reading& areas = *record.phase.Find("areas");
  ASSERT_EQ(2U, areas.values.size());
  for (const Json& defect : simulation.truth["defects"]) {
    double nearest = 1e9;
    for (std::size_t i = 0; i < 2; ++i) {
      nearest = std::min(
          nearest, std::hypot(areas.axis[i] - defect["x"].get<double>(), areas.values[i] - defect["y"].get<double>()));
    }
    EXPECT_LT(nearest, 1.5) << defect;
  }

  const cv::Mat cut = cv::imread(paths[0])(cv::Rect(0, 0, 480, 420));
  EXPECT_TRUE(Says(MeasureAnew({"touch_panel_print", {folder_.Write("cut.png", cut), paths[1]}}), "print_cut_off"));
  folder_.Write("samples/4.png", std::string("words"));
  const Record refused = MeasureAnew(request);
  EXPECT_EQ(-97, refused.phase.code);
  EXPECT_THAT(refused.MissSentence(), HasSubstr("samples/4.png"));
  folder_.Write("samples/4.png", cv::Mat(99, 99, CV_8UC1, cv::Scalar(7)));
  EXPECT_EQ(-90, MeasureAnew(request).phase.code);
  EXPECT_THROW(MeasureAnew({"touch_panel_print", {paths[0]}}), Failure);
}

TEST_F(PanelPhotos, BothMapsOfARegistrationStandSideBySide) {
  SimulationOptions options;
  options.scene = "pair";
  options.camera.size = {400, 300};
  options.camera.gain = 0.75;
  options.second_turn_deg = 5;
  const Simulation simulation = Simulate(options);
  const std::vector<cv::Mat> photos = {Sense(options.camera, simulation.levels[0], 8),
                                       Sense(options.camera, simulation.levels[1], 8)};
  const Record record = MeasureAnew({"registration", {photos[0], photos[1]}, {{"map", "robust"}}});
  ASSERT_EQ(1, record.phase.code);
  const std::vector<double>& map = record.phase.Find("robust_matrix")->values;
  for (std::size_t i = 0; i < 6; ++i) EXPECT_NEAR(simulation.truth["matrix"][i], map[i], i % 3 == 2 ? 0.2 : 1e-3) << i;
  EXPECT_GT(record.phase.Find("map_distance")->value(), 0);
  const Record blank = MeasureAnew({"registration", {photos[0], DrawScene(9, {400, 300})}, {{"map", "robust"}}});
  EXPECT_TRUE(Says(blank, "robust_map_doubtful"));
}

// What a picture says of a figure: the word before its line, and the line, in one tone.
std::string Said(const Picture& picture, const std::string& figure) {
  const std::vector<Picture::Words>& words = picture.words();
  for (std::size_t i = 1; i < words.size(); ++i) {
    if (words[i].text.rfind(figure + " ", 0) != 0) continue;
    EXPECT_EQ(words[i].tone, words[i - 1].tone) << figure;
    EXPECT_EQ(words[i].tone == kPoor, words[i - 1].text == "FAIL") << figure;
    return words[i - 1].text + " " + words[i].text;
  }
  return "nothing";
}

// At a place in the photo, in red what failed.
bool SaysAtPlace(const Picture& picture, const std::string& verdict, bool failed) {
  return std::any_of(picture.words().begin(), picture.words().end(), [&](const Picture::Words& words) {
    return words.text.find(verdict) != std::string::npos && (words.tone == kPoor) == failed;
  });
}

struct PictureCase {
  const char* measurement;
  const char* scene;
  Json parameters;
  std::vector<std::string> shown;  // without a limit too
  const char* list = nullptr;      // whose entries stand at their places
};

// The limits that every single figure keeps or breaks, and each entry of the list.
Limits LimitsAround(const Record& record, const char* list, bool kept) {
  Limits limits;
  for (const Reading& m : record.phase.readings) {
    const bool wanted = list != nullptr && m.info->figure->name == std::string(list);
    if (m.info->figure->axis == nullptr ? !std::isfinite(m.value()) : !wanted) continue;
    FigureLimit& limit = limits.by_name[m.info->name];
    (kept ? limit.max : limit.min) = 1e6;
  }
  return limits;
}

TEST_F(PanelPhotos, PicturesShowEachFigureWithItsVerdictAndLimit) {
  const Json regions = Json::parse("[[40, 40, 90, 90, 7], [200, 40, 90, 90, 8]]");
  const PictureCase cases[] = {
      {"camera_flash", "dust", {}, {"mean", "mean_red", "mean_green", "mean_blue"}},
      {"lens_dust", "dust", {}, {"blob_count", "spot_count", "spot_largest_area", "mean_level"}, "spot_areas"},
      {"hdr_dots", "hdr", {}, {"dot_count", "area_count"}, "area_pixels"},
      {"led_light", "lights", {{"regions", regions}}, {"region_count", "area_count"}, "mean_grey"},
      {"touch_panel_led", "lights", {}, {"region_count", "area_count"}, "cct"},
      {"lcd", "display", {{"pattern", "white"}}, {"ratio", "uniformity", "dot_count"}, "levels"},
      {"touch_panel_print", "print", {}, {"area_count", "rms", "correlation"}, "area_pixels"},
      {"registration", "pair", {}, {"shift_columns", "shift_rows", "turn", "scale", "map_distance"}},
      {"camera_preview", "preview", {}, {"difference_mean"}},
      {"circle_check", "chart", {}, {"module_size", "legs_ratio", "chart_turn"}, "centre"},
      {"camera_autofocus", "chart", {}, {"chart_turn"}},
      {"camera_capture", "chart", {{"standard", "p.png"}}, {"delta_e_76_mean", "delta_e_2000_max"}, "delta_e_76"}};
  for (const PictureCase& one : cases) {
    SCOPED_TRACE(one.measurement);
    SimulationOptions options;
    options.scene = one.scene;
    options.camera.size = {640, 480};
    options.camera.noise_percent = 0.3;
    options.camera.gain = 0.8;
    options.dots = 6;
    options.extra = 1;
    options.samples = 3;
    const Simulation simulation = Simulate(options);
    std::vector<std::string> paths = Write(options, simulation);
    if (one.scene == std::string("hdr")) paths = {folder_.Write("p.pfm", simulation.levels[0])};
    Request request = {one.measurement, {paths[0]}, one.parameters.is_null() ? Json::object() : one.parameters};
    if (one.scene == std::string("print")) request.inputs.emplace_back(folder_.Path("samples"));
    if (one.scene == std::string("pair") || one.scene == std::string("preview")) request.inputs.emplace_back(paths[1]);
    if (request.parameters.contains("standard")) request.parameters["standard"] = paths[0];
    const Record plain = MeasureAnew(request);
    ASSERT_TRUE(plain.measured()) << plain.MissSentence();
    const Picture bare = *plain.finding->Draw(plain);
    for (const std::string& figure : one.shown) {
      const std::string name = plain.phase.name + "_" + figure;
      EXPECT_THAT(Said(bare, name), ::testing::StartsWith("MEASURED " + name));
    }
    for (const bool kept : {true, false}) {
      const Limits limits = LimitsAround(plain, one.list, kept);
      const Record judged = MeasureAnew(request, limits);
      const Picture picture = *judged.finding->Draw(judged);
      const std::string limit = kept ? "at most 1e+06" : "at least 1e+06";
      std::size_t told = 0;
      for (const auto& [name, ignored] : limits.by_name) {
        const std::string said = Said(picture, name);
        if (kept && said == "nothing") continue;  // where there are very many
        EXPECT_THAT(said, ::testing::AllOf(::testing::StartsWith(kept ? "PASS " : "FAIL "), HasSubstr(limit)));
        ++told;
      }
      EXPECT_GE(told, std::min<std::size_t>(limits.by_name.size(), 10));
      if (one.list != nullptr) {
        EXPECT_TRUE(SaysAtPlace(picture, (kept ? "PASS, " : "FAIL, ") + limit, !kept)) << one.list;
      }
    }
  }
}

}  // namespace
}  // namespace qv
