// How far registered points lie from where they are, by the test's own map, by that map refined, and by all matches.

#include <cmath>
#include <cstdio>
#include <string>

#include "benchmarks/pairs.h"
#include "benchmarks/trials.h"
#include "desk/measure/robust_map.h"
#include "qvtester/tester.h"

namespace {

using namespace qv;

PhotoPair DrawGrayPair(int trial) {
  cv::RNG random(trial + 1);
  SimulationOptions options = DrawPair(0.8, 3, trial + 1, random);
  options.second_gain = random.uniform(0.7, 1.3);
  PhotoPair pair = ShootPair(options);
  for (cv::Mat* photo : {&pair.reference, &pair.image}) cv::extractChannel(*photo, *photo, 0);
  return pair;
}

void PrintRow(const char* name, const std::vector<double>& errors) {
  std::printf("| %s | %.3f | %.1f %% | %.1f %% | %.1f %% | %.1f %% |\n", name, Quantile(errors, 0.5),
              ShareBelow(errors, 0.3), ShareBelow(errors, 1), ShareBelow(errors, 3), ShareBelow(errors, 10));
}

}  // namespace

void PrintRegistration() {
  const int kPairs = Trials(200, 20);
  std::vector<double> fixed(kPairs, 1e9);
  std::vector<double> refined(kPairs, 1e9);
  std::vector<double> robust(kPairs, 1e9);
  std::vector<std::string> doubts(kPairs);
  ForEachTrial(kPairs, [&](int trial) {
    const PhotoPair pair = DrawGrayPair(trial);
    QVTester tester;
    cv::Mat unwarped;
    if (tester.GetUnwarpedImage(pair.reference, pair.image, unwarped) == QV_SUCCESS) {
      cv::Mat map = tester.kept_->unwarp.matrix.clone();
      fixed[trial] = MapDistance(map, pair.truth, pair.reference.size());
      tester.RefineUnwarp(pair.reference, pair.image, map);
      refined[trial] = MapDistance(map, pair.truth, pair.reference.size());
    }
    const RobustMap map = FindRobustMap(tester, pair.reference, pair.image);
    if (!map.matrix.empty()) robust[trial] = MapDistance(map.matrix, pair.truth, pair.reference.size());
    doubts[trial] = map.doubt;
  });
  std::printf(
      "\nRegistration, %d pairs of 640 x 480: shift to 40 px, turn to 10 degrees, scale 0.9 to 1.1, gain 0.7 to 1.3, "
      "noise 3 %%\n\n| map | median grid error px | under 0.3 px | under 1 px | under 3 px | under 10 px "
      "|\n|---|---|---|---|---|---|\n",
      kPairs);
  PrintRow("three best matches (the test's)", fixed);
  PrintRow("the same, refined", refined);
  PrintRow("all matches", robust);
  int coarse = 0;
  int fine = 0;
  for (int i = 0; i < kPairs; ++i) {
    if (fixed[i] < 10) ++coarse;
    if (fixed[i] < 10 && refined[i] < 0.3) ++fine;
    if (robust[i] >= 0.3) std::printf("\nPair %d, all matches, %.2f px: %s\n", i + 1, robust[i], doubts[i].c_str());
  }
  Hold("registration_median", Quantile(fixed, 0.5));
  Hold("registration_near", ShareBelow(fixed, 10));
  Hold("robust_median", Quantile(robust, 0.5));
  Hold("robust_within", ShareBelow(robust, 0.3));
  Hold("refined_within", 100.0 * fine / coarse);
  std::printf("\nOf %d that the test's map brings within 10 px, %d end under 0.3 px when refined.\n", coarse, fine);
}
