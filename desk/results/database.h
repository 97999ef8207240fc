#ifndef QVTESTER_DESK_RESULTS_DATABASE_H_
#define QVTESTER_DESK_RESULTS_DATABASE_H_

#include <soci/soci.h>

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <tuple>

#include "desk/base/failure.h"
#include "desk/results/store.h"

// A session with whichever database it is; only this file and its source know which.

namespace qv {

class Store::Database {
 public:
  /// Opens or makes the store, and migrates it when it is to be written.
  Database(const std::string& name, Use use, Patience patience);
  ~Database();
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;

  soci::session& session() { return *session_; }
  const std::string& shown() const { return shown_; }

  /// Starts a transaction that writes, and waits for others that do. Ended by Commit, or taken back by Rollback.
  void Begin();
  void Commit();
  void Rollback() noexcept;

  /// Does this again, on a new session where the server was lost, until it works or the patience is at its end.
  void Persist(const std::function<void()>& work);

  /// Runs what reads; what the database says against it becomes a Failure.
  template <typename Work>
  void Read(Work&& work) {
    try {
      work();
    } catch (const soci::soci_error& e) {
      Lost(e);
    }
  }

  struct Inserts;
  /// Made on the present session when first asked for.
  Inserts& inserts();

  std::map<std::tuple<std::string, std::string, std::string>, std::int64_t> quantity_ids;  // by name, unit, method

 private:
  class Wait;

  void Open(Use use);
  void Connect();
  void Migrate(Use use);
  int FoundVersion();
  bool WorthAnotherTry(const soci::soci_error& e) noexcept;
  [[noreturn]] void Lost(const std::exception& e) const;

  std::string name_, shown_;
  Patience patience_;
  bool server_ = false;
  std::unique_ptr<soci::session> session_;
  std::unique_ptr<Inserts> inserts_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_DATABASE_H_
