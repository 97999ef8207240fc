#ifndef QVTESTER_DESK_RESULTS_STUDY_H_
#define QVTESTER_DESK_RESULTS_STUDY_H_

#include <map>
#include <string>
#include <vector>

#include "desk/results/statistics.h"
#include "desk/results/store.h"

namespace qv {

/// One figure over the selected runs. Runs that ended in ERROR or were stopped enter nothing: their figures are not to
/// be trusted.
struct FigureStudy {
  std::string step;
  Quantity quantity;
  Moments moments;
  Bounds bounds;             // of the limits given, else of the latest run
  bool bounds_vary = false;  // runs were judged by other limits than the latest
  Capability capability;
  std::vector<std::int64_t> runs;        // of each reading, when readings are kept
  std::vector<UncertainValue> readings;  // what is not finite among them
};

struct Study {
  std::int64_t runs = 0, left_out = 0;  // those that ended in ERROR or were stopped
  std::vector<FigureStudy> figures;     // by step, then in the order in which figures were first stored
};

/// Studies the figures whose name holds one of `names` (all without any). `limits`, by name, stand in for the stored
/// ones. `keep` keeps readings.
Study StudyFigures(Store& store, const Selection& selection, const std::vector<std::string>& names,
                   const std::map<std::string, Bounds>& limits, bool keep);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_STUDY_H_
