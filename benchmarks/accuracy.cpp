// Measures the measures: simulated photos whose truth is known, and how far each figure lies from it. Prints the tables
// that README and docs quote; everything is drawn from fixed seeds, so two runs print the same.
//   qvtester_accuracy [--curves FILE.png] [SECTION...]

#include <android/log.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <functional>
#include <map>
#include <opencv2/aruco.hpp>
#include <opencv2/imgproc.hpp>
#include <opencv2/objdetect.hpp>
#include <string>
#include <vector>

#include "benchmarks/trials.h"
#include "chart/chart_layout.h"
#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/drawing/plot.h"
#include "desk/measure/measure.h"
#include "desk/measure/promises.h"
#include "desk/simulation/method_law.h"
#include "desk/simulation/simulation.h"
#include "qvtester/tester.h"

namespace {

using namespace qv;

SimulationOptions ChartOptions(cv::Size size, double blur_px) {
  SimulationOptions options;
  options.camera.size = size;
  options.camera.fill = 0.9;
  options.camera.blur_px = blur_px;
  return options;
}

struct Sharpness {
  bool found = false;
  double vertical = NAN, horizontal = NAN;
};

Sharpness MeasureSharpness(const cv::Mat& photo) {
  const Record record = MeasureAnew({"camera_autofocus", {photo}});
  if (record.phase.code != QV_SUCCESS) return {};
  return {true, record.phase.Find("mtf50_vertical")->value(), record.phase.Find("mtf50_horizontal")->value()};
}

// How far outside of the law's bounds a reading lies, in percent; 0 inside, infinity where there is none.
double Departure(double reading, const Json& edge) {
  if (!std::isfinite(reading)) return INFINITY;
  const double low = edge.at("expected_low_nyquist");
  const double high = edge.at("expected_high_nyquist");
  return 100 * std::max({0.0, reading / high - 1, 1 - reading / low});
}

// Readings of one blur held against what the law says of their edges.
struct LawRow {
  double truth = 0, low = 1, high = 0, departure = 0;
  std::vector<double> values, errors;

  void Add(double reading, const Json& edge) {
    truth = edge.at("mtf50_nyquist");
    low = std::min<double>(low, edge.at("expected_low_nyquist"));
    high = std::max<double>(high, edge.at("expected_high_nyquist"));
    values.push_back(reading);
    errors.push_back(100 * (reading / truth - 1));
    departure = std::max(departure, Departure(reading, edge));
  }
};

void PrintMtf50() {
  const std::vector<double> blurs = Trials(1, 0) == 1 ? std::vector<double>{0.3, 0.5, 0.8, 1.2, 1.6, 2.0, 2.5, 3.0}
                                                      : std::vector<double>{0.3, 0.8, 1.2, 3.0};
  const std::vector<double> slopes = {3, 4, 5, 6, 7, 8};
  std::printf(
      "\nMTF50 without noise, upright, edges at 3 to 8 degrees, even and odd regions; units of Nyquist, 12 readings a "
      "row\n\n");
  std::printf("| blur px | true | law from | to | measured from | to | mean error | furthest beyond the law |\n");
  std::printf("|---|---|---|---|---|---|---|---|\n");
  std::vector<std::vector<Sharpness>> readings(blurs.size(), std::vector<Sharpness>(slopes.size()));
  std::vector<std::vector<Json>> truths(blurs.size(), std::vector<Json>(slopes.size()));
  ForEachTrial(static_cast<int>(blurs.size() * slopes.size()), [&](int trial) {
    const std::size_t b = trial / slopes.size();
    const std::size_t s = trial % slopes.size();
    SimulationOptions options = ChartOptions({2000, 1500}, blurs[b]);
    options.style.edge_angle_deg = slopes[s];
    options.camera.fill -= 0.004 * static_cast<double>(s);  // regions of even and odd widths
    const Simulation simulation = Simulate(options);
    truths[b][s] = simulation.truth;
    readings[b][s] = MeasureSharpness(Sense(options.camera, simulation.levels[0], 8));
  });
  double worst = 0;
  for (std::size_t b = 0; b < blurs.size(); ++b) {
    LawRow row;
    for (std::size_t s = 0; s < slopes.size(); ++s) {
      row.Add(readings[b][s].vertical, truths[b][s].at("mtf50").at("vertical"));
      row.Add(readings[b][s].horizontal, truths[b][s].at("mtf50").at("horizontal"));
    }
    worst = std::max(worst, row.departure);
    std::printf("| %.1f | %.4f | %.4f | %.4f | %.4f | %.4f | %+.1f %% | %.2f %% |\n", blurs[b], row.truth, row.low,
                row.high, Quantile(row.values, 0), Quantile(row.values, 1), Mean(row.errors), row.departure);
    for (const auto& [blur, promise] :
         {std::pair(0.3, "own_low_0.3"), {0.8, "own_low_0.8"}, {1.2, "own_low_1.2"}, {3.0, "own_low_3.0"}}) {
      if (blur == blurs[b]) Hold(promise, -Mean(row.errors));
    }
  }
  std::printf("\nFurthest beyond the law's bounds: %.2f %%\n", worst);
  Hold("own_law", worst);
}

void PrintStraightening() {
  const std::vector<double> turns =
      Trials(1, 0) == 1 ? std::vector<double>{0, 1, 2, 3, 5, 10, 20, 30, 45, 60, 90} : std::vector<double>{0, 10};
  const std::vector<double> blurs =
      Trials(1, 0) == 1 ? std::vector<double>{0.5, 0.8, 1.2, 2.0} : std::vector<double>{0.5, 1.2};
  std::printf(
      "\nWhat straightening costs: MTF50 of a turned chart over the upright one's, mean of both regions, percent\n\n");
  std::printf("| turn, degrees |");
  for (const double blur : blurs) std::printf(" blur %.1f px |", blur);
  std::printf("\n|---|");
  for (std::size_t b = 0; b < blurs.size(); ++b) std::printf("---|");
  std::printf("\n");
  std::vector<double> means(turns.size() * blurs.size());
  ForEachTrial(static_cast<int>(means.size()), [&](int trial) {
    SimulationOptions options = ChartOptions({2000, 1500}, blurs[trial % blurs.size()]);
    options.camera.turn_deg = turns[trial / blurs.size()];
    options.camera.fill = 0.65;  // room for every turn at one scale
    const double turn = options.camera.turn_deg * CV_PI / 180;
    options.camera.fill *= std::fabs(std::cos(turn)) + std::fabs(std::sin(turn));
    const Sharpness reading = MeasureSharpness(Sense(options.camera, Simulate(options).levels[0], 8));
    means[trial] = reading.found ? (reading.vertical + reading.horizontal) / 2 : NAN;
  });
  double most = 0;
  for (std::size_t t = 0; t < turns.size(); ++t) {
    std::printf("| %.0f |", turns[t]);
    for (std::size_t b = 0; b < blurs.size(); ++b) {
      const double cost = 100 * (means[t * blurs.size() + b] / means[b] - 1);
      most = std::max(most, -cost);
      std::printf(" %+.1f |", cost);
    }
    std::printf("\n");
  }
  Hold("own_turned", most);
}

void PrintNoise() {
  constexpr int kSeeds = 50;
  const std::vector<double> blurs = {0.5, 0.8, 1.2, 2.0};
  const std::vector<double> noises = {0.5, 1, 1.5, 2};
  std::printf("\nMTF50 under noise, upright, 5 degrees; against the noiseless reading; %d readings a row\n\n",
              2 * kSeeds);
  std::printf(
      "| blur px | noise | median | 5th percentile | 95th | outside the law by over 2 %% "
      "|\n|---|---|---|---|---|---|\n");
  for (const double blur : blurs) {
    SimulationOptions options = ChartOptions({2000, 1500}, blur);
    const Simulation simulation = Simulate(options);
    const Sharpness clean = MeasureSharpness(Sense(options.camera, simulation.levels[0], 8));
    for (const double noise : noises) {
      std::vector<double> errors(2 * kSeeds);
      std::vector<double> departures(2 * kSeeds);
      ForEachTrial(kSeeds, [&](int seed) {
        CameraModel camera = options.camera;
        camera.noise_percent = noise;
        camera.seed = seed + 1;
        const Sharpness reading = MeasureSharpness(Sense(camera, simulation.levels[0], 8));
        errors[2 * seed] = 100 * (reading.vertical / clean.vertical - 1);
        errors[2 * seed + 1] = 100 * (reading.horizontal / clean.horizontal - 1);
        departures[2 * seed] = Departure(reading.vertical, simulation.truth.at("mtf50").at("vertical"));
        departures[2 * seed + 1] = Departure(reading.horizontal, simulation.truth.at("mtf50").at("horizontal"));
      });
      std::printf("| %.1f | %.1f %% | %+.2f %% | %+.2f %% | %+.2f %% | %.0f %% |\n", blur, noise, Quantile(errors, 0.5),
                  Quantile(errors, 0.05), Quantile(errors, 0.95), 100 - ShareBelow(departures, 2));
    }
  }
}

std::vector<cv::Point2d> FindMarks(const cv::Mat& photo) {
  const Record record = MeasureAnew({"circle_check", {photo}});
  std::vector<cv::Point2d> marks;
  if (record.phase.code != QV_SUCCESS) return marks;
  const Reading& found = *record.phase.Find("marks");
  for (std::size_t i = 0; i < found.values.size(); ++i) marks.emplace_back(found.axis[i], found.values[i]);
  return marks;
}

double LargestMarkError(const std::vector<cv::Point2d>& marks, const Json& truth) {
  double largest = 0;
  for (const cv::Point2d& mark : marks) {
    double nearest = 1e9;
    for (const Json& centre : truth.at("marks")) {
      nearest =
          std::min(nearest, std::hypot(centre.at("x").get<double>() - mark.x, centre.at("y").get<double>() - mark.y));
    }
    largest = std::max(largest, nearest);
  }
  return largest;
}

void PrintMarks() {
  const int kSeeds = Trials(20, 2);
  double median = 0;
  double largest = 0;
  std::printf(
      "\nMark positions, 2000 x 1500, blur 1 px, noise 1 %%; the furthest of a photo's three marks, %d photos a "
      "row\n\n",
      kSeeds);
  std::printf("| turn, degrees | found | median px | 95th percentile px | largest, modules |\n|---|---|---|---|---|\n");
  for (const double turn : {0.0, 5.0, 15.0, 30.0, 45.0}) {
    std::vector<double> errors(kSeeds, -1);
    std::vector<double> modules(kSeeds, 0);
    ForEachTrial(kSeeds, [&](int seed) {
      SimulationOptions options = ChartOptions({2000, 1500}, 1);
      options.camera.turn_deg = turn + 0.13 * seed;
      options.camera.noise_percent = 1;
      options.camera.seed = seed + 1;
      const Simulation simulation = Simulate(options);
      const std::vector<cv::Point2d> marks = FindMarks(Sense(options.camera, simulation.levels[0], 8));
      if (marks.size() != 3) return;
      errors[seed] = LargestMarkError(marks, simulation.truth);
      modules[seed] = errors[seed] / simulation.truth.at("module_px").get<double>();
    });
    errors.erase(std::remove(errors.begin(), errors.end(), -1), errors.end());
    std::printf("| %.0f | %zu of %d | %.2f | %.2f | %.2f |\n", turn, errors.size(), kSeeds, Quantile(errors, 0.5),
                Quantile(errors, 0.95), Quantile(modules, 1));
    median = std::max(median, Quantile(errors, 0.5));
    largest = std::max(largest, Quantile(modules, 1));
  }
  Hold("marks_median", median);
  Hold("marks_largest", largest);
}

void PrintPatches() {
  std::printf("\nPatch colours, 1600 x 1200: CIE 1976 difference to the colour as photographed\n\n");
  std::printf("| turn | noise | mean | largest |\n|---|---|---|---|\n");
  std::map<bool, double> largest;  // turned or not
  double mean = 0;
  for (const double turn : {0.0, 5.0, 10.0}) {
    for (const double noise : {0.0, 2.0}) {
      SimulationOptions options = ChartOptions({1600, 1200}, 1);
      options.camera.gain = 0.85;
      options.camera.turn_deg = turn;
      options.camera.noise_percent = noise;
      const Simulation simulation = Simulate(options);
      cv::Mat photo = Sense(options.camera, simulation.levels[0], 8);
      const Record record = MeasureAnew({"camera_capture", {photo, photo}});
      if (record.phase.code != QV_SUCCESS) continue;
      std::vector<double> differences;
      for (std::size_t i = 0; i < record.phase.Find("lab_l")->values.size(); ++i) {
        double square = 0;
        for (int k = 0; k < 3; ++k) {
          const double truth = simulation.truth.at("patches").at(i).at("lab").at(k);
          square += std::pow(record.phase.Find(std::string("lab_") + "lab"[k])->values[i] - truth, 2);
        }
        differences.push_back(std::sqrt(square));
      }
      std::printf("| %.0f | %.0f %% | %.2f | %.2f |\n", turn, noise, Mean(differences), Quantile(differences, 1));
      mean = std::max(mean, Mean(differences));
      largest[turn != 0] = std::max(largest[turn != 0], Quantile(differences, 1));
    }
  }
  Hold("patches_mean", mean);
  Hold("patches_upright", largest[false]);
  Hold("patches_turned", largest[true]);
}

// The least level of an even photo with a speck in which it is found.
void PrintLeastLight() {
  for (int level = 100; level < 200; ++level) {
    cv::Mat photo(300, 400, CV_8UC3, cv::Scalar::all(level + 1));
    cv::circle(photo, {200, 150}, 5, cv::Scalar::all(level / 3.0), cv::FILLED);
    cv::Mat gray;
    cv::cvtColor(photo, gray, cv::COLOR_BGR2GRAY);
    const Reading* count = nullptr;
    const Record record = MeasureAnew({"lens_dust", {photo}});
    if (record.phase.code == QV_SUCCESS) count = record.phase.Find("blob_count");
    if (count == nullptr || count->value() < 1) continue;
    std::printf("\nBlobs are found from a mean level of %.1f on.\n", cv::mean(gray)[0]);
    Hold("dust_light", std::floor(cv::mean(gray)[0]));
    return;
  }
}

constexpr int kSpecks = 3;

// How many of them lie within 2 px of a blob.
int SpecksFound(int trial, double diameter, double darkness) {
  SimulationOptions options = SceneOptions("dust", {800, 600}, 0.5, trial + 1);
  options.camera.blur_px = 0.7;
  options.specks = kSpecks;
  options.speck_px = diameter;
  options.speck_darkness = darkness;
  const Simulation simulation = Simulate(options);
  const Record record = MeasureAnew({"lens_dust", {Sense(options.camera, simulation.levels[0], 8)}});
  const Reading& blobs = *record.phase.Find("blobs");
  const Json& specks = simulation.truth.at("specks");
  return static_cast<int>(std::count_if(specks.begin(), specks.end(), [&](const Json& speck) {
    for (std::size_t i = 0; i < blobs.values.size(); ++i) {
      if (std::hypot(blobs.axis[i] - speck.at("x").get<double>(), blobs.values[i] - speck.at("y").get<double>()) < 2) {
        return true;
      }
    }
    return false;
  }));
}

void PrintDust() {
  const int kPhotos = Trials(10, 1);
  int found_of_4_to_16 = 0;
  int drawn_of_4_to_16 = 0;
  int found_of_20 = 0;
  std::printf(
      "\nDust, blur 0.7 px: specks found of %d, by diameter and by how much darker than the target they are\n\n",
      kPhotos * kSpecks);
  std::printf("| diameter px | darkness 0.6 | 0.3 | 0.15 |\n|---|---|---|---|\n");
  for (const double diameter : {3.0, 4.0, 5.0, 6.0, 8.0, 10.0, 12.0, 14.0, 16.0, 18.0, 20.0, 24.0}) {
    std::printf("| %.0f |", diameter);
    for (const double darkness : {0.6, 0.3, 0.15}) {
      std::vector<int> found(kPhotos, 0);
      ForEachTrial(kPhotos, [&](int trial) { found[trial] = SpecksFound(trial, diameter, darkness); });
      int sum = 0;
      for (const int count : found) sum += count;
      std::printf(" %d |", sum);
      if (diameter >= 20) found_of_20 += sum;
      if (diameter < 4 || diameter > 16 || darkness < 0.3) continue;
      found_of_4_to_16 += sum;
      drawn_of_4_to_16 += kPhotos * kSpecks;
    }
    std::printf("\n");
  }
  PrintLeastLight();
  Hold("dust_found", 100.0 * found_of_4_to_16 / drawn_of_4_to_16);
  Hold("dust_hollow", found_of_20);
}

struct DotCount {
  int found = 0, drawn = 0;
};

// By where the dots lie; as "false" those that were found where none is.
std::map<std::string, DotCount> CountDots(int trial, int radius) {
  SimulationOptions options = SceneOptions("hdr", {1200, 900}, 0.5, trial + 1);
  options.camera.shading_percent = 20;
  options.dot_contrast = 0.2;
  const Simulation simulation = Simulate(options);
  cv::Mat picture = simulation.levels[0].clone();
  cv::Mat mask = cv::Mat::zeros(picture.size(), CV_8U);
  QVTester tester;
  tester.DetectDot(picture.ptr<float>(), picture.rows, picture.cols, 0.1f, radius, mask.data);
  std::map<std::string, DotCount> counts;
  for (const Json& dot : simulation.truth.at("dots")) {
    const cv::Point at(dot.at("column"), dot.at("row"));
    const bool side = at.x == 0 || at.x == picture.cols - 1;
    const bool end = at.y == 0 || at.y == picture.rows - 1;
    DotCount& count = counts[side && end ? "corners" : side || end ? "edges" : "elsewhere"];
    ++count.drawn;
    count.found += mask.at<uchar>(at);
    mask.at<uchar>(at) = 0;
  }
  counts["false"].found = cv::countNonZero(mask);
  return counts;
}

void PrintDots() {
  const int kPictures = Trials(10, 1);
  int missed = 0;
  int drawn = 0;
  std::printf(
      "\nHDR dots: 1,000 of contrast 0.2 (bright and dark) at threshold 0.1, noise 0.5 %%, shading 20 %%, 1200 x "
      "900\n\n");
  std::printf("| radius px | corners | edges | elsewhere | false dots |\n|---|---|---|---|---|\n");
  for (const int radius : {1, 2, 5, 10, 20, 50, 100}) {
    std::vector<std::map<std::string, DotCount>> counts(kPictures);
    ForEachTrial(kPictures, [&](int trial) { counts[trial] = CountDots(trial, radius); });
    std::map<std::string, DotCount> sum;
    for (const auto& picture : counts) {
      for (const auto& [place, count] : picture) {
        sum[place].found += count.found;
        sum[place].drawn += count.drawn;
      }
    }
    std::printf("| %d | %d of %d | %d of %d | %d of %d | %d |\n", radius, sum["corners"].found, sum["corners"].drawn,
                sum["edges"].found, sum["edges"].drawn, sum["elsewhere"].found, sum["elsewhere"].drawn,
                sum["false"].found);
    for (const char* place : {"corners", "edges", "elsewhere"}) {
      if (radius > 50) continue;
      missed += sum[place].drawn - sum[place].found;
      drawn += sum[place].drawn;
    }
  }
  Hold("dots_found", 100.0 * (drawn - missed) / drawn);
}

// ---- Detection beside the detectors of other targets ------------------------------------------------------------

// Cells of a target as squares about the chart's middle, the outermost of them `module` wide.
Scene CellScene(const cv::Mat& cells, double module) {
  Scene scene;
  const cv::Point2d from = cv::Point2d(1, 1) * (kChartSide / 2.0) - cv::Point2d(cells.cols, cells.rows) * (module / 2);
  for (int i = 0; i < cells.rows; ++i) {
    for (int j = 0; j < cells.cols; ++j) {
      if (cells.at<uchar>(i, j) > 127) continue;
      const cv::Point2d at = from + cv::Point2d(j, i) * module;
      scene.shapes.push_back(
          {{at, at + cv::Point2d(module, 0), at + cv::Point2d(module, module), at + cv::Point2d(0, module)},
           {0, 0, 0}});
    }
  }
  return scene;
}

cv::Mat QrCells() {
  cv::Mat code;
  cv::QRCodeEncoder::Params parameters;
  parameters.version = 1;
  cv::QRCodeEncoder::create(parameters)->encode("QVTESTER", code);
  return code;
}

cv::Mat ArucoCells(int id) {
  cv::Mat cells;
  cv::aruco::drawMarker(cv::aruco::getPredefinedDictionary(cv::aruco::DICT_4X4_50), id, 6, cells, 1);
  return cells;
}

bool IsNear(const std::vector<cv::Point2f>& corners, cv::Point2d centre, double limit) {
  if (corners.size() != 4) return false;
  const cv::Point2f middle = (corners[0] + corners[1] + corners[2] + corners[3]) / 4;
  return cv::norm(cv::Point2d(middle) - centre) < limit;
}

struct Detections {
  bool chart = false, qr = false, aruco = false;
};

Detections Detect(const SimulationOptions& options) {
  constexpr int kId = 7;
  const CameraModel& camera = options.camera;
  Detections found;
  const Simulation simulation = Simulate(options);
  const double module_px = simulation.truth.at("module_px");
  const std::vector<cv::Point2d> marks = FindMarks(Sense(camera, simulation.levels[0], 8));
  found.chart = marks.size() == 3 && LargestMarkError(marks, simulation.truth) < 1.5 * module_px;

  const double module = simulation.truth.at("module_units");
  const cv::Matx33d map = PhotoFromScene(camera, SfrChartBounds());
  const cv::Point2d centre = Map(map, cv::Point2d(1, 1) * (kChartSide / 2.0));
  std::vector<cv::Point2f> corners;
  const cv::Mat qr = Sense(camera, Expose(camera, CellScene(QrCells(), module), map), 8);
  found.qr = cv::QRCodeDetector().detect(qr, corners) && IsNear(corners, centre, 2 * module_px);
  const cv::Mat aruco = Sense(camera, Expose(camera, CellScene(ArucoCells(kId), module), map), 8);
  std::vector<std::vector<cv::Point2f>> markers;
  std::vector<int> ids;
  cv::aruco::detectMarkers(aruco, cv::aruco::getPredefinedDictionary(cv::aruco::DICT_4X4_50), markers, ids);
  for (std::size_t i = 0; i < ids.size(); ++i) {
    found.aruco = found.aruco || (ids[i] == kId && IsNear(markers[i], centre, 2 * module_px));
  }
  return found;
}

struct Sweep {
  const char* name;
  const char* axis;
  std::vector<double> values;
  void (*apply)(SimulationOptions& options, double value);
};

const std::vector<Sweep>& Sweeps() {
  static const std::vector<Sweep> sweeps = {
      {"blur",
       "Gaussian blur, sigma, px",
       {0, 1, 2, 3, 4, 5, 6, 8},
       [](SimulationOptions& o, double v) { o.camera.blur_px = v; }},
      {"tilt", "tilt, degrees", {0, 10, 20, 30, 40, 50}, [](SimulationOptions& o, double v) { o.camera.tilt_deg = v; }},
      {"noise",
       "noise, % of 255",
       {0, 2, 5, 10, 15, 20, 30},
       [](SimulationOptions& o, double v) { o.camera.noise_percent = v; }},
      {"shading",
       "shading at the corners, %",
       {0, 20, 40, 50, 60, 80},
       [](SimulationOptions& o, double v) { o.camera.shading_percent = v; }},
      {"size",
       "width of the photo, px",
       {240, 320, 480, 640, 960, 1600},
       [](SimulationOptions& o, double v) {
         o.camera.size = {static_cast<int>(v), static_cast<int>(v * 3 / 4)};
       }},
      {"turn",
       "turn, degrees",
       {0, 10, 20, 30, 40, 45, 60, 75, 90},
       [](SimulationOptions& o, double v) { o.camera.turn_deg = v; }},
  };
  return sweeps;
}

// Wilson's interval, at 95 %, of a share of so many trials.
cv::Vec2d IntervalOf(double share, int trials) {
  constexpr double kZ = 1.96;
  const double n = trials;
  const double middle = (share + kZ * kZ / (2 * n)) / (1 + kZ * kZ / n);
  const double half = kZ / (1 + kZ * kZ / n) * std::sqrt(share * (1 - share) / n + kZ * kZ / (4 * n * n));
  return {middle - half, middle + half};
}

constexpr int kSweepPhotos = 12;  // a value

// Of each value, one photo after the other.
std::vector<Detections> DetectOver(const Sweep& sweep) {
  std::vector<Detections> found(sweep.values.size() * kSweepPhotos);
  ForEachTrial(static_cast<int>(found.size()), [&](int trial) {
    cv::RNG random(trial % kSweepPhotos + 1);
    SimulationOptions options = ChartOptions({960, 720}, 0.8);
    options.camera.fill = 0.85;
    options.camera.turn_deg = random.uniform(0.0, 360.0);
    options.camera.noise_percent = 1;
    options.camera.seed = trial % kSweepPhotos + 1;
    sweep.apply(options, sweep.values[trial / kSweepPhotos]);
    found[trial] = Detect(options);
  });
  return found;
}

Plot EmptyPlotOf(const Sweep& sweep) {
  Plot plot;
  plot.title = std::string("Detection against ") + sweep.name;
  plot.x_label = sweep.axis;
  plot.y_label = "share found";
  plot.x_max = 1.04 * sweep.values.back();  // room for the last bars
  plot.y_max = 1.05;
  const char* const names[] = {"chart", "QR code", "ArUco marker"};
  for (int k = 0; k < 3; ++k) {
    plot.curves.push_back({names[k], {}, kSeries[k]});
    plot.curves[k].shift_px = 5 * k;
  }
  return plot;
}

// The rows of its table; and its plot.
Plot PrintSweep(const Sweep& sweep) {
  std::printf("\n| %s | chart | QR code | ArUco |\n|---|---|---|---|\n", sweep.axis);
  const std::vector<Detections> found = DetectOver(sweep);
  Plot plot = EmptyPlotOf(sweep);
  for (std::size_t i = 0; i < sweep.values.size(); ++i) {
    const auto share = [&](bool Detections::*target) {
      const auto first = found.begin() + static_cast<std::ptrdiff_t>(i * kSweepPhotos);
      return std::count_if(first, first + kSweepPhotos, [=](const Detections& d) { return d.*target; }) /
             static_cast<double>(kSweepPhotos);
    };
    const std::array<double, 3> shares = {share(&Detections::chart), share(&Detections::qr), share(&Detections::aruco)};
    std::printf("| %g | %.0f %% | %.0f %% | %.0f %% |\n", sweep.values[i], 100 * shares[0], 100 * shares[1],
                100 * shares[2]);
    for (int k = 0; k < 3; ++k) {
      plot.curves[k].points.emplace_back(sweep.values[i], shares[k]);
      plot.curves[k].spans.push_back(IntervalOf(shares[k], kSweepPhotos));
    }
  }
  return plot;
}

std::string curves_file;

void PrintDetection() {
  std::printf(
      "\nDetection, share of %d photos: 960 x 720, any turn, blur 0.8 px, noise 1 %% where not varied. QR code "
      "(version 1) "
      "and ArUco\nmarker (4 x 4) stand at the chart's middle with cells as large as the marks' modules; OpenCV %s's "
      "detectors\n",
      kSweepPhotos, CV_VERSION);
  constexpr double kWidth = 420;
  constexpr double kHeight = 330;
  Picture picture(static_cast<int>(3 * kWidth), static_cast<int>(2 * kHeight + 40));
  picture.Text(Format("Share of %d photos in which each was found; bars: its 95 %% interval", kSweepPhotos), {12, 26},
               16, kInk);
  cv::Rect2d place(0, 40, kWidth, kHeight);
  for (const Sweep& sweep : Sweeps()) {
    DrawPlot(picture, PrintSweep(sweep), place);
    place.x += kWidth;
    if (place.br().x > picture.width()) place = {0, place.y + kHeight, kWidth, kHeight};
  }
  if (!curves_file.empty()) WriteWholeFile(curves_file, picture.Png());
}

struct Section {
  const char* name;
  void (*print)();
};

constexpr Section kSections[] = {
    {"mtf50", PrintMtf50},
    {"straightening", PrintStraightening},
    {"noise", PrintNoise},
    {"marks", PrintMarks},
    {"patches", PrintPatches},
    {"dust", PrintDust},
    {"registration", PrintRegistration},
    {"dots", PrintDots},
    {"lights", PrintLights},
    {"prints", PrintPrints},
    {"detection", PrintDetection},
};

}  // namespace

int main(int argc, char** argv) {
  std::vector<std::string> words(argv + 1, argv + argc);
  if (!words.empty() && words[0] == "--promises") {
    std::printf("%s\n%s", PromiseTable().c_str(), PromiseList().c_str());
    return 0;
  }
  TakeCheckOptions(words);
  std::vector<std::string> wanted;
  for (std::size_t i = 0; i < words.size(); ++i) {
    if (words[i] == "--curves" && i + 1 < words.size()) {
      curves_file = words[++i];
    } else if (std::any_of(std::begin(kSections), std::end(kSections),
                           [&](const Section& section) { return section.name == words[i]; })) {
      wanted.push_back(words[i]);
    } else {
      std::fprintf(stderr, "usage: %s [--check [--quick]] [--curves FILE.png] [SECTION...]\nsections:", argv[0]);
      for (const Section& section : kSections) std::fprintf(stderr, " %s", section.name);
      std::fprintf(stderr, "\n");
      return 2;
    }
  }
  __android_log_set_minimum_priority(ANDROID_LOG_SILENT);
  cv::setNumThreads(1);  // the trials take the cores
  if (IsChecking() && wanted.empty()) {
    for (const Section& section : kSections) {
      if (section.print != PrintNoise && section.print != PrintDetection) wanted.emplace_back(section.name);
    }
  }
  for (const Section& section : kSections) {
    if (wanted.empty() || std::find(wanted.begin(), wanted.end(), section.name) != wanted.end()) section.print();
    std::fflush(stdout);
  }
  return AllKept() ? 0 : 1;
}
