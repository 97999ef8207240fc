#include "desk/results/schema.h"

namespace qv {

namespace {

const std::vector<std::string> kTables = {
    R"(CREATE TABLE run (id {id}, key text NOT NULL UNIQUE, unit text NOT NULL, station text NOT NULL,
        operator text NOT NULL, lot text NOT NULL, plan text NOT NULL, step text NOT NULL, measurement text
        NOT NULL, outcome text NOT NULL, marginal integer NOT NULL, result_code integer NOT NULL,
        start_millis bigint NOT NULL, end_millis bigint NOT NULL, library_version text NOT NULL, limits_name
        text NOT NULL, limits_revision text NOT NULL, input_hash text NOT NULL, doubts text
        NOT NULL, record text NOT NULL))",
    R"(CREATE TABLE run_column (run bigint NOT NULL REFERENCES run (id), name text NOT NULL, value text NOT
        NULL, PRIMARY KEY (run, name)))",
    R"(CREATE TABLE quantity (id {id}, name text NOT NULL, unit text NOT NULL, method text NOT NULL,
        docstring text NOT NULL, UNIQUE (name, unit, method)))",
    R"(CREATE TABLE figure (run bigint NOT NULL REFERENCES run (id), quantity bigint NOT NULL REFERENCES
        quantity (id), value double precision, non_finite text, uncertainty double precision, outcome text
        NOT NULL, marginal integer NOT NULL, min double precision, max double precision, marginal_min double
        precision, marginal_max double precision, PRIMARY KEY (run, quantity)))",
    R"(CREATE TABLE picture (run bigint NOT NULL REFERENCES run (id), name text NOT NULL, mimetype text NOT
        NULL, content text NOT NULL, PRIMARY KEY (run, name)))"};

// What people and dashboards ask for.
const std::vector<std::string> kIndicesAndViews = {
    "CREATE INDEX run_unit ON run (unit)", "CREATE INDEX run_lot ON run (lot)",
    "CREATE INDEX run_start ON run (start_millis)",
    R"(CREATE VIEW figures AS SELECT r.unit, r.station, r.operator, r.lot, r.plan, r.step, r.measurement,
        r.start_millis, r.outcome AS run_outcome, q.name, f.value, f.non_finite, f.uncertainty, q.unit AS
        value_unit, f.outcome, f.marginal, f.min, f.max, f.marginal_min, f.marginal_max, q.method, r.key
        FROM figure f JOIN run r ON r.id = f.run JOIN quantity q ON q.id = f.quantity)"};

}  // namespace

const std::vector<std::vector<std::string>>& SchemaSteps() {
  static const std::vector<std::vector<std::string>> steps = {kTables, kIndicesAndViews};
  return steps;
}

}  // namespace qv
