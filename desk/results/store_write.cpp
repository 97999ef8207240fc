#include <algorithm>
#include <cmath>
#include <set>

#include "desk/results/database.h"
#include "desk/results/inserts.h"
#include "desk/results/pack.h"
#include "qvtester/indices.h"

namespace qv {

namespace {

// Text that every database takes: valid UTF-8 without zeros.
std::string Clean(const std::string& text) {
  const bool plain = std::all_of(text.begin(), text.end(), [](char c) { return c > 0; });
  if (plain) return text;
  std::string valid = Json::parse(Json(text).dump(-1, ' ', false, Json::error_handler_t::replace)).get<std::string>();
  std::replace(valid.begin(), valid.end(), '\0', ' ');
  return valid;
}

// One input's hash; of several, theirs in order with blanks between.
std::string InputHash(const Json& record) {
  std::string hashes;
  for (const Json& input : MemberOf(record, "inputs")) {
    hashes += (hashes.empty() ? "" : " ") + TextAt(input, "sha256");
  }
  return hashes;
}

RunRow RowOf(const StoredRun& run) {
  const Json& record = run.record;
  const Json& phase = FirstOf(MemberOf(record, "phases"));
  const Json& metadata = MemberOf(record, "metadata");
  const Json& marginal = MemberOf(record, "marginal");
  RunRow row;
  row.key = run.key.empty() ? RunKey(record, run.filing) : run.key;
  row.unit = TextAt(record, "dut_id");
  row.station = TextAt(record, "station_id");
  row.operator_name = run.filing.operator_name;
  row.lot = run.filing.lot;
  row.plan = run.filing.plan;
  row.step = run.filing.step;
  row.measurement = TextAt(phase, "name");
  row.outcome = TextAt(record, "outcome");
  row.marginal = marginal.is_boolean() && marginal.get<bool>();
  row.result_code = static_cast<int>(WholeAt(phase, "result_code"));
  row.start_millis = WholeAt(record, "start_time_millis");
  row.end_millis = WholeAt(record, "end_time_millis");
  row.library_version = TextAt(metadata, "library_version");
  row.limits_name = TextAt(MemberOf(metadata, "limits"), "name");
  row.limits_revision = TextAt(MemberOf(metadata, "limits"), "revision");
  row.input_hash = InputHash(record);
  for (const std::string& doubt : DoubtsOf(record)) row.doubts += (row.doubts.empty() ? "" : " ") + doubt;
  for (std::string* text :
       {&row.key, &row.unit, &row.station, &row.operator_name, &row.lot, &row.plan, &row.step, &row.measurement,
        &row.outcome, &row.library_version, &row.limits_name, &row.limits_revision, &row.input_hash, &row.doubts}) {
    *text = Clean(*text);
  }
  return row;
}

// Everything that can be made before the database is held up.
struct Prepared {
  RunRow row;
  std::string record;
  std::vector<StoredFigure> figures;
  std::vector<std::pair<std::string, std::string>> columns;
  const std::vector<StoredPicture>* pictures;
};

Prepared Prepare(const StoredRun& run) {
  Prepared prepared = {
      RowOf(run), Pack(run.text.empty() ? TextOf(run.record) : run.text), FiguresOf(run.record), {}, &run.pictures};
  for (StoredFigure& figure : prepared.figures) {
    for (std::string* text : {&figure.name, &figure.unit, &figure.method, &figure.docstring, &figure.outcome}) {
      *text = Clean(*text);
    }
  }
  for (const auto& [name, value] : run.filing.columns) prepared.columns.emplace_back(Clean(name), Clean(value));
  return prepared;
}

using QuantityKey = std::tuple<std::string, std::string, std::string>;
QuantityKey KeyOf(const StoredFigure& figure) { return {figure.name, figure.unit, figure.method}; }

}  // namespace

Store::Database::Inserts::Inserts(soci::session& session)
    : add_run((session.prepare
                   << "INSERT INTO run (key, unit, station, operator, lot, plan, step, measurement, outcome,"
                      " marginal, result_code, start_millis, end_millis, library_version, limits_name,"
                      " limits_revision, input_hash, doubts, record) VALUES (:key, :unit, :station, :operator, :lot,"
                      " :plan, :step, :measurement, :outcome, :marginal, :code, :start, :end, :version,"
                      " :limits, :revision, :hash, :doubts, :record) ON CONFLICT (key) DO NOTHING",
               soci::use(run.key), soci::use(run.unit), soci::use(run.station), soci::use(run.operator_name),
               soci::use(run.lot), soci::use(run.plan), soci::use(run.step), soci::use(run.measurement),
               soci::use(run.outcome), soci::use(run_marginal), soci::use(run_code), soci::use(start), soci::use(end),
               soci::use(run.library_version), soci::use(run.limits_name), soci::use(run.limits_revision),
               soci::use(run.input_hash), soci::use(run.doubts), soci::use(record))),
      find_run((session.prepare << "SELECT id FROM run WHERE key = :key", soci::use(run.key), soci::into(id))),
      add_figure((session.prepare << "INSERT INTO figure (run, quantity, value, non_finite, uncertainty, outcome,"
                                     " marginal, min, max, marginal_min, marginal_max) VALUES (:run, :quantity, :value,"
                                     " :bad, :uncertainty, :outcome, :marginal, :min, :max, :mmin, :mmax)",
                  soci::use(id), soci::use(quantity), soci::use(value.value, value.indicator),
                  soci::use(non_finite, non_finite_indicator), soci::use(uncertainty.value, uncertainty.indicator),
                  soci::use(outcome), soci::use(marginal), soci::use(min.value, min.indicator),
                  soci::use(max.value, max.indicator), soci::use(marginal_min.value, marginal_min.indicator),
                  soci::use(marginal_max.value, marginal_max.indicator))),
      add_column((session.prepare << "INSERT INTO run_column (run, name, value) VALUES (:run, :name, :value)",
                  soci::use(id), soci::use(name), soci::use(text))),
      add_picture((session.prepare << "INSERT INTO picture (run, name, mimetype, content)"
                                      " VALUES (:run, :name, :type, :content)",
                   soci::use(id), soci::use(name), soci::use(mimetype), soci::use(text))) {}

namespace {

void AddFigure(Store::Database::Inserts& to, const StoredFigure& figure, long long quantity) {
  to.quantity = quantity;
  const bool finite = figure.value && std::isfinite(*figure.value);
  to.value.Set(finite ? figure.value : std::nullopt);
  to.non_finite_indicator = figure.value && !finite ? soci::i_ok : soci::i_null;
  to.non_finite = finite || !figure.value ? "" : std::isnan(*figure.value) ? "nan" : *figure.value > 0 ? "inf" : "-inf";
  to.uncertainty.Set(figure.uncertainty);
  to.outcome = figure.outcome;
  to.marginal = figure.marginal ? 1 : 0;
  to.min.Set(figure.bounds.min);
  to.max.Set(figure.bounds.max);
  to.marginal_min.Set(figure.bounds.marginal_min);
  to.marginal_max.Set(figure.bounds.marginal_max);
  to.add_figure.execute(true);
}

// Whether the row went in: not where its key is there. A run that an internal fault ended (the process that measured it
// was killed, say) tells nothing of the unit, and gives way to one that was measured.
bool AddRow(Store::Database::Inserts& to, soci::session& session) {
  to.add_run.execute(true);
  if (to.add_run.get_affected_rows() != 0) return true;
  if (to.run_code == QV_ERROR_INTERNAL) return false;
  long long fault = 0;
  int code = QV_ERROR_INTERNAL;
  session << "SELECT id FROM run WHERE key = :key AND result_code = :code", soci::use(to.run.key), soci::use(code),
      soci::into(fault);
  if (!session.got_data()) return false;
  for (const char* const rows : {"figure WHERE run", "run_column WHERE run", "picture WHERE run", "run WHERE id"}) {
    session << std::string("DELETE FROM ") + rows + " = :id", soci::use(fault);
  }
  to.add_run.execute(true);
  return to.add_run.get_affected_rows() != 0;
}

// Whether it was new.
bool AddRun(Store::Database& database, const Prepared& run) {
  Store::Database::Inserts& to = database.inserts();
  to.run = run.row;
  to.record = run.record;
  to.run_marginal = run.row.marginal ? 1 : 0;
  to.run_code = run.row.result_code;
  to.start = run.row.start_millis;
  to.end = run.row.end_millis;
  if (!AddRow(to, database.session())) return false;
  to.find_run.execute(true);
  for (const StoredFigure& figure : run.figures) AddFigure(to, figure, database.quantity_ids.at(KeyOf(figure)));
  for (const auto& [name, value] : run.columns) {
    to.name = name;
    to.text = value;
    to.add_column.execute(true);
  }
  for (const StoredPicture& picture : *run.pictures) {
    to.name = Clean(picture.name);
    to.mimetype = Clean(picture.mimetype);
    to.text = Base64(picture.content);
    to.add_picture.execute(true);
  }
  return true;
}

// What is measured for the first time gets its row, in a transaction of its own: rows that others wait for are held
// shortly, and always in the same order.
void AddQuantities(Store::Database& database, const std::vector<Prepared>& runs) {
  std::map<QuantityKey, std::string> missing;
  for (const Prepared& run : runs) {
    for (const StoredFigure& figure : run.figures) {
      if (database.quantity_ids.count(KeyOf(figure)) == 0) missing[KeyOf(figure)] = figure.docstring;
    }
  }
  if (missing.empty()) return;
  std::map<QuantityKey, std::int64_t> found;
  database.Begin();
  for (const auto& [key, docstring] : missing) {
    const auto& [name, unit, method] = key;
    long long id = 0;
    database.session() << "INSERT INTO quantity (name, unit, method, docstring) VALUES (:n, :u, :m, :d)"
                          " ON CONFLICT (name, unit, method) DO NOTHING",
        soci::use(name), soci::use(unit), soci::use(method), soci::use(docstring);
    database.session() << "SELECT id FROM quantity WHERE name = :n AND unit = :u AND method = :m", soci::use(name),
        soci::use(unit), soci::use(method), soci::into(id);
    found[key] = id;
  }
  database.Commit();
  database.quantity_ids.insert(found.begin(), found.end());
}

}  // namespace

std::size_t Store::Put(const std::vector<StoredRun>& runs) {
  std::vector<Prepared> prepared;
  prepared.reserve(runs.size());
  for (const StoredRun& run : runs) prepared.push_back(Prepare(run));
  std::size_t added = 0;
  database_->Persist([&] {
    AddQuantities(*database_, prepared);
    added = 0;
    database_->Begin();
    for (const Prepared& run : prepared) {
      added += AddRun(*database_, run) ? 1U : 0U;
    }
    database_->Commit();
  });
  return added;
}

}  // namespace qv
