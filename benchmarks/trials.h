#ifndef QVTESTER_BENCHMARKS_TRIALS_H_
#define QVTESTER_BENCHMARKS_TRIALS_H_

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "desk/simulation/simulation.h"

// What the accuracy tables share.

/// Runs trials on all cores; each writes only its own results.
void ForEachTrial(int trials, const std::function<void(int)>& run);

/// NaN is left out.
double Quantile(std::vector<double> values, double share);

double Mean(const std::vector<double>& values);

/// Percent.
double ShareBelow(const std::vector<double>& values, double limit);

/// What a table has found of a promised number (desk/measure/promises.h), printed as "promise NAME ...". With --check
/// the script takes each promise that no line keeps for broken.
void Hold(const char* promise, double measured);

/// Whether promises are held to.
bool IsChecking();

/// False when some promise held so far is broken.
bool AllKept();

/// `full` trials, or with --quick `few`.
int Trials(int full, int few);

/// Takes "--check" and "--quick" out of a program's words. Promises are printed with --check alone.
void TakeCheckOptions(std::vector<std::string>& words);

/// A scene as its options have it by default, but for these.
qv::SimulationOptions SceneOptions(const char* scene, cv::Size size, double noise_percent, std::uint64_t seed);

/// Depth of a spot so far from its middle, 0 to 1: a disc whose rim is smoothed over a pixel, or a Gaussian that is as
/// wide at half its depth.
double SpotDepth(double distance_px, double diameter_px, bool soft);

// Tables in files of their own.
void PrintRegistration();
void PrintLights();
void PrintPrints();

#endif  // QVTESTER_BENCHMARKS_TRIALS_H_
