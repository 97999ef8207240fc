// Whether wrong numbers are doubted, and good ones are not: per kind of fault, how many readings lie off their truth,
// how many of these were doubted (caught), and how many of the good ones (false).
//   doubts_accuracy [--check [--quick]] [patches|maps|dots|dust|sharpness...]   --check: exit status 1 where a promise
//   is broken

#include <android/log.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <functional>
#include <mutex>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "benchmarks/pairs.h"
#include "benchmarks/trials.h"
#include "desk/base/text.h"
#include "desk/measure/measure.h"
#include "desk/measure/robust_map.h"
#include "desk/measure/sharpness.h"
#include "desk/simulation/method_law.h"
#include "desk/simulation/simulation.h"
#include "qvtester/tester.h"

namespace qv {
namespace {

constexpr double kOff = 0.05;    // of a sharpness reading
constexpr double kPatchOff = 3;  // CIE 1976
constexpr double kMapOff = 3;    // pixels
const cv::Size kPhoto = {1400, 1050};

struct Count {
  int readings = 0, off = 0, caught = 0, good = 0, doubted = 0, none = 0;
  std::vector<double> noiseless;  // how far noiseless readings lie outside of the true ones, percent

  void Add(bool is_off, bool is_doubted) {
    ++readings;
    ++(is_off ? off : good);
    if (is_doubted) ++(is_off ? caught : doubted);
  }
  // How far each is off, NaN where there is none, and whether it was doubted.
  void Add(const std::vector<std::pair<double, bool>>& tried, double most_off) {
    for (const auto& [off, is_doubted] : tried) {
      if (std::isnan(off)) {
        ++none;
      } else {
        Add(off > most_off, is_doubted);
      }
    }
  }
  void Add(const Count& other) {
    for (int Count::*part :
         {&Count::readings, &Count::off, &Count::caught, &Count::good, &Count::doubted, &Count::none})
      this->*part += other.*part;
  }
};

const char* const kHead = "| photos | readings | off | caught | false |\n|---|---|---|---|---|\n";

void PrintRow(const std::string& name, const Count& count) {
  const auto share = [](int part, int of) { return of == 0 ? 0 : 100.0 * part / of; };
  std::printf("| %s | %d | %d | %d (%.0f %%) | %d (%.1f %%) |", name.c_str(), count.readings, count.off, count.caught,
              share(count.caught, count.off), count.doubted, share(count.doubted, count.good));
  if (count.none > 0) std::printf(" none in %d", count.none);
  std::printf("\n");
  std::fflush(stdout);
}

// ---- Sharpness ---------------------------------------------------------------------------------------------------

struct Fault {
  std::string name;
  double noise = 1;   // percent
  bool good = false;  // nothing of it may be doubted
  double pan_deg = 0, tilt_deg = 0;
  std::function<double(cv::Point2d)> light = nullptr;  // factor at a place, -1 to 1 across and down
  std::function<double(double, int)> curve = nullptr;  // of levels with noise, by channel
};

struct ChartScene {
  SimulationOptions options;
  cv::Mat levels;
  // Without noise and in even light, also of a chart that lies a sixteenth of a pixel to either side: where the
  // centroid is about to be rounded the other way, the readings of all three are right.
  std::vector<cv::Mat> clean;  // CV_8UC1; none of a chart that is seen obliquely, whose law holds
  double edge_angle_deg[2] = {0, 0};
};

const char* const kRegions[] = {"vertical", "horizontal"};

cv::Mat Photograph(const cv::Mat& levels, const Fault& fault, std::uint64_t seed) {
  cv::Mat photo(levels.size(), CV_8UC3);
  cv::RNG random(seed);
  cv::Mat noise(levels.size(), CV_32FC3);
  random.fill(noise, cv::RNG::NORMAL, 0, std::max(2.55 * fault.noise, 1e-9));
  for (int row = 0; row < levels.rows; ++row) {
    for (int i = 0; i < levels.cols; ++i) {
      const double light = fault.light ? fault.light({2.0 * i / levels.cols - 1, 2.0 * row / levels.rows - 1}) : 1;
      for (int k = 0; k < 3; ++k) {
        double level = light * levels.at<cv::Vec3f>(row, i)[k] + noise.at<cv::Vec3f>(row, i)[k];
        if (fault.curve) level = fault.curve(level, k);
        photo.at<cv::Vec3b>(row, i)[k] = cv::saturate_cast<uchar>(level);
      }
    }
  }
  return photo;
}

// Of the region, or of the photo as a whole.
bool Doubted(const Record& record, const std::string& region) {
  const std::string other = region == "vertical" ? "horizontal" : "vertical";
  return std::any_of(record.remarks.begin(), record.remarks.end(), [&](const Remark& remark) {
    return remark.doubts() && remark.figure().find(other) == std::string::npos;
  });
}

ChartScene MakeScene(int number, double pan_deg, double tilt_deg) {
  cv::RNG random(number + 1);
  ChartScene scene;
  CameraModel& camera = scene.options.camera;
  constexpr double kBlurs[] = {0.5, 0.8, 1.2, 2.0};
  camera.size = kPhoto;
  camera.fill = random.uniform(0.8, 0.9);
  camera.blur_px = kBlurs[number % 4];
  camera.pan_deg = pan_deg;
  camera.tilt_deg = tilt_deg;
  scene.options.style.edge_angle_deg = random.uniform(3.0, 8.0);
  const Simulation simulation = Simulate(scene.options);
  scene.levels = simulation.levels[0];
  if (pan_deg != 0 || tilt_deg != 0) {
    for (int i = 0; i < 2; ++i) {
      scene.edge_angle_deg[i] = simulation.truth.at("mtf50").at(kRegions[i]).at("edge_angle_deg");
    }
    return scene;
  }
  for (const double moved : {0.0, -0.0625, 0.0625}) {
    cv::Mat levels;
    cv::warpAffine(scene.levels, levels, cv::Matx23d(1, 0, moved, 0, 1, moved), kPhoto, cv::INTER_LANCZOS4,
                   cv::BORDER_REPLICATE);
    cv::cvtColor(Photograph(levels, {"", 0}, 1), scene.clean.emplace_back(), cv::COLOR_RGB2GRAY);
  }
  return scene;
}

struct Bounds {
  double low = NAN, high = NAN;
};

// What the test may read of the region that it has measured: noise and light move the marks, and with them the region
// and the turn by which the photo is straightened.
Bounds TruthOf(const ChartScene& scene, const Record& record, int i) {
  const auto& finding = dynamic_cast<const SharpnessFinding&>(*record.finding);
  const SharpnessRegion& region = finding.regions[i];
  const cv::Size size = region.pixels.size();
  if (scene.clean.empty()) {
    const auto lens = [&](double f) {
      return method_law::TrueResponse(f, scene.options.camera.blur_px, scene.edge_angle_deg[i]);
    };
    const method_law::Bounds law = method_law::MeasuredMtf50(lens, std::min(size.width, size.height));
    return {law.low, law.high};
  }
  const std::array<cv::Point2f, 3> corners = {region.outline[0], region.outline[1], region.outline[2]};
  const auto right = static_cast<float>(size.width) - 0.5f;
  const auto bottom = static_cast<float>(size.height) - 0.5f;
  const std::array<cv::Point2f, 3> upright = {cv::Point2f(-0.5f, -0.5f), {right, -0.5f}, {right, bottom}};
  const cv::Mat map = cv::getAffineTransform(corners.data(), upright.data());
  Bounds bounds;
  for (const cv::Mat& photo : scene.clean) {
    QVTester tester;
    float mtf50 = 0;
    cv::Mat pixels;
    cv::warpAffine(photo, pixels, map, size);
    tester.CalculateMTF(pixels, mtf50);
    bounds.low = std::fmin(bounds.low, mtf50);
    bounds.high = std::fmax(bounds.high, mtf50);
  }
  return bounds;
}

Count TryFault(const std::vector<ChartScene>& scenes, const Fault& fault, int repeats) {
  Count sum;
  std::mutex mutex;
  const int count = static_cast<int>(scenes.size());
  ForEachTrial(count * repeats, [&](int trial) {
    const ChartScene& scene = scenes[trial % count];
    const Record record =
        MeasureAnew({"camera_autofocus", {Photograph(scene.levels, fault, 1000 + static_cast<std::uint64_t>(trial))}});
    const std::lock_guard<std::mutex> lock(mutex);
    for (int i = 0; i < 2; ++i) {
      const Reading* reading = record.phase.Find(std::string("mtf50_") + kRegions[i]);
      if (reading == nullptr || !std::isfinite(reading->value())) {
        ++sum.none;
        continue;
      }
      const Bounds truth = TruthOf(scene, record, i);
      const bool off = reading->value() < (1 - kOff) * truth.low || reading->value() > (1 + kOff) * truth.high;
      sum.Add(off, Doubted(record, kRegions[i]));
      const double plain = record.phase.Find(std::string("mtf50_noiseless_") + kRegions[i])->value();
      sum.noiseless.push_back(100 * std::max({0.0, plain / truth.high - 1, 1 - plain / truth.low}));
    }
  });
  return sum;
}

void AddUnevenLight(std::vector<Fault>& faults) {
  for (const double shading : {10.0, 20.0, 40.0, 60.0}) {
    faults.push_back({Format("shading %g %%", shading), 1, shading <= 10, 0, 0,
                      [=](cv::Point2d p) { return 1 - shading / 200 * p.dot(p); }});
  }
  for (const double fall : {10.0, 20.0, 40.0, 60.0}) {
    faults.push_back({Format("light falls by %g %% along a line", fall), 1, fall <= 10, 0, 0,
                      [=](cv::Point2d p) { return 1 - fall / 200 * (1 + 0.8 * p.x + 0.2 * p.y); }});
  }
  for (const double depth : {0.2, 0.4, 0.6}) {
    for (const double width : {0.1, 0.3}) {
      faults.push_back(
          {Format("soft shadow of %.0f %%, %.0f %% of the photo wide", 100 * depth, 50 * width), 1, false, 0, 0,
           [=](cv::Point2d p) { return 1 - depth / (1 + std::exp(-(p.x + 0.3 * p.y - 0.1) * 4 / width)); }});
    }
  }
}

void AddClipping(std::vector<Fault>& faults) {
  const auto clipped = [](double gain, double top, int only) {
    return [=](double level, int k) { return only < 0 || only == k ? std::min(gain * level, top) : level; };
  };
  faults.push_back({"paper flat at 251", 1, false, 0, 0, nullptr, clipped(1.15, 251, -1)});
  faults.push_back({"paper flat at 251, noise 0.3 %", 0.3, false, 0, 0, nullptr, clipped(1.15, 251, -1)});
  faults.push_back({"paper flat at 251, no noise", 0, false, 0, 0, nullptr, clipped(1.15, 251, -1)});
  faults.push_back({"paper cut off at 255", 1, false, 0, 0, nullptr, clipped(1.3, 255, -1)});
  faults.push_back({"green cut off by 10 %", 1, false, 0, 0, nullptr, clipped(1, 0.92 * 255 / 1.1, 1)});
  faults.push_back({"red cut off by 20 %", 1, false, 0, 0, nullptr, clipped(1, 0.92 * 255 / 1.2, 2)});
  faults.push_back({"shoulder at 240", 1, false, 0, 0, nullptr, [](double level, int) {
                      const double v = 1.25 * level;
                      return v <= 240 ? v : 240 + 15 * (1 - std::exp(-(v - 240) / 15));
                    }});
  faults.push_back(
      {"blacks cut off", 1, false, 0, 0, nullptr, [](double level, int) { return std::max(level - 70, 0.0); }});
  faults.push_back({"blacks cut off, noise 0.3 %", 0.3, false, 0, 0, nullptr,
                    [](double level, int) { return std::max(level, 60.0); }});
  faults.push_back({"green cut off by 10 %, noise 0.3 %", 0.3, false, 0, 0, nullptr, clipped(1, 0.92 * 255 / 1.1, 1)});
}

std::vector<Fault> Faults() {
  std::vector<Fault> faults;
  for (const double noise : {0.0, 0.5, 1.0, 1.5, 2.0, 3.0, 5.0}) {
    faults.push_back({Format("noise %g %%", noise), noise, noise <= 1});
  }
  AddUnevenLight(faults);
  AddClipping(faults);
  for (const double angle : {5.0, 10.0, 15.0}) {
    faults.push_back({Format("pan %g degrees", angle), 1, false, angle, 0});
    faults.push_back({Format("tilt %g degrees", angle), 1, false, 0, angle});
  }
  return faults;
}

void PrintSharpness() {
  const int scene_count = Trials(24, 3);
  const auto make = [&](double pan, double tilt) {
    std::vector<ChartScene> scenes(scene_count);
    ForEachTrial(scene_count, [&](int i) { scenes[i] = MakeScene(i, pan, tilt); });
    return scenes;
  };
  std::printf(
      "\nThe test's own MTF50, %d x %d, blur 0.5 to 2 px, noise 1 %% where nothing else is said: off is further than "
      "5 %% from the reading of the same region without noise and in even light, or from the law of a chart that is "
      "seen obliquely\n\n%s",
      kPhoto.width, kPhoto.height, kHead);
  const std::vector<ChartScene> upright = make(0, 0);
  Count good;
  Count bad;
  std::vector<double> noiseless;
  for (const Fault& fault : Faults()) {
    const bool oblique = fault.pan_deg != 0 || fault.tilt_deg != 0;
    const int repeats = Trials(fault.good ? 3 : 2, 1);
    const Count count = TryFault(oblique ? make(fault.pan_deg, fault.tilt_deg) : upright, fault, repeats);
    PrintRow(fault.name, count);
    (fault.good ? good : bad).Add(count);
    if (fault.noise <= 2 && !fault.light && !fault.curve && !oblique) {
      noiseless.insert(noiseless.end(), count.noiseless.begin(), count.noiseless.end());
    }
  }
  PrintRow("good photos: noise to 1 %, light that falls by 10 % at most", good);
  PrintRow("all others", bad);
  Hold("own_noiseless", Quantile(noiseless, 0.9));
  Hold("doubts_caught", 100.0 * bad.caught / bad.off);
  Hold("doubts_false", 100.0 * good.doubted / good.good);
}

// ---- Patches -----------------------------------------------------------------------------------------------------

cv::Mat StraightPhoto(SimulationOptions options) {
  options.camera.turn_deg = options.camera.pan_deg = options.camera.tilt_deg = 0;
  return Sense(options.camera, Simulate(options).levels[0], 8);
}

// The furthest patch from its colour, and whether the photo is doubted, by itself or as the standard of one that is
// seen straight on; NaN where it is not measured.
std::pair<double, bool> TryPatches(double oblique_deg, int trial, bool as_standard) {
  cv::RNG random(trial + 1);
  const double direction = random.uniform(0.0, 2 * CV_PI);
  SimulationOptions options;
  options.camera.size = {1200, 900};
  options.camera.fill = 0.85;
  options.camera.blur_px = 1;
  options.camera.gain = 0.85;
  options.camera.noise_percent = 1;
  options.camera.seed = static_cast<std::uint64_t>(trial) + 1;
  options.camera.turn_deg = random.uniform(-5.0, 5.0);
  options.camera.pan_deg = oblique_deg * std::cos(direction);
  options.camera.tilt_deg = oblique_deg * std::sin(direction);
  const Simulation simulation = Simulate(options);
  const cv::Mat photo = Sense(options.camera, simulation.levels[0], 8);
  const Record record = MeasureAnew({"camera_capture", {photo, photo}});
  if (record.phase.code != QV_SUCCESS) return {NAN, false};
  double furthest = 0;
  const Reading& l = *record.phase.Find("lab_l");
  for (std::size_t i = 0; i < l.values.size(); ++i) {
    const Json& truth = simulation.truth.at("patches").at(static_cast<std::size_t>(l.axis[i])).at("lab");
    const cv::Vec3d off(l.values[i] - truth[0].get<double>(),
                        record.phase.Find("lab_a")->values[i] - truth[1].get<double>(),
                        record.phase.Find("lab_b")->values[i] - truth[2].get<double>());
    furthest = std::max(furthest, cv::norm(off));
  }
  if (!as_standard) return {furthest, record.doubtful()};
  return {furthest, MeasureAnew({"camera_capture", {StraightPhoto(options), photo}}).doubtful()};
}

void PrintPatches() {
  const int photos = Trials(48, 4);
  std::printf(
      "\nPatches, 1200 x 900, noise 1 %%, turned by up to 5 degrees: off is a photo with a patch further than 3 "
      "(CIE 1976) from its colour\n\n%s",
      kHead);
  Count all;
  for (const bool as_standard : {false, true}) {
    for (const double oblique : {0.0, 2.0, 4.0, 6.0, 8.0, 10.0, 15.0}) {
      std::vector<std::pair<double, bool>> tried(photos);
      ForEachTrial(photos, [&](int trial) { tried[trial] = TryPatches(oblique, trial, as_standard); });
      Count count;
      count.Add(tried, kPatchOff);
      PrintRow(Format("%s%g degrees off straight on, any direction", as_standard ? "the standard, " : "", oblique),
               count);
      all.Add(count);
    }
  }
  Hold("doubts_patches", all.off - all.caught);
}

// ---- Registration ------------------------------------------------------------------------------------------------

void PrintMaps() {
  const int pairs = Trials(200, 8);
  std::vector<std::pair<double, bool>> tried(pairs, {NAN, false});
  ForEachTrial(pairs, [&](int trial) {
    cv::RNG random(trial + 5001);
    const double noise_percent = random.uniform(0.0, 3.0);
    SimulationOptions options = DrawPair(0.8, noise_percent, static_cast<std::uint64_t>(trial) + 5001, random);
    options.second_gain = random.uniform(0.7, 1.3);
    const PhotoPair pair = ShootPair(options);
    const Record record = MeasureAnew({"registration", {pair.reference, pair.image}});
    if (record.phase.code != QV_SUCCESS) return;
    const cv::Mat map = cv::Mat(record.phase.Find("matrix")->values, true).reshape(1, 2);
    tried[trial] = {MapDistance(map, pair.truth, options.camera.size), record.doubtful()};
  });
  Count count;
  count.Add(tried, kMapOff);
  std::printf(
      "\nRegistration by three matches, pairs of 640 x 480 with noise to 3 %%: off is a map further than 3 px from "
      "the truth\n\n%s",
      kHead);
  PrintRow("drawn textures", count);
  const int passing = count.readings - count.caught - count.doubted;
  Hold("doubts_maps", 100.0 * (count.off - count.caught) / passing);
}

// ---- Dots --------------------------------------------------------------------------------------------------------

void PrintDotsInNoise() {
  const int pictures = Trials(40, 4);
  std::printf("\nHDR dots at threshold 0.1, 600 x 400: off is a picture in which some dot is none, drawn or not\n\n%s",
              kHead);
  Count all;
  for (const int drawn : {0, 20}) {
    for (const double noise : {0.5, 1.0, 1.5, 2.0, 2.5, 3.0, 5.0}) {
      std::vector<std::pair<int, bool>> tried(pictures);
      ForEachTrial(pictures, [&](int trial) {
        SimulationOptions options = SceneOptions("hdr", {600, 400}, noise, trial + 1);
        options.camera.shading_percent = 10;
        options.dots = drawn;
        options.dot_contrast = 0.3;
        const Simulation simulation = Simulate(options);
        const Record record = MeasureAnew({"hdr_dots", {simulation.levels[0]}});
        const int surplus = static_cast<int>(record.phase.Find("dot_count")->value()) - drawn;
        tried[trial] = {surplus, record.outcome() == Outcome::kError};
      });
      Count count;
      for (const auto& [surplus, doubted] : tried) count.Add(surplus > 0, doubted);
      PrintRow(Format("noise %g %%, %d dots", noise, drawn), count);
      all.Add(count);
    }
  }
  PrintRow("all", all);
  Hold("doubts_dots", 100.0 * all.caught / all.off);
}

// ---- Dust --------------------------------------------------------------------------------------------------------

struct DustCase {
  std::string name;
  bool plain;  // a plain target, whose blobs may be counted
  SimulationOptions options;
  std::function<double(cv::Point2d)> light = nullptr;  // factor at a place, -1 to 1 across and down
};

DustCase Plain(std::string name, double noise, int specks = 0, double px = 10, double darkness = 0.6) {
  DustCase row = {std::move(name), true, {}};
  row.options.scene = "dust";
  row.options.camera.blur_px = 0.7;
  row.options.camera.gain = 0.75;
  row.options.camera.noise_percent = noise;
  row.options.specks = specks;
  row.options.speck_px = px;
  row.options.speck_darkness = darkness;
  return row;
}

DustCase NoTarget(const char* name, const char* scene) {
  DustCase row = Plain(name, 1);
  row.plain = false;
  row.options.scene = scene;
  return row;
}

std::vector<DustCase> DustCases() {
  std::vector<DustCase> rows;
  for (const double noise : {0.0, 0.5, 1.0, 2.0, 3.0}) {
    rows.push_back(Plain(Format("plain target, noise %g %%", noise), noise));
  }
  for (const double shading : {10.0, 30.0, 50.0}) {
    rows.push_back(Plain(Format("plain target, shading %g %%", shading), 1));
    rows.back().options.camera.shading_percent = shading;
  }
  rows.push_back(Plain("plain target, stored as sRGB", 1));
  rows.back().options.camera.srgb = true;
  rows.push_back(Plain("plain target, light that falls by 10 % along a line", 1));
  rows.back().light = [](cv::Point2d p) { return 1 - 0.05 * (1 + 0.8 * p.x + 0.2 * p.y); };
  rows.push_back(Plain("plain target, a lamp 2 % brighter at the sides", 1));
  rows.back().light = [](cv::Point2d p) { return 1 - 0.02 * std::exp(-p.dot(p) / (2 * 0.3 * 0.3)); };
  for (const double px : {5.0, 10.0, 16.0, 20.0, 24.0, 40.0, 100.0}) {
    for (const double darkness : px < 30 ? std::vector<double>{0.6, 0.3} : std::vector<double>{0.6, 0.3, 0.1}) {
      rows.push_back(Plain(Format("3 specks of %g px, %g darker", px, darkness), 1, 3, px, darkness));
    }
  }
  rows.push_back(Plain("white cut off: the target above 255", 1));
  rows.back().options.camera.gain = 1.2;
  rows.push_back(Plain("white cut off in the middle", 1));
  rows.back().options.camera.gain = 1.05;
  rows.back().options.camera.shading_percent = 40;
  for (DustCase* row : {&rows[rows.size() - 2], &rows.back()}) row->plain = false;
  rows.push_back(Plain("a dark side, a quarter of the photo", 1));
  rows.back().light = [](cv::Point2d p) { return p.x < -0.5 ? 0.3 : 1; };
  rows.push_back(Plain("a dark edge, 5 % of the photo", 1));
  rows.back().light = [](cv::Point2d p) { return p.y < -0.9 ? 0.3 : 1; };
  rows.push_back(Plain("a soft shadow of 40 %, a third of the photo wide", 1));
  rows.back().light = [](cv::Point2d p) { return 1 - 0.4 * std::exp(-p.dot(p) / (2 * 0.17 * 0.17)); };
  for (std::size_t i = rows.size() - 3; i < rows.size(); ++i) rows[i].plain = false;
  rows.push_back(NoTarget("the chart", "chart"));
  rows.push_back(NoTarget("a textured scene", "pair"));
  rows.push_back(NoTarget("a display", "display"));
  rows.push_back(NoTarget("a print", "print"));
  return rows;
}

cv::Mat ShadedBy(const cv::Mat& levels, const std::function<double(cv::Point2d)>& light) {
  cv::Mat shaded = levels.clone();
  for (int row = 0; row < shaded.rows; ++row) {
    for (int i = 0; i < shaded.cols; ++i) {
      shaded.at<cv::Vec3f>(row, i) *= light({2.0 * i / shaded.cols - 1, 2.0 * row / shaded.rows - 1});
    }
  }
  return shaded;
}

// Whether the count is wrong, and whether it is doubted.
std::pair<bool, bool> TryDust(const DustCase& row, int trial) {
  SimulationOptions options = row.options;
  options.camera.size = {1200, 900};
  options.camera.seed = static_cast<std::uint64_t>(trial) + 1;
  const Simulation simulation = Simulate(options);
  cv::Mat levels = simulation.levels[0];
  if (row.light) levels = ShadedBy(levels, row.light);
  const Record record = MeasureAnew({"lens_dust", {Sense(options.camera, levels, 8)}});
  const Reading* const count = record.phase.Find("blob_count");
  return {!row.plain || count == nullptr || count->value() != options.specks, record.outcome() == Outcome::kError};
}

void PrintDust() {
  const int photos = Trials(24, 3);
  std::printf(
      "\nDust, 1200 x 900, noise 1 %% where nothing else is said: off is a photo of a plain target whose specks were "
      "not counted as drawn, and every one of anything else\n\n%s",
      kHead);
  Count all;
  for (const DustCase& row : DustCases()) {
    std::vector<std::pair<bool, bool>> tried(photos);
    ForEachTrial(photos, [&](int trial) { tried[trial] = TryDust(row, trial); });
    Count count;
    for (const auto& [off, doubted] : tried) count.Add(off, doubted);
    PrintRow(row.name, count);
    all.Add(count);
  }
  PrintRow("all", all);
  Hold("doubts_dust", 100.0 * all.caught / all.off);
  Hold("doubts_dust_false", 100.0 * all.doubted / all.good);
}

}  // namespace
}  // namespace qv

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
  cv::setNumThreads(1);  // the trials take the cores
  const auto asked = [&](const char* section) {
    return words.empty() || std::find(words.begin(), words.end(), section) != words.end();
  };
  if (asked("patches")) qv::PrintPatches();
  if (asked("maps")) qv::PrintMaps();
  if (asked("dots")) qv::PrintDotsInNoise();
  if (asked("dust")) qv::PrintDust();
  if (asked("sharpness")) qv::PrintSharpness();
  return AllKept() ? 0 : 1;
}
