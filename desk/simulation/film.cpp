#include "desk/simulation/film.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <opencv2/imgproc.hpp>

#include "chart/chart_layout.h"
#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/scenes/charts.h"
#include "desk/simulation/method_law.h"

namespace qv {

namespace {

constexpr double kSettledWithin = 0.1;  // of the final sharpness, as the test has it
constexpr double kJitterStep = 1.7;     // radians a frame

// Written into the encoder's filter as well.
double TimeMs(const FilmStyle& style, int number) {
  return (number + style.jitter * std::sin(kJitterStep * number)) * 1000 / style.rate;
}

// Rows that the sensor gives: noise of its own for each frame.
cv::Mat Shoot(CameraModel camera, const cv::Mat& levels, int number) {
  camera.seed += static_cast<std::uint64_t>(number) * 0x9E3779B97F4A7C15;
  return Sense(camera, levels, 8);
}

// ---- Focus

// Blur that the lens adds: down to 0, beyond, back to 0.
double Defocus(const FilmStyle& style, double ms) {
  if (ms < style.sweep_ms) return style.from_px * (1 - ms / style.sweep_ms);
  const double back = (ms - style.sweep_ms) / std::max(style.return_ms, 1e-9);  // 0 to 1
  return back < 1 ? style.overshoot_px * (1 - std::fabs(2 * back - 1)) : 0;
}

// A Gaussian of this sigma by its response, for sigmas too small to be sampled. Weights fall off with the square of the
// distance, so that what the ends cut off is less than a thousandth.
cv::Mat GaussKernel(double sigma_px) {
  constexpr int kSteps = 512;  // over the frequencies to half a cycle a pixel
  const int reach = std::max(16, static_cast<int>(std::ceil(5 * sigma_px)));
  cv::Mat kernel(2 * reach + 1, 1, CV_32F);
  for (int n = -reach; n <= reach; ++n) {
    double sum = 0;
    for (int i = 0; i < kSteps; ++i) {
      const double f = (i + 0.5) / (2 * kSteps);
      sum += std::exp(-2 * CV_PI * CV_PI * sigma_px * sigma_px * f * f) * std::cos(2 * CV_PI * f * n);
    }
    kernel.at<float>(n + reach) = static_cast<float>(sum / kSteps);
  }
  return kernel / cv::sum(kernel)[0];
}

// What the measure reads on average of both edges, in units of Nyquist.
double ExpectedMtf50(CameraModel camera, double defocus_px, double edge_angle_deg) {
  camera.blur_px = std::hypot(camera.blur_px, defocus_px);
  const cv::Matx33d map = PhotoFromScene(camera, SfrChartBounds());
  const auto target = EdgeTarget(edge_angle_deg);
  const cv::Point2d middle(kChartSide / 2.0, kChartSide / 2.0);
  const double scale = cv::norm(Map(map, middle + cv::Point2d(1, 0)) - Map(map, middle));
  const int npix = static_cast<int>(kVerticalRegion.height * scale);
  double sum = 0;
  for (const int end : {1, 3}) {
    const cv::Point2d along = Map(map, target[end]) - Map(map, target[0]);
    const cv::Point2d normal(along.y, -along.x);
    const auto read = method_law::MeasuredMtf50([&](double f) { return LensResponse(camera, f, normal); }, npix);
    sum += (read.low + read.high) / 2;
  }
  return sum / 2;
}

double Middle(std::vector<double> values) {
  std::sort(values.begin(), values.end());
  const std::size_t half = values.size() / 2;
  return values.size() % 2 != 0 ? values[half] : (values[half - 1] + values[half]) / 2;
}

// The test's rule on what the law reads of each frame, neither noise nor coding in it. The moment is a frame's: a lens
// that settles between two frames is seen to have settled in the later one.
void Settle(const std::vector<double>& level, const FilmStyle& style, Film& film) {
  const int count = static_cast<int>(level.size());
  const double final_level = Middle({level.end() - (count + 4) / 5, level.end()});
  int settled = count;
  for (int i = count - 1; i >= 0; --i) {
    const double median = Middle({level.begin() + std::max(i - 2, 0), level.begin() + std::min(i + 3, count)});
    if (std::fabs(median - final_level) > kSettledWithin * final_level) break;
    settled = i;
  }
  film.truth["settle_time_ms"] = settled < count ? Json(TimeMs(style, film.kept[settled])) : Json();
  film.truth["final_mtf50_nyquist"] = final_level;
}

void FocusFilm(const SimulationOptions& options, const FilmStyle& style, Film& film) {
  SimulationOptions chart = options;
  chart.scene = "chart";
  const Simulation sharp = Simulate(chart);
  film.truth["chart"] = sharp.truth;
  film.truth["defocus_px"] = Json::array();
  std::vector<double> level;
  for (const int number : film.kept) {
    const double defocus = Defocus(style, TimeMs(style, number));
    film.truth["defocus_px"].push_back(defocus);
    level.push_back(ExpectedMtf50(options.camera, defocus, options.style.edge_angle_deg));
  }
  Settle(level, style, film);
  film.frame = [camera = options.camera, style, levels = sharp.levels[0]](int number) {
    const double sigma = Defocus(style, TimeMs(style, number));
    if (sigma < 0.05) return Shoot(camera, levels, number);  // adds nothing that could be seen
    cv::Mat blurred;
    const cv::Mat kernel = GaussKernel(sigma);
    cv::sepFilter2D(levels, blurred, CV_32F, kernel, kernel, {-1, -1}, 0, cv::BORDER_REPLICATE);
    return Shoot(camera, blurred, number);
  };
}

// ---- Flash

// A raised cosine: half its height at half its width from the peak.
double Pulse(const FilmStyle& style, double ms) {
  const double away = std::fabs(ms - style.pulse_at_ms) / style.pulse_ms;
  return away < 1 ? (1 + std::cos(CV_PI * away)) / 2 : 0;
}

void FlashFilm(const SimulationOptions& options, const FilmStyle& style, Film& film) {
  const cv::Mat lit = Expose(options.camera, Scene(), cv::Matx33d::eye());
  const double mean = cv::mean(cv::min(lit, 255))[0];
  film.truth["base"] = mean * style.base;
  film.truth["peak"] = mean;  // at its moment, which may lie between two frames
  film.truth["pulse_width_ms"] = style.pulse_ms;
  film.truth["pulse_at_ms"] = style.pulse_at_ms;
  film.frame = [camera = options.camera, style, lit](int number) {
    const double light = style.base + (1 - style.base) * Pulse(style, TimeMs(style, number));
    return Shoot(camera, lit * light, number);
  };
}

// ---- Turning chart

void ChartFilm(const SimulationOptions& options, const FilmStyle& style, Film& film) {
  const auto at = [options, style](int number) {
    SimulationOptions chart = options;
    chart.scene = "chart";
    chart.camera.turn_deg += style.turn_deg_s * TimeMs(style, number) / 1000;
    return chart;
  };
  film.truth["turn_deg"] = Json::array();
  film.truth["corner"] = Json::array();
  for (const int number : film.kept) {
    const CameraModel camera = at(number).camera;
    const cv::Point2d corner = Map(PhotoFromScene(camera, SfrChartBounds()), {0, 0});
    film.truth["turn_deg"].push_back(camera.turn_deg);
    film.truth["corner"].push_back({{"x", corner.x}, {"y", corner.y}});
  }
  film.frame = [at](int number) {
    const SimulationOptions chart = at(number);
    return Shoot(chart.camera, Simulate(chart).levels[0], number);
  };
}

struct FilmRow {
  const char* name;
  void (*make)(const SimulationOptions& options, const FilmStyle& style, Film& film);
};

constexpr FilmRow kFilms[] = {{"film-focus", FocusFilm}, {"film-flash", FlashFilm}, {"film-chart", ChartFilm}};

std::vector<int> KeptFrames(const FilmStyle& style) {
  for (const int lost : style.lost) {
    if (lost >= 1 && lost < style.frames - 1) continue;
    throw Failure(kWrongUsage, Format("--lost %d: only frames between the first and the last, 1 to %d, can be lost",
                                      lost, style.frames - 2));
  }
  std::vector<int> kept;
  for (int number = 0; number < style.frames; ++number) {
    if (std::find(style.lost.begin(), style.lost.end(), number) == style.lost.end()) kept.push_back(number);
  }
  return kept;
}

}  // namespace

const std::vector<std::string>& FilmScenes() {
  static const std::vector<std::string> names = [] {
    std::vector<std::string> all;
    for (const FilmRow& row : kFilms) all.emplace_back(row.name);
    return all;
  }();
  return names;
}

Film SimulateFilm(const SimulationOptions& options, const FilmStyle& style) {
  for (const FilmRow& row : kFilms) {
    if (options.scene != row.name) continue;
    Film film;
    film.kept = KeptFrames(style);
    film.truth = {{"schema", "qvtester-truth-1"}, {"scene", options.scene},    {"rate", style.rate},
                  {"frames", film.kept.size()},   {"lost_frames", style.lost}, {"time_ms", Json::array()}};
    for (const int number : film.kept) film.truth["time_ms"].push_back(TimeMs(style, number));
    row.make(options, style, film);
    return film;
  }
  throw Failure(kWrongUsage, "--scene " + options.scene + ": no film");
}

}  // namespace qv
