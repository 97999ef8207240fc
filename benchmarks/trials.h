#ifndef QVTESTER_BENCHMARKS_TRIALS_H_
#define QVTESTER_BENCHMARKS_TRIALS_H_

#include <functional>
#include <vector>

// What the accuracy tables share.

/// Runs trials on all cores; each writes only its own results.
void ForEachTrial(int trials, const std::function<void(int)>& run);

/// NaN is left out.
double Quantile(std::vector<double> values, double share);

double Mean(const std::vector<double>& values);

/// Percent.
double ShareBelow(const std::vector<double>& values, double limit);

// Tables in files of their own.
void PrintRegistration();
void PrintLights();
void PrintPrints();

#endif  // QVTESTER_BENCHMARKS_TRIALS_H_
