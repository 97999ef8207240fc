#ifndef QVTESTER_BENCHMARKS_RATIOS_H_
#define QVTESTER_BENCHMARKS_RATIOS_H_

#include <initializer_list>
#include <string>
#include <vector>

// The table that a run ends with: each operation's time beside that of its plain form, floor or peer.

/// A row of the table: the median CPU time of one benchmark over the sum of others', beside its target.
struct RatioRow {
  std::string row;
  std::string subject;                  // a benchmark's name
  std::vector<std::string> yardsticks;  // other benchmarks' names
  double target;                        // of the ratio, at most
};

/// Rows are printed in the order in which they were added. A row whose benchmarks were not all run is left out.
void AddRatio(RatioRow row);

/// The rows of one file: `const Ratios kRatios = {{"row", "subject", {"yardstick"}, 0.5}, ...};`
struct Ratios {
  Ratios(std::initializer_list<RatioRow> rows) {
    for (const RatioRow& row : rows) AddRatio(row);
  }
};

#endif  // QVTESTER_BENCHMARKS_RATIOS_H_
