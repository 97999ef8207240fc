#include <array>
#include <cmath>
#include <cstdlib>
#include <deque>
#include <limits>
#include <variant>

#include "desk/base/text.h"
#include "desk/results/database.h"
#include "desk/results/pack.h"

namespace qv {

namespace {

enum class Kind { kText, kWhole, kTime };

struct RunColumn {
  const char* name;    // in a condition
  const char* column;  // of table run
  Kind kind;
};

constexpr RunColumn kRunColumns[] = {
    {"unit", "r.unit", Kind::kText},
    {"station", "r.station", Kind::kText},
    {"operator", "r.operator", Kind::kText},
    {"lot", "r.lot", Kind::kText},
    {"plan", "r.plan", Kind::kText},
    {"step", "r.step", Kind::kText},
    {"measurement", "r.measurement", Kind::kText},
    {"outcome", "r.outcome", Kind::kText},
    {"marginal", "r.marginal", Kind::kWhole},
    {"result_code", "r.result_code", Kind::kWhole},
    {"time", "r.start_millis", Kind::kTime},
    {"library_version", "r.library_version", Kind::kText},
    {"limits_name", "r.limits_name", Kind::kText},
    {"limits_revision", "r.limits_revision", Kind::kText},
    {"input_hash", "r.input_hash", Kind::kText},
    {"doubts", "r.doubts", Kind::kText},
    {"key", "r.key", Kind::kText},
};

double NumberOf(const Condition& condition) {
  char* end = nullptr;
  const double number = std::strtod(condition.value.c_str(), &end);
  if (condition.value.empty() || *end != '\0' || !std::isfinite(number)) {
    throw Failure(kWrongUsage, condition.name + ": \"" + condition.value + "\" is no number to compare with");
  }
  return number;
}

bool HasColumn(soci::session& session, const std::string& name) {
  int found = 0;
  session << "SELECT count(*) FROM (SELECT 1 AS one FROM run_column WHERE name = :n LIMIT 1) t", soci::use(name),
      soci::into(found);
  return found > 0;
}

[[noreturn]] void NoSuchColumn(soci::session& session, const std::string& name) {
  std::string known;
  std::vector<std::string> names;
  for (const RunColumn& column : kRunColumns) {
    known += std::string(known.empty() ? "" : ", ") + column.name;
    names.emplace_back(column.name);
  }
  const soci::rowset<std::string> others =
      (session.prepare << "SELECT name FROM quantity UNION SELECT name FROM run_column");
  names.insert(names.end(), others.begin(), others.end());
  throw Failure(kWrongUsage, "no run has a column or a figure named \"" + name + "\"; every run has " + known +
                                 DidYouMean(name, names));
}

// Conditions as SQL; every word of the caller's is bound. (The comparison is one of six that ParseCondition lets pass.)
class Where {
 public:
  Where(soci::session& session, const Selection& selection) {
    for (const Condition& condition : selection) Add(session, condition);
  }

  const std::string& sql() const { return sql_; }
  bool empty() const { return sql_.empty(); }

  void BindTo(soci::statement& statement) {
    for (std::size_t i = 0; i < values_.size(); ++i) {
      std::visit([&](auto& value) { statement.exchange(soci::use(value, Name(i))); }, values_[i]);
    }
  }

 private:
  using Value = std::variant<std::string, double, long long>;

  static std::string Name(std::size_t i) { return "w" + std::to_string(i); }

  std::string Bind(Value value) {
    values_.push_back(std::move(value));
    return ":" + Name(values_.size() - 1);
  }

  static std::string Comparison(const Condition& condition) {
    for (const char* const known : {"=", "!=", "<", "<=", ">", ">="}) {
      if (condition.comparison == known) return std::string(" ") + known + " ";
    }
    throw Failure(kWrongUsage, "\"" + condition.comparison + "\" is no comparison");
  }

  void Add(soci::session& session, const Condition& condition) {
    const std::string comparison = Comparison(condition);
    for (const RunColumn& column : kRunColumns) {
      if (condition.name != column.name) continue;
      const Value value = column.kind == Kind::kText   ? Value(condition.value)
                          : column.kind == Kind::kTime ? Value(static_cast<long long>(ParseTime(condition.value)))
                                                       : Value(static_cast<long long>(NumberOf(condition)));
      sql_ += std::string(" AND ") + column.column + comparison + Bind(value);
      return;
    }
    int found = 0;
    session << "SELECT count(*) FROM quantity WHERE name = :n", soci::use(condition.name), soci::into(found);
    if (found > 0) {
      const std::string name = Bind(condition.name);
      sql_ +=
          " AND EXISTS (SELECT 1 FROM figure f JOIN quantity q ON q.id = f.quantity WHERE f.run = r.id"
          " AND q.name = " +
          name + " AND f.value" + comparison + Bind(NumberOf(condition)) + ")";
      return;
    }
    if (!HasColumn(session, condition.name)) NoSuchColumn(session, condition.name);
    const std::string name = Bind(condition.name);
    sql_ += " AND EXISTS (SELECT 1 FROM run_column c WHERE c.run = r.id AND c.name = " + name + " AND c.value" +
            comparison + Bind(condition.value) + ")";
  }

  std::string sql_;
  std::deque<Value> values_;  // stays where it is while bound
};

// A statement whose results come row by row.
class Query {
 public:
  explicit Query(soci::session& session) : statement_(session) {}
  template <typename T>
  Query& Into(T& value) {
    statement_.exchange(soci::into(value));
    return *this;
  }
  template <typename T>
  Query& Into(T& value, soci::indicator& indicator) {
    statement_.exchange(soci::into(value, indicator));
    return *this;
  }
  Query& Bind(long long& value, const char* name) {
    statement_.exchange(soci::use(value, name));
    return *this;
  }
  void Run(const std::string& sql, Where& where, const std::function<void()>& visit) {
    where.BindTo(statement_);
    statement_.alloc();
    statement_.prepare(sql);
    statement_.define_and_bind();
    statement_.execute();
    while (statement_.fetch()) visit();
  }

 private:
  soci::statement statement_;
};

constexpr char kRowColumns[] =
    "r.id, r.key, r.unit, r.station, r.operator, r.lot, r.plan, r.step, r.measurement, r.outcome, r.marginal,"
    " r.result_code, r.start_millis, r.end_millis, r.library_version, r.limits_name, r.limits_revision, r.input_hash, "
    "r.doubts";

// Where a row's columns land.
struct RowBuffer {
  RunRow row;
  long long id = 0, start = 0, end = 0;
  int marginal = 0;

  void Into(Query& query) {
    query.Into(id);
    for (std::string* text : {&row.key, &row.unit, &row.station, &row.operator_name, &row.lot, &row.plan, &row.step,
                              &row.measurement, &row.outcome}) {
      query.Into(*text);
    }
    query.Into(marginal).Into(row.result_code).Into(start).Into(end);
    for (std::string* text :
         {&row.library_version, &row.limits_name, &row.limits_revision, &row.input_hash, &row.doubts}) {
      query.Into(*text);
    }
  }
  const RunRow& Filled() {
    row.id = id;
    row.marginal = marginal != 0;
    row.start_millis = start;
    row.end_millis = end;
    return row;
  }
};

// A server's answer is held whole: it is asked for in parts.
constexpr long long kRunsARead = 500, kFigureRunsAtOnce = 20000;

double NonFinite(const std::string& name) {
  const double infinity = std::numeric_limits<double>::infinity();
  return name == "inf" ? infinity : name == "-inf" ? -infinity : std::numeric_limits<double>::quiet_NaN();
}

// One figure's columns as they land.
struct FigureBuffer {
  long long run = 0, quantity = 0;
  int marginal = 0;
  double value = 0;
  std::string non_finite, outcome;
  soci::indicator value_there = soci::i_null, non_finite_there = soci::i_null;
  std::array<double, 5> numbers = {};
  std::array<soci::indicator, 5> there = {};

  void Into(Query& query) {
    query.Into(run).Into(quantity).Into(value, value_there).Into(non_finite, non_finite_there).Into(outcome);
    query.Into(marginal);
    for (std::size_t i = 0; i < numbers.size(); ++i) query.Into(numbers[i], there[i]);
  }
  void Fill(FigureRow& row) const {
    const auto number = [&](std::size_t i) {
      return there[i] == soci::i_ok ? std::optional<double>(numbers[i]) : std::nullopt;
    };
    const bool bad = non_finite_there == soci::i_ok;
    row.run = run;
    row.quantity = quantity;
    row.measured = value_there == soci::i_ok || bad;
    row.value = value_there == soci::i_ok ? value : NonFinite(non_finite);
    row.outcome = outcome;
    row.marginal = marginal != 0;
    row.uncertainty = number(0);
    row.bounds = {number(1), number(2), number(3), number(4)};
  }
};

}  // namespace

Store::Store(const std::string& name, Use use, Patience patience)
    : database_(std::make_unique<Database>(name, use, std::move(patience))) {}
Store::~Store() = default;

const std::string& Store::name() const { return database_->shown(); }

bool Store::Holds(const std::string& key) {
  int found = 0;
  database_->Read(
      [&] { database_->session() << "SELECT count(*) FROM run WHERE key = :key", soci::use(key), soci::into(found); });
  return found != 0;
}

std::vector<std::string> Store::Keys(const Selection& selection) {
  std::vector<std::string> keys;
  database_->Read([&] {
    Where where(database_->session(), selection);
    std::string key;
    Query(database_->session()).Into(key).Run("SELECT r.key FROM run r WHERE 1 = 1" + where.sql(), where, [&] {
      keys.push_back(key);
    });
  });
  return keys;
}

std::int64_t Store::Count(const Selection& selection) {
  long long count = 0;
  database_->Read([&] {
    Where where(database_->session(), selection);
    Query(database_->session()).Into(count).Run("SELECT count(*) FROM run r WHERE 1 = 1" + where.sql(), where, [] {});
  });
  return count;
}

void Store::EachRow(const Selection& selection, const std::function<void(const RunRow&)>& visit) {
  database_->Read([&] {
    Where where(database_->session(), selection);
    RowBuffer buffer;
    Query query(database_->session());
    buffer.Into(query);
    query.Run(std::string("SELECT ") + kRowColumns + " FROM run r WHERE 1 = 1" + where.sql() + " ORDER BY r.id", where,
              [&] { visit(buffer.Filled()); });
  });
}

void Store::EachRun(const Selection& selection, bool with_pictures,
                    const std::function<void(const RunRow&, StoredRun&&)>& visit) {
  struct Packed {
    RunRow row;
    std::string record;
  };
  const auto part = [&](long long after) {
    std::vector<Packed> found;
    Where where(database_->session(), selection);
    RowBuffer buffer;
    std::string record;
    Query query(database_->session());
    buffer.Into(query);
    query.Into(record).Bind(after, "after");
    query.Run(std::string("SELECT ") + kRowColumns + ", r.record FROM run r WHERE r.id > :after" + where.sql() +
                  " ORDER BY r.id LIMIT " + std::to_string(kRunsARead),
              where, [&] {
                found.push_back({buffer.Filled(), record});
              });
    return found;
  };
  database_->Read([&] {
    soci::session& session = database_->session();
    long long id = 0;
    std::string name;
    std::string text;
    std::string mimetype;
    soci::statement columns = (session.prepare << "SELECT name, value FROM run_column WHERE run = :id", soci::use(id),
                               soci::into(name), soci::into(text));
    soci::statement pictures =
        (session.prepare << "SELECT name, mimetype, content FROM picture WHERE run = :id ORDER BY name", soci::use(id),
         soci::into(name), soci::into(mimetype), soci::into(text));
    for (std::vector<Packed> found = part(0); !found.empty(); found = part(id)) {
      for (const Packed& packed : found) {
        id = packed.row.id;
        const RunRow& row = packed.row;
        StoredRun run = {
            row.key, {row.operator_name, row.lot, row.plan, row.step, {}}, Json::parse(Unpack(packed.record)), {}};
        columns.execute();
        while (columns.fetch()) run.filing.columns[name] = text;
        if (with_pictures) pictures.execute();
        while (with_pictures && pictures.fetch()) run.pictures.push_back({name, mimetype, FromBase64(text)});
        visit(row, std::move(run));
      }
    }
  });
}

void Store::EachFigure(const Selection& selection, const std::function<void(const FigureRow&)>& visit) {
  database_->Read([&] {
    long long last = 0;
    soci::indicator none = soci::i_ok;
    database_->session() << "SELECT max(id) FROM run", soci::into(last, none);
    for (long long after = 0; none == soci::i_ok && after < last; after += kFigureRunsAtOnce) {
      Where where(database_->session(), selection);
      FigureBuffer buffer;
      FigureRow row;
      Query query(database_->session());
      buffer.Into(query);
      long long until = after + kFigureRunsAtOnce;
      query.Bind(after, "after").Bind(until, "until");
      query.Run(
          std::string("SELECT f.run, f.quantity, f.value, f.non_finite, f.outcome, f.marginal, f.uncertainty, f.min,"
                      " f.max, f.marginal_min, f.marginal_max FROM figure f") +
              (where.empty() ? "" : " JOIN run r ON r.id = f.run") + " WHERE f.run > :after AND f.run <= :until" +
              where.sql() + " ORDER BY f.run, f.quantity",
          where, [&] {
            buffer.Fill(row);
            visit(row);
          });
    }
  });
}

std::vector<Quantity> Store::Quantities() {
  std::vector<Quantity> quantities;
  database_->Read([&] {
    long long id = 0;
    Quantity row;
    Where all(database_->session(), {});
    Query(database_->session())
        .Into(id)
        .Into(row.name)
        .Into(row.unit)
        .Into(row.method)
        .Into(row.docstring)
        .Run("SELECT id, name, unit, method, docstring FROM quantity ORDER BY id", all, [&] {
          row.id = id;
          quantities.push_back(row);
        });
  });
  return quantities;
}

std::vector<std::string> Store::ColumnNames() {
  std::vector<std::string> names;
  database_->Read([&] {
    std::string name;
    Where all(database_->session(), {});
    Query(database_->session()).Into(name).Run("SELECT DISTINCT name FROM run_column ORDER BY name", all, [&] {
      names.push_back(name);
    });
  });
  return names;
}

void Store::EachValue(const std::string& column,
                      const std::function<void(std::int64_t run, const std::string&)>& visit) {
  database_->Read([&] {
    long long run = 0;
    std::string value;
    soci::session& session = database_->session();
    for (const RunColumn& own : kRunColumns) {
      if (column != own.name || own.kind != Kind::kText) continue;
      Where all(session, {});
      Query(session).Into(run).Into(value).Run(std::string("SELECT r.id, ") + own.column + " FROM run r ORDER BY r.id",
                                               all, [&] { visit(run, value); });
      return;
    }
    if (!HasColumn(session, column)) NoSuchColumn(session, column);
    soci::statement statement = (session.prepare << "SELECT run, value FROM run_column WHERE name = :n ORDER BY run",
                                 soci::use(column), soci::into(run), soci::into(value));
    statement.execute();
    while (statement.fetch()) visit(run, value);
  });
}

}  // namespace qv
