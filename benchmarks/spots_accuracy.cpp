// Which spots are found: by size, contrast, softness, noise and shading; and how many that are none.
//   spots_accuracy [--check [--quick]]     --check: exit status 1 where a promise is broken

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstdio>
#include <opencv2/imgproc.hpp>
#include <string>
#include <vector>

#include "benchmarks/trials.h"
#include "desk/measure/spots.h"

namespace qv {
namespace {

constexpr double kLight = 200;  // level in the middle

struct SpotSetting {
  double noise;    // of 255, or of the light where it is 255
  double shading;  // at the corners
};
constexpr SpotSetting kSpotSettings[] = {{0.005, 0}, {0.005, 0.5}, {0.01, 0}, {0.01, 0.5}, {0.03, 0}, {0.03, 0.5}};
constexpr double kDiameters[] = {3, 6, 12, 40, 100, 300};
constexpr double kTimesNoise[] = {9, 12, 20};  // contrast times the root of the pixels, over the noise

cv::Mat Plain(cv::Size size, double shading) {
  cv::Mat light(size, CV_32F);
  const cv::Point2d middle(size.width / 2.0, size.height / 2.0);
  for (int y = 0; y < size.height; ++y) {
    for (int x = 0; x < size.width; ++x) {
      const cv::Point2d off = cv::Point2d(x, y) - middle;
      light.at<float>(y, x) = static_cast<float>(kLight * (1 - shading * off.dot(off) / middle.dot(middle)));
    }
  }
  return light;
}

// Sharp: a disc, its rim smoothed over a pixel; soft: a Gaussian as wide at half its depth.
void AddSpot(cv::Mat& light, cv::Point2d at, double diameter, double contrast, bool soft) {
  const int reach = cvCeil(soft ? 1.5 * diameter : diameter / 2 + 2);
  const cv::Rect box = cv::Rect(cv::Point(at) - cv::Point(reach, reach), cv::Size(2 * reach + 1, 2 * reach + 1)) &
                       cv::Rect({}, light.size());
  for (int y = box.y; y < box.br().y; ++y) {
    for (int x = box.x; x < box.br().x; ++x) {
      const double depth = SpotDepth(cv::norm(cv::Point2d(x, y) - at), diameter, soft);
      light.at<float>(y, x) *= static_cast<float>(1 - contrast * depth);
    }
  }
}

cv::Mat Sensed(const cv::Mat& light, double noise, int seed) {
  cv::Mat levels(light.size(), CV_32F);
  cv::RNG random(seed);
  random.fill(levels, cv::RNG::NORMAL, 0, 255 * noise);
  levels += light;
  levels.convertTo(levels, CV_8U);
  return levels;
}

struct Count {
  int spots = 0, found = 0, false_ones = 0, photos = 0;
  double contrast_error = 0, diameter_error = 0;  // sums of relative errors
};

Count Try(const SpotSetting& setting, double diameter, double times, bool soft, int photos) {
  Count count;
  const bool large = diameter > 100;
  if (large && Trials(1, 0) == 0) return count;
  const cv::Size size = large ? cv::Size(4000, 3000) : cv::Size(1600, 1200);
  for (int i = 0; i < (large ? std::max(photos / 2, 1) : photos); ++i, ++count.photos) {
    cv::RNG random(i + 1);
    cv::Mat light = Plain(size, setting.shading);
    std::vector<cv::Point2d> places;
    const double contrast = times * setting.noise * 255 / kLight / (diameter / 2 * std::sqrt(CV_PI));
    if (contrast > 0.9) return count;
    for (const cv::Point2d share : {cv::Point2d(0.3, 0.3), {0.7, 0.3}, {0.3, 0.7}, {0.7, 0.7}}) {
      places.emplace_back(size.width * share.x + random.uniform(-1.0, 1.0),
                          size.height * share.y + random.uniform(-1.0, 1.0));
      const double local = light.at<float>(cv::Point(places.back())) / kLight;  // the noise is of the same levels
      AddSpot(light, places.back(), diameter, std::min(contrast / local, 0.95), soft);
    }
    std::vector<bool> seen(places.size(), false);
    for (const Spot& spot : FindSpots(Sensed(light, setting.noise, i + 1)).spots) {
      std::size_t k = 0;
      while (k < places.size() && (seen[k] || cv::norm(spot.centre - places[k]) > std::max(3.0, diameter / 2))) ++k;
      if (k == places.size()) {
        ++count.false_ones;
        continue;
      }
      seen[k] = true;
      ++count.found;
      count.contrast_error += spot.contrast / contrast - 1;
      count.diameter_error += spot.diameter_px() / diameter - 1;
    }
    count.spots += static_cast<int>(places.size());
  }
  return count;
}

struct Totals {
  Count nine, all;
};

void PrintRow(const SpotSetting& setting, bool soft, int photos, Totals& totals) {
  std::vector<Count> counts(std::size(kDiameters) * std::size(kTimesNoise));
  cv::parallel_for_(cv::Range(0, static_cast<int>(counts.size())), [&](const cv::Range& range) {
    for (int i = range.start; i < range.end; ++i)
      counts[i] = Try(setting, kDiameters[i / 3], kTimesNoise[i % 3], soft, photos);
  });
  std::printf("| %g %% | %.0f %% | %s |", 100 * setting.noise, 100 * setting.shading, soft ? "soft" : "sharp");
  for (std::size_t i = 0; i < counts.size(); ++i) {
    const Count& c = counts[i];
    std::printf("%s %s", i % 3 == 0 && i > 0 ? " |" : "",
                c.spots == 0 ? "-" : std::to_string(100 * c.found / c.spots).c_str());
    for (Count* total : {&totals.all, i % 3 == 0 ? &totals.nine : nullptr}) {
      if (total == nullptr) continue;
      total->spots += c.spots;
      total->found += c.found;
      total->false_ones += c.false_ones;
      total->photos += c.photos;
    }
  }
  std::printf(" |\n");
  std::fflush(stdout);
}

int FalseOnes(cv::Size size, int photos) {
  std::atomic<int> count = 0;
  cv::parallel_for_(cv::Range(0, photos), [&](const cv::Range& range) {
    for (int i = range.start; i < range.end; ++i) {
      const SpotSetting& setting = kSpotSettings[i % std::size(kSpotSettings)];
      count += static_cast<int>(FindSpots(Sensed(Plain(size, setting.shading), setting.noise, i + 1)).spots.size());
    }
  });
  return count;
}

void PrintSpots() {
  std::printf(
      "Dark spots found, percent; in each cell for contrast times the root of the pixels 9, 12 and 20 times the "
      "noise\n\n| noise | shading | spots |");
  for (const double diameter : kDiameters) std::printf(" %g px |", diameter);
  std::printf("\n|---|---|---|---|---|---|---|---|---|\n");
  Totals totals;
  for (const SpotSetting& setting : kSpotSettings) {
    for (const bool soft : {false, true}) PrintRow(setting, soft, Trials(10, 1), totals);
  }
  const int photos = Trials(60, 2);
  const int false_ones = FalseOnes({4000, 3000}, photos);
  const double share = static_cast<double>(totals.nine.found) / totals.nine.spots;
  std::printf(
      "\nAt nine times the noise %.1f %% of %d are found. False spots: %d in %d photos with spots, %d in %d of 12 "
      "megapixels without.\n",
      100 * share, totals.nine.spots, totals.all.false_ones, totals.all.photos, false_ones, photos);
  Hold("spots_found", 100 * share);
  Hold("spots_false", std::max(1.0 * totals.all.false_ones / totals.all.photos, 1.0 * false_ones / photos));
}

}  // namespace
}  // namespace qv

int main(int count, char** arguments) {
  std::vector<std::string> words(arguments + 1, arguments + count);
  TakeCheckOptions(words);
  qv::PrintSpots();
  return AllKept() ? 0 : 1;
}
