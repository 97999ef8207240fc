#ifndef QVTESTER_DESK_RESULTS_STORE_H_
#define QVTESTER_DESK_RESULTS_STORE_H_

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "desk/results/run.h"
#include "desk/results/selection.h"

// Where runs are kept: a SQLite file, or a PostgreSQL server that many stations share (docs/results.md).

namespace qv {

/// A run without its record: what lists and statistics need.
struct RunRow {
  std::int64_t id = 0;
  std::string key, unit, station, operator_name, lot, plan, step, measurement, outcome;
  bool marginal = false;
  int result_code = 0;
  std::int64_t start_millis = 0, end_millis = 0;
  std::string library_version, limits_name, limits_revision, input_hash;
  std::string doubts;  // of DoubtsOf, with blanks between
};

/// What is measured, in which unit, how: figures are compared only within one of these.
struct Quantity {
  std::int64_t id = 0;
  std::string name, unit, method, docstring;
};

/// A figure as the store has it. The value is NaN or infinite where the measurement was; `measured` is false where
/// nothing was.
struct FigureRow {
  std::int64_t run = 0, quantity = 0;
  double value = 0;
  bool measured = false;
  std::optional<double> uncertainty;
  std::string outcome;
  bool marginal = false;
  Bounds bounds;
};

/// How a store that is to be written is waited for: a server that is away, a file that is locked.
struct Patience {
  std::chrono::milliseconds longest = std::chrono::seconds(30);
  std::function<void(const std::string&)> told = {};  // in a sentence, when a wait begins
};

/// All calls throw Failure: wrong usage when the store can't be opened or is of a newer schema, or when a condition
/// names what no run has; internal fault when it is lost or full meanwhile. Text reaches the database as bound values
/// only. One object is for one thread, and is not carried over a fork.
class Store {
 public:
  enum class Use { kRead, kWrite };

  /// `name` is a file, made when it is to be written, or a postgresql:// address. A store of an older schema is
  /// migrated when it is to be written. A server that is away, or not ready yet, is waited for by those who write;
  /// one that refuses the address is not.
  Store(const std::string& name, Use use, Patience patience = {});
  ~Store();
  Store(const Store&) = delete;
  Store& operator=(const Store&) = delete;

  /// The name for people: an address without its password.
  const std::string& name() const;

  bool Holds(const std::string& key);
  /// Of all runs, or of those of one plan or measurement: what a batch need not measure again.
  std::vector<std::string> Keys(const Selection& selection = {});

  /// Stores these in one transaction, whole or not at all; those whose key is there are left as they are, but for runs
  /// that an internal fault ended (-99), which give way to one that was measured. Waits for a file that is locked or a
  /// server that is gone as long as its patience lasts, then throws. Answers how many went in.
  std::size_t Put(const std::vector<StoredRun>& runs);
  std::size_t Put(const StoredRun& run) { return Put(std::vector<StoredRun>{run}); }

  std::int64_t Count(const Selection& selection = {});
  /// In the order they were stored.
  void EachRow(const Selection& selection, const std::function<void(const RunRow&)>& visit);
  void EachRun(const Selection& selection, bool with_pictures,
               const std::function<void(const RunRow&, StoredRun&&)>& visit);
  /// In the order of runs; within a run by quantity.
  void EachFigure(const Selection& selection, const std::function<void(const FigureRow&)>& visit);
  std::vector<Quantity> Quantities();
  /// Names of the free columns, in their order.
  std::vector<std::string> ColumnNames();
  /// One column of every run that has it, in the order of runs: a text of the run's own ("unit", "operator") or a free
  /// one. Throws Failure (wrong usage) when no run has it.
  void EachValue(const std::string& column, const std::function<void(std::int64_t run, const std::string&)>& visit);

  class Database;

 private:
  std::unique_ptr<Database> database_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_STORE_H_
