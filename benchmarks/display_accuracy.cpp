// How true what is read of a display's photo is: corners, and patterns told from one another, on simulated photos.
//   display_accuracy [--check [--quick]]     --check: exit status 1 where a promise is broken

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <map>
#include <mutex>
#include <numeric>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <optional>
#include <string>
#include <vector>

#include "benchmarks/trials.h"
#include "desk/simulation/simulation.h"
#include "qvtester/lcd.h"

namespace qv {
namespace {

// How the photo is made of the light on the sensor. The simulated scene's levels stand for light where it is encoded.
struct Setting {
  const char* name;
  cv::Size size;
  double blur_px, noise_percent;
  bool srgb = false;  // the light is blurred, then encoded by sRGB's transfer
  int jpeg = 0;
  double exposure_ev = 0;
  double veil = 0;  // ambient light that the whole scene reflects: levels where it is stored as it is
};
const Setting kSettings[] = {
    {"800 x 600", {800, 600}, 0.8, 1},
    {"800 x 600, sharp", {800, 600}, 0.4, 1},
    {"800 x 600, soft, noise 2 %", {800, 600}, 1.5, 2},
    {"800 x 600, noise 5 %", {800, 600}, 0.8, 5},
    {"800 x 600, sRGB", {800, 600}, 0.8, 1, true},
    {"800 x 600, sRGB, soft, noise 2 %", {800, 600}, 1.5, 2, true},
    {"800 x 600, half a stop too bright", {800, 600}, 0.8, 1, false, 0, 0.5},
    {"800 x 600, sRGB, JPEG 75", {800, 600}, 0.8, 1, true, 75},
    {"200 x 150", {200, 150}, 0.8, 1},
    {"2000 x 1500, sRGB", {2000, 1500}, 1.2, 1, true},
};

float Encoded(float level) {
  const float v = std::clamp(level / 255, 0.0f, 1.0f);
  return 255 * (v <= 0.0031308f ? 12.92f * v : 1.055f * std::pow(v, 1 / 2.4f) - 0.055f);
}

struct Display {
  cv::Mat photo;
  std::vector<cv::Point2d> corners;
};

// Any turn, up to 30 degrees of pan and of tilt, fill, surround, bezel and shading: all of one seed.
SimulationOptions Draw(int seed, const std::string& pattern, const Setting& setting) {
  cv::RNG random(seed + 1);
  SimulationOptions o;
  o.scene = "display";
  o.display.pattern = pattern;
  o.display.surround = random.uniform(20.0, 70.0);
  const double bezel = random.uniform(-60.0, 120.0);
  o.display.bezel =
      pattern == "black" ? 0 : std::max(bezel, 0.0);  // a black screen ends where its surround is brighter
  o.display.black = random.uniform(2.0, 8.0);
  o.camera.size = setting.size;
  o.camera.fill = random.uniform(0.4, 0.93);
  o.camera.turn_deg = seed % 2 == 0 ? random.uniform(-180.0, 180.0) : random.uniform(-5.0, 5.0);
  o.camera.pan_deg = random.uniform(-30.0, 30.0);
  o.camera.tilt_deg = random.uniform(-30.0, 30.0);
  o.camera.shading_percent = random.uniform(0.0, 40.0);
  o.camera.blur_px = setting.blur_px;
  o.camera.noise_percent = setting.noise_percent;
  o.camera.exposure_ev = setting.exposure_ev;
  o.camera.seed = static_cast<std::uint64_t>(seed) + 1;
  return o;
}

Display Photograph(SimulationOptions o, const Setting& setting) {
  o.camera.srgb = setting.srgb;  // drawn and blurred in light
  const Simulation simulation = Simulate(o);
  cv::Mat levels = simulation.levels[0] + cv::Scalar::all(setting.veil);
  if (setting.srgb) {
    for (cv::Vec3f& pixel : cv::Mat_<cv::Vec3f>(levels)) {
      for (float& level : pixel.val) level = Encoded(level);
    }
  }
  o.camera.srgb = false;  // encoded here, since its noise is that of stored levels
  Display display;
  display.photo = Sense(o.camera, levels, 8);
  if (setting.jpeg > 0) {
    std::vector<std::uint8_t> file;
    cv::imencode(".jpg", display.photo, file, {cv::IMWRITE_JPEG_QUALITY, setting.jpeg});
    display.photo = cv::imdecode(file, cv::IMREAD_COLOR);
  }
  for (const Json& corner : simulation.truth["corners"]) display.corners.emplace_back(corner["x"], corner["y"]);
  return display;
}

template <typename Trial>
void ForEach(int count, Trial&& trial) {
  cv::parallel_for_(cv::Range(0, count), [&](const cv::Range& range) {
    for (int i = range.start; i < range.end; ++i) trial(i);
  });
}

// Answers the median.
double PrintCorners(const Setting& setting, int photos) {
  std::mutex mutex;
  std::vector<double> errors;
  int missed = 0;
  ForEach(photos, [&](int i) {
    const Display display = Photograph(Draw(i, kDisplayPatterns[i % kDisplayPatterns.size()], setting), setting);
    QVTester_LCD lcd;
    const int code = lcd.FindScreen(display.photo);
    const std::lock_guard<std::mutex> lock(mutex);
    if (code != QV_SUCCESS) ++missed;
    for (const cv::Point2d& corner : display.corners) {
      double nearest = INFINITY;
      for (const cv::Point2f& found : lcd.corners_) nearest = std::min(nearest, cv::norm(cv::Point2d(found) - corner));
      if (code == QV_SUCCESS) errors.push_back(nearest);
    }
  });
  std::sort(errors.begin(), errors.end());
  const auto quantile = [&](double share) {
    return errors.empty() ? NAN : errors[static_cast<std::size_t>(share * static_cast<double>(errors.size() - 1))];
  };
  std::printf("| %s | %d | %d | %.3f | %.3f | %.3f | %.2f |\n", setting.name, photos, missed, quantile(0.5),
              quantile(0.9), quantile(0.99), quantile(1));
  std::fflush(stdout);
  return missed * 100 <= photos ? quantile(0.5) : INFINITY;
}

constexpr std::array<const char*, 5> kAsked = {"control", "green", "black", "white", "result"};

// What each display should be judged: 1, 0, or either where green is asked for and a tick stands on it. Bars are judged
// as seen, from the left or the top: a quarter turn counter-clockwise brings the first one to the bottom.
char Expected(const std::string& shown, int asked, int quarters) {
  if (shown == "tick" && asked == QV_LCD_GREEN) return '*';
  if (shown == "tick") return asked == QV_LCD_RESULT ? '1' : '0';
  if (shown == "control" && (quarters == 1 || quarters == 2)) return '0';
  return shown == kAsked[asked] ? '1' : '0';
}

// A third each: light as it is, by sRGB, by sRGB and JPEG; any noise, exposure, cast, ambient light and dim corner.
Display PatternPhoto(int i, const std::string& shown, int quarters, std::optional<double> ambient) {
  cv::RNG random(0x9E3779B97F4A7C15 * (static_cast<std::uint64_t>(i) + 1));
  Setting setting = {"", {800, 600}, random.uniform(0.6, 1.5), random.uniform(0.5, 3.0)};
  setting.srgb = i / 24 % 3 > 0;
  setting.jpeg = i / 24 % 3 > 1 ? random.uniform(60, 96) : 0;
  setting.exposure_ev = random.uniform(-0.5, 0.3);
  setting.veil = random.uniform(0.0, setting.srgb ? 1.0 : 20.0);
  if (ambient) setting.veil = *ambient * 255;
  SimulationOptions view = Draw(i + 1000, shown, setting);
  view.camera.turn_deg = 90 * quarters + std::remainder(view.camera.turn_deg, 20);
  view.camera.cast = {random.uniform(0.94, 1.06), 1, random.uniform(0.94, 1.06)};
  view.dim_corner = random.uniform(0.0, 0.3);
  view.defects = random.uniform(0, 6);
  return Photograph(view, setting);
}

struct Judged {
  std::map<std::string, std::array<int, 5>> ones;  // verdicts of 1 by what is shown, and what is asked for
  std::map<std::string, int> counts;
  std::array<int, 5> wrong = {};  // by what is asked for
};

// With ambient light of this share of white's, or of any.
Judged JudgePhotos(int photos, std::optional<double> ambient = {}) {
  Judged judged;
  std::mutex mutex;
  ForEach(photos, [&](int i) {
    const std::string& shown = kDisplayPatterns[i % kDisplayPatterns.size()];
    const int quarters = i / static_cast<int>(kDisplayPatterns.size()) % 4;
    const Display display = PatternPhoto(i, shown, quarters, ambient);
    const std::string row = shown == "control" && (quarters == 1 || quarters == 2) ? "control, reversed" : shown;
    for (int asked = 0; asked < 5; ++asked) {
      QVTester_LCD lcd;
      QVLcdResult result;
      const bool done = lcd.JudgePattern(display.photo, static_cast<QV_LCD_PATTERN>(asked), &result) == QV_SUCCESS;
      const std::lock_guard<std::mutex> lock(mutex);
      if (done) judged.ones[row][asked] += result.verdict_;
      const char expected = Expected(shown, asked, quarters);
      if (!done || (expected != '*' && result.verdict_ != expected - '0')) {
        ++judged.wrong[asked];
        std::fprintf(stderr, "photo %d, %s asked for %s: %s\n", i, row.c_str(), kAsked[asked], result.reason_.c_str());
      }
    }
    const std::lock_guard<std::mutex> lock(mutex);
    ++judged.counts[row];
  });
  return judged;
}

int Sum(const std::array<int, 5>& counts) { return std::accumulate(counts.begin(), counts.end(), 0); }

void PrintPatterns(int photos) {
  Judged judged = JudgePhotos(photos);
  const int wrong = Sum(judged.wrong);
  std::printf("\nVerdicts of 1, by what is shown and what is asked for: %d photos, %d of %d judgements wrong\n\n",
              photos, wrong, 5 * photos);
  std::printf("| shown | photos | control | green | black | white | result |\n|---|---|---|---|---|---|---|\n");
  for (const auto& [shown, count] : judged.counts) {
    std::printf("| %s | %d |", shown.c_str(), count);
    for (int asked = 0; asked < 5; ++asked) std::printf(" %d |", judged.ones[shown][asked]);
    std::printf("\n");
  }
  Hold("display_wrong", 20.0 * wrong / photos);
}

void PrintAmbient(int photos) {
  std::printf("\nWrong judgements of %d each, by ambient light and what is asked for\n\n", photos);
  std::printf("| ambient light, of white's | control | green | black | white | result |\n|---|---|---|---|---|---|\n");
  for (const double ambient : {0.004, 0.012, 0.04}) {
    const Judged judged = JudgePhotos(photos, ambient);
    std::printf("| %.1f %% |", 100 * ambient);
    for (const int wrong : judged.wrong) std::printf(" %d |", wrong);
    std::printf("\n");
  }
}

void Run() {
  std::printf("Corners of the screen, any turn, pan and tilt up to 30 degrees: distance from the truth, px\n\n");
  std::printf("| photo | photos | not found | median | 90 %% | 99 %% | largest |\n|---|---|---|---|---|---|---|\n");
  double largest = 0;
  double stored_as_jpeg = 0;
  for (const Setting& setting : kSettings) {
    if (Trials(1, 0) == 0 && setting.size.width > 800) continue;
    const double median = PrintCorners(setting, Trials(200, 6));
    double& worst = setting.jpeg > 0 ? stored_as_jpeg : largest;
    if (setting.size.width >= 800) worst = std::max(worst, median);
  }
  Hold("display_corners", largest);
  Hold("display_jpeg", stored_as_jpeg);
  PrintPatterns(Trials(500, 10));
  PrintAmbient(Trials(120, 3));
}

}  // namespace
}  // namespace qv

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  qv::Run();
  return AllKept() ? 0 : 1;
}
