// Tests 27 to 29 against simulated panels and prints.

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <memory>
#include <opencv2/imgcodecs.hpp>

#include "benchmarks/trials.h"
#include "desk/base/files.h"
#include "desk/measure/robust_map.h"
#include "desk/simulation/simulation.h"
#include "qvtester/tester.h"

namespace {

using namespace qv;

// x and y of a black body (Kim et al., cubic approximation of the Planckian locus), 2,222 to 25,000 K.
cv::Point2d BlackBody(double kelvin) {
  const double t = 1000 / kelvin;
  const bool warm = kelvin <= 4000;
  const double x = warm ? ((-0.2661239 * t - 0.2343589) * t + 0.8776956) * t + 0.179910
                        : ((-3.0258469 * t + 2.1070379) * t + 0.2226347) * t + 0.240390;
  const double y = warm ? ((-0.9549476 * x - 1.37418593) * x + 2.09137015) * x - 0.16748867
                        : ((3.0817580 * x - 5.87338670) * x + 3.75112997) * x - 0.37001483;
  return {x, y};
}

// Stored levels of light of about this colour, the strongest channel at this level: whole ones, as they are drawn.
cv::Vec3d LevelsOf(cv::Point2d xy, double strongest) {
  const cv::Matx33d xyz_from_rgb(0.4124, 0.3576, 0.1805, 0.2126, 0.7152, 0.0722, 0.0193, 0.1192, 0.9505);
  cv::Vec3d rgb = xyz_from_rgb.inv() * cv::Vec3d(xy.x / xy.y, 1, (1 - xy.x - xy.y) / xy.y);
  rgb /= std::max({rgb[0], rgb[1], rgb[2]});
  for (int i = 0; i < 3; ++i) {
    const double c = std::max(rgb[i], 0.0);
    rgb[i] = std::round(strongest * (c <= 0.0031308 ? 12.92 * c : 1.055 * std::pow(c, 1 / 2.4) - 0.055));
  }
  return rgb;
}

SimulationOptions LightsOptions(double noise_percent, int seed) {
  SimulationOptions options = SceneOptions("lights", {900, 600}, noise_percent, seed);
  options.camera.blur_px = 0.8;
  options.camera.gain = 1;
  return options;
}

// Test 27 over the regions of the truth; the tester holds the result.
const QVLightResult& MeasureLights(QVTester& tester, const cv::Mat& photo, const Json& truth) {
  std::vector<QVRegionRecord> regions;
  for (const Json& r : truth.at("regions")) {
    regions.push_back({{r.at("left"), r.at("top"), r.at("width"), r.at("height"), r.at("label")}});
  }
  int count = static_cast<int>(regions.size());
  tester.Initialize();
  tester.SetProperty(QV_PROPERTY_REGION_COUNT_0, &count);
  tester.SetProperty(QV_PROPERTY_REGION_LIST_0, regions.data());
  tester.resources_[QV_RESOURCE_LED_PHOTO] = std::make_unique<QVResource>();
  tester.resources_[QV_RESOURCE_LED_PHOTO]->SetImage(photo);
  tester.TestLEDLight();
  return tester.results_->led_;
}

// The test's own formula on an x and y.
double Temperature(cv::Point2d xy) {
  std::array<float, 3> xyz = {static_cast<float>(xy.x / xy.y), 1, static_cast<float>((1 - xy.x - xy.y) / xy.y)};
  QVTester tester;
  const std::unique_ptr<float, decltype(&std::free)> kelvin(tester.xyz2cct(xyz.data(), 1, 1), &std::free);
  return *kelvin;
}

void PrintColours() {
  const int kPhotos = Trials(6, 1);
  double furthest = 0;
  double fit = 0;
  std::printf(
      "\nColour of lights: black bodies to whole levels, strongest channel at 200, %d photos of six lights each, 8 "
      "bits\n\n"
      "| kelvin | formula on the black body's x, y | noise %% | x, y: mean error | largest | kelvin: mean error to the "
      "formula on the true x, y | largest |\n|---|---|---|---|---|---|---|\n",
      kPhotos);
  for (const double kelvin : {2700.0, 3000.0, 4000.0, 5000.0, 6500.0, 8000.0, 10000.0}) {
    for (const double noise : {0.0, 2.0}) {
      std::vector<std::vector<double>> off(kPhotos);
      std::vector<std::vector<double>> warmer(kPhotos);
      ForEachTrial(kPhotos, [&](int trial) {
        SimulationOptions options = LightsOptions(noise, trial + 1);
        options.lights.colour = LevelsOf(BlackBody(kelvin), 200);
        const Simulation simulation = Simulate(options);
        const Json& colour = simulation.truth.at("chromaticity");
        const cv::Point2d truth(colour.at("x"), colour.at("y"));
        QVTester tester;
        const cv::Mat photo = Sense(options.camera, simulation.levels[0], 8);
        const QVLightResult& result = MeasureLights(tester, photo, simulation.truth);
        for (int i = 0; i < result.region_count_; ++i) {
          const QVLightRegion& region = result.regions_[i];
          off[trial].push_back(std::hypot(region.chromaticity_[0] - truth.x, region.chromaticity_[1] - truth.y));
          warmer[trial].push_back(std::abs(region.cct_ - Temperature(truth)));
        }
      });
      std::vector<double> all_off;
      std::vector<double> all_warmer;
      for (const auto& photo : off) all_off.insert(all_off.end(), photo.begin(), photo.end());
      for (const auto& photo : warmer) all_warmer.insert(all_warmer.end(), photo.begin(), photo.end());
      std::printf("| %.0f | %.0f | %.0f | %.5f | %.5f | %.1f | %.1f |\n", kelvin, Temperature(BlackBody(kelvin)), noise,
                  Mean(all_off), Quantile(all_off, 1), Mean(all_warmer), Quantile(all_warmer, 1));
      furthest = std::max(furthest, Quantile(all_off, 1));
      fit = std::max(fit, std::fabs(Temperature(BlackBody(kelvin)) - kelvin));
    }
  }
  Hold("lights_xy", furthest);
  Hold("lights_fit", fit);
}

struct Defects {
  std::array<int, 2> drawn = {}, found = {};  // of extra ink (or dark spots), of missing ink
  int wrong = 0;                              // areas where nothing was drawn
};

// Areas against squares of this side: one is found by an area that comes within 3 px of its middle or holds it.
Defects Compare(const Json& drawn, double side, const QVRECT* areas, int count) {
  constexpr double kNear = 3;
  Defects defects;
  std::vector<bool> explained(count, false);
  for (const Json& defect : drawn) {
    const double x = defect.at("x");
    const double y = defect.at("y");
    bool found = false;
    for (int i = 0; i < count; ++i) {
      const double reach = side / 2 + kNear;
      const bool hit = x > areas[i].left - reach && x < areas[i].right + reach && y > areas[i].top - reach &&
                       y < areas[i].bottom + reach;
      explained[i] = explained[i] || hit;
      found = found || hit;
    }
    const int kind = defect.value("kind", "extra") == "missing" ? 1 : 0;
    ++defects.drawn[kind];
    defects.found[kind] += found ? 1 : 0;
  }
  for (const bool is : explained) defects.wrong += is ? 0 : 1;
  return defects;
}

void Add(Defects& sum, const Defects& one) {
  for (int kind : {0, 1}) {
    sum.drawn[kind] += one.drawn[kind];
    sum.found[kind] += one.found[kind];
  }
  sum.wrong += one.wrong;
}

void PrintSpots() {
  const int kPhotos = Trials(20, 1);
  Defects sure;
  std::printf(
      "\nDark spots of lights: six a photo, %d photos a row, threshold 0.12, radius 8, noise 1 %%, blur 0.8 px\n\n"
      "| side px | darker by 0.15 | 0.25 | 0.4 | 0.8 | false areas a photo |\n|---|---|---|---|---|---|\n",
      kPhotos);
  for (const double side : {1.0, 2.0, 3.0, 5.0, 9.0}) {
    std::printf("| %.0f |", side);
    Defects all;
    for (const double darkness : {0.15, 0.25, 0.4, 0.8}) {
      std::vector<Defects> photos(kPhotos);
      ForEachTrial(kPhotos, [&](int trial) {
        SimulationOptions options = LightsOptions(1, trial + 1);
        options.spots = 6;
        options.spot_px = side;
        options.lights.spot_darkness = darkness;
        const Simulation simulation = Simulate(options);
        QVTester tester;
        const QVLightResult& result =
            MeasureLights(tester, Sense(options.camera, simulation.levels[0], 8), simulation.truth);
        photos[trial] = Compare(simulation.truth.at("spots"), side, result.error_areas_, result.error_count_);
      });
      Defects sum;
      for (const Defects& photo : photos) Add(sum, photo);
      if ((side >= 2 && darkness >= 0.4) || (side >= 3 && darkness >= 0.25) || side >= 5) Add(sure, sum);
      Add(all, sum);
      std::printf(" %d of %d |", sum.found[0], sum.drawn[0]);
    }
    std::printf(" %.2f |\n", all.wrong / (4.0 * kPhotos));
  }
  Hold("lights_spots", 100.0 * sure.found[0] / sure.drawn[0]);
}

struct PrintTrial {
  double side = 0, contrast = 0;
  double off_px = NAN;  // of the refined map
  double rms = NAN, correlation = NAN;
  bool measured = false;
  Defects defects;
};

SimulationOptions PrintOptions(int trial, double side, double contrast) {
  cv::RNG random(trial + 1);
  SimulationOptions options = SceneOptions("print", {800, 600}, 2, trial + 1);
  options.camera.fill = 0.85;
  options.camera.blur_px = 1;
  options.print.seed = trial % 10 + 1;
  options.print.defect_contrast = contrast;
  options.print_defect_px = side;
  options.missing = options.extra = 2;
  options.samples = 5;
  const double x = random.uniform(-20.0, 20.0);
  const double y = random.uniform(-20.0, 20.0);
  options.motion_px = {x, y};
  options.second_turn_deg = random.uniform(-5.0, 5.0);
  options.second_scale = random.uniform(0.95, 1.05);
  return options;
}

PrintTrial MeasurePrint(int trial, double side, double contrast, const std::string& folder) {
  const SimulationOptions options = PrintOptions(trial, side, contrast);
  const Simulation simulation = Simulate(options);
  PrintTrial result;
  result.side = side;
  result.contrast = contrast;
  QVTester tester;
  tester.Initialize();
  CameraModel sensor = options.camera;
  const cv::Mat photo = Sense(sensor, simulation.levels[0], 8);
  std::vector<std::string> files;
  for (std::size_t i = 1; i < simulation.levels.size(); ++i) {
    sensor.seed += 0x9E3779B97F4A7C15;
    files.push_back(folder + "/" + std::to_string(trial) + "-" + std::to_string(i) + ".png");
    cv::imwrite(files.back(), Sense(sensor, simulation.levels[i], 8));
  }
  tester.resources_[QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO] = std::make_unique<QVResource>();
  tester.resources_[QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO]->SetImage(photo);
  result.measured =
      tester.SetResource(QV_RESOURCE_IMAGE_LIST, files) == QV_SUCCESS && tester.TestTouchPanelPrint() == QV_SUCCESS;
  for (const std::string& file : files) std::filesystem::remove(file);
  if (!result.measured) return result;
  const QVResultData& results = *tester.results_;
  const cv::Mat truth = cv::Mat(simulation.truth.at("matrix").get<std::vector<double>>(), true).reshape(1, 2);
  result.off_px = MapDistance(truth, tester.print_map_, options.camera.size);
  result.rms = results.print_rms_;
  result.correlation = results.print_correlation_;
  result.defects =
      Compare(simulation.truth.at("defects"), side, results.print_error_areas_, results.print_error_count_);
  return result;
}

constexpr std::array<double, 5> kPrintSides = {3, 4, 6, 8, 12};
constexpr std::array<double, 4> kPrintContrasts = {0.4, 0.6, 0.8, 1};

// Defects by side and contrast; answers those of which a promise is made.
Defects PrintDefects(std::map<std::pair<double, double>, Defects>& sums) {
  std::printf("| side px | ink |");
  for (const double contrast : kPrintContrasts) std::printf(" contrast %.1f |", contrast);
  std::printf("\n|---|---|---|---|---|---|\n");
  Defects sure;
  for (const double side : kPrintSides) {
    for (int kind : {0, 1}) {
      std::printf("| %.0f | %s |", side, kind == 0 ? "too much" : "missing");
      for (const double contrast : kPrintContrasts) {
        const Defects& sum = sums[{side, contrast}];
        const bool promised = kind == 0 ? side >= 4 : side >= 8 && contrast == 1;
        if (promised) sure.drawn[kind] += sum.drawn[kind];
        if (promised) sure.found[kind] += sum.found[kind];
        std::printf(" %d of %d |", sum.found[kind], sum.drawn[kind]);
      }
      std::printf("\n");
    }
    std::printf("| %.0f | false areas |", side);
    for (const double contrast : kPrintContrasts) std::printf(" %d |", sums[{side, contrast}].wrong);
    std::printf("\n");
  }
  return sure;
}

}  // namespace

void PrintLights() {
  PrintColours();
  PrintSpots();
}

void PrintPrints() {
  const int kPrints = Trials(200, 20);
  ScratchFolder scratch;
  const std::string folder = scratch.path();
  std::vector<PrintTrial> trials(kPrints);
  ForEachTrial(kPrints, [&](int trial) {
    trials[trial] = MeasurePrint(trial, kPrintSides[trial % kPrintSides.size()],
                                 kPrintContrasts[trial / kPrintSides.size() % kPrintContrasts.size()], folder);
  });
  int measured = 0;
  int trusted = 0;
  std::vector<double> off;
  std::map<std::pair<double, double>, Defects> sums;
  Defects all;
  int untold = 0;  // registered wrong, and the correlation does not say so
  for (const PrintTrial& trial : trials) {
    if (!trial.measured) continue;
    ++measured;
    if (!(trial.correlation > 0.8)) continue;
    ++trusted;
    untold += trial.off_px > 1 ? 1 : 0;
    off.push_back(trial.off_px);
    Add(sums[{trial.side, trial.contrast}], trial.defects);
    Add(all, trial.defects);
  }
  std::printf(
      "\nPrints: %d of 800 x 600, ten designs, two places of missing and two of extra ink each, shift to 20 px, turn "
      "to "
      "5 degrees, scale 0.95 to 1.05, noise 2 %%, five good prints\n\n",
      kPrints);
  std::printf(
      "%d were measured, %d with a correlation above 0.8, of which %d are registered off by over 1 px; the median is "
      "%.3f px.\n\n",
      measured, trusted, untold, Quantile(off, 0.5));
  const Defects sure = PrintDefects(sums);
  std::printf("\nFalse areas: %.2f a print.\n", static_cast<double>(all.wrong) / trusted);
  Hold("prints_extra", 100.0 * sure.found[0] / sure.drawn[0]);
  Hold("prints_missing", 100.0 * sure.found[1] / sure.drawn[1]);
  Hold("prints_false", static_cast<double>(all.wrong) / trusted);
  Hold("prints_untold", untold);
}
