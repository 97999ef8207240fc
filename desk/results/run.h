#ifndef QVTESTER_DESK_RESULTS_RUN_H_
#define QVTESTER_DESK_RESULTS_RUN_H_

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "desk/base/json.h"

// A run as it is kept: the record, and what it is filed under.

namespace qv {

/// What a run is filed under, beside what its record says.
struct Filing {
  std::string operator_name, lot, plan, step;
  std::map<std::string, std::string> columns;  // free ones, as a manifest brings them
};

struct StoredPicture {
  std::string name, mimetype, content;
};

struct StoredRun {  // NOLINT(bugprone-exception-escape): moving a JSON value throws nothing
  std::string key;  // of RunKey; empty: it is made when the run is stored
  Filing filing;
  Json record;
  std::vector<StoredPicture> pictures;
  std::string text = {};  // the record as TextOf writes it; empty: it is made when the run is stored
};

/// A record on one line, as it is kept.
std::string TextOf(const Json& record);

/// What makes a run one and the same: the unit, plan and step, the inputs' hashes (the path of an input without one),
/// the request without its inputs, limits and library version. Needs of the record only what is known before measuring:
/// "dut_id", "inputs", "request", "metadata"."limits" and "metadata"."library_version"; what is missing counts as
/// empty.
std::string RunKey(const Json& record, const Filing& filing);

/// What a figure must keep to, as its record has it.
struct Bounds {
  std::optional<double> min, max, marginal_min, marginal_max;
  bool operator==(const Bounds& other) const {
    return min == other.min && max == other.max && marginal_min == other.marginal_min &&
           marginal_max == other.marginal_max;
  }
};

/// One scalar of a record, or a list that was judged (which has no value here).
struct StoredFigure {
  std::string name, unit, method, docstring;
  std::optional<double> value;        // not finite where the measurement was not; none where nothing was measured
  std::optional<double> uncertainty;  // standard uncertainty, in the figure's unit
  std::string outcome;                // PASS, FAIL, MEASURED, UNSET
  bool marginal = false;
  Bounds bounds;
  std::string list, list_limits;  // in words, of a list: "24 values, 0.3 to 8.1; outside: 3, 7"
};

/// "0.4 to 2", "at least 0.4"; empty without bounds.
std::string BoundsText(const Bounds& bounds);

/// The figures of a record, in its order; throws Failure (wrong usage) where the record is none.
std::vector<StoredFigure> FiguresOf(const Json& record);

/// Names of what there is to doubt, accepted or not, in order. "?" stands for what nobody can accept: a run that can't
/// be judged, and a sentence without a name.
std::set<std::string> DoubtsOf(const Json& record);

/// Text of a record's member, or nothing.
std::string TextAt(const Json& object, const char* name);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_RUN_H_
