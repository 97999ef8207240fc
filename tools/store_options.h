#ifndef QVTESTER_TOOLS_STORE_OPTIONS_H_
#define QVTESTER_TOOLS_STORE_OPTIONS_H_

#include <string>
#include <vector>

#include "desk/results/judge.h"
#include "desk/results/store.h"
#include "tools/options.h"

namespace qv {

/// What commands share that read a store.
struct StoreOptions {
  std::string store;
  std::vector<std::string> where;

  void DeclareOn(Options& command);
  Selection selection() const;
};

/// What commands share that write one.
struct WaitOption {
  double seconds = 30;

  void DeclareOn(Options& command);
  Patience patience() const;  // which tells of waiting on standard error
};

ArchiveLimits ReadArchiveLimits(const std::string& path);

/// "0.4213 ± 0.002 Nyquist", the uncertainty expanded by 2.
std::string ValueText(double value, const std::optional<double>& uncertainty, const std::string& unit);
/// "12 runs: 10 PASS, 2 FAIL; yield 83.3 %".
std::string TallyText(const Tally& tally, const std::string& what);

/// Lines of cells, each column as wide as its widest; a column of `right` is set to the right.
std::string Table(const std::vector<std::vector<std::string>>& lines, const std::vector<bool>& right);

}  // namespace qv

#endif  // QVTESTER_TOOLS_STORE_OPTIONS_H_
