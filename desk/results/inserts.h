#ifndef QVTESTER_DESK_RESULTS_INSERTS_H_
#define QVTESTER_DESK_RESULTS_INSERTS_H_

#include <soci/soci.h>

#include <string>

#include "desk/results/database.h"

namespace qv {

/// The statements that store a run, prepared once a session; members are what they bind.
struct Store::Database::Inserts {
  explicit Inserts(soci::session& session);

  /// A bound value that may be null.
  struct Number {
    double value = 0;
    soci::indicator indicator = soci::i_null;
    void Set(const std::optional<double>& number) {
      value = number.value_or(0);
      indicator = number ? soci::i_ok : soci::i_null;
    }
  };

  RunRow run;
  std::string record;
  int run_marginal = 0, run_code = 0;
  long long id = 0, start = 0, end = 0;

  long long quantity = 0;
  Number value, uncertainty, min, max, marginal_min, marginal_max;
  std::string non_finite, outcome;
  soci::indicator non_finite_indicator = soci::i_null;
  int marginal = 0;

  std::string name, text, mimetype;

  soci::statement add_run, find_run, add_figure, add_column, add_picture;
};

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_INSERTS_H_
