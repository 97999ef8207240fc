#include "desk/results/archive.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <map>

#include "desk/base/text.h"
#include "desk/results/pack.h"

namespace qv {

namespace {

constexpr char kSchema[] = "qvtester-run-1";
constexpr std::size_t kRunsAtOnce = 200;

std::string LineOf(const StoredRun& run) {
  Json line = {{"schema", kSchema},
               {"key", run.key},
               {"operator", run.filing.operator_name},
               {"lot", run.filing.lot},
               {"plan", run.filing.plan},
               {"step", run.filing.step},
               {"columns", run.filing.columns},
               {"record", run.record},
               {"pictures", Json::array()}};
  for (const StoredPicture& picture : run.pictures) {
    line["pictures"].push_back(
        {{"name", picture.name}, {"mimetype", picture.mimetype}, {"content", Base64(picture.content)}});
  }
  return line.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n";
}

// A field of a table, quoted where RFC 4180 wants it.
std::string Field(const std::string& text) {
  if (text.find_first_of(",\"\r\n") == std::string::npos) return text;
  std::string quoted = "\"";
  for (const char c : text) quoted += c == '"' ? std::string("\"\"") : std::string(1, c);
  return quoted + "\"";
}

std::string CellOf(double value) {
  if (std::isnan(value)) return "nan";
  if (std::isinf(value)) return value > 0 ? "inf" : "-inf";
  return Format("%.17g", value);
}

// Of every run, as the table's head names them.
constexpr const char* kRunFields =
    "unit,station,operator,lot,plan,step,measurement,outcome,marginal,result_code,start,library_version,limits_name,"
    "limits_revision,key";

std::string FieldsOf(const RunRow& row) {
  std::string line = Field(row.unit);
  for (const std::string& text :
       {row.station, row.operator_name, row.lot, row.plan, row.step, row.measurement, row.outcome,
        std::string(row.marginal ? "1" : "0"), std::to_string(row.result_code), TimeText(row.start_millis),
        row.library_version, row.limits_name, row.limits_revision, row.key}) {
    line += "," + Field(text);
  }
  return line;
}

}  // namespace

void ExportLines(Store& store, const Selection& selection, bool with_pictures, const Sink& sink) {
  store.EachRun(selection, with_pictures, [&](const RunRow&, StoredRun&& run) { sink(LineOf(run)); });
}

void ExportTable(Store& store, const Selection& selection, const Sink& sink) {
  const std::vector<Quantity> quantities = store.Quantities();
  const std::vector<std::string> columns = store.ColumnNames();
  std::map<std::int64_t, std::size_t> place;  // of a quantity's field
  std::string head = kRunFields;
  for (const std::string& column : columns) head += "," + Field(column);
  for (const Quantity& quantity : quantities) {
    place.emplace(quantity.id, place.size());
    head += "," + Field(quantity.name + (quantity.unit == "1" ? "" : " [" + quantity.unit + "]"));
  }
  sink(head + "\r\n");

  std::map<std::int64_t, std::map<std::string, std::string>> free;
  for (const std::string& column : columns) {
    store.EachValue(column, [&](std::int64_t run, const std::string& value) { free[run][column] = value; });
  }
  std::vector<RunRow> rows;
  store.EachRow(selection, [&](const RunRow& row) { rows.push_back(row); });
  std::size_t next = 0;
  std::vector<std::string> fields(quantities.size());
  const auto flush = [&](std::int64_t until) {  // writes the runs before this one
    for (; next < rows.size() && rows[next].id < until; ++next) {
      const RunRow& row = rows[next];
      std::string line = FieldsOf(row);
      for (const std::string& column : columns) line += "," + Field(free[row.id][column]);
      for (std::string& field : fields) {
        line += "," + field;
        field.clear();
      }
      sink(line + "\r\n");
    }
  };
  store.EachFigure(selection, [&](const FigureRow& figure) {
    flush(figure.run);
    if (figure.measured) fields[place.at(figure.quantity)] = CellOf(figure.value);
  });
  flush(std::numeric_limits<std::int64_t>::max());
}

StoredRun ParseRun(const std::string& text, const std::string& file, long number) {
  StoredRun run;
  const Json line = ParseJson(text, file, std::max(number, 1L));
  const std::string where = number == 0 ? file : file + ": line " + std::to_string(number);
  const JsonView view(line, where);
  if (view.At("schema").Text() != kSchema) {
    run.record = line;
  } else {
    view.KnowOnly({"schema", "key", "operator", "lot", "plan", "step", "columns", "record", "pictures"});
    run.key = view.At("key").Text();
    run.filing = {
        view.At("operator").Text(), view.At("lot").Text(), view.At("plan").Text(), view.At("step").Text(), {}};
    for (const auto& [name, value] : view.At("columns").Members()) run.filing.columns[name] = value.Text();
    run.record = view.At("record").value();
    for (const JsonView& picture : view.At("pictures").Elements()) {
      run.pictures.push_back(
          {picture.At("name").Text(), picture.At("mimetype").Text(), FromBase64(picture.At("content").Text())});
    }
  }
  try {
    FiguresOf(run.record);
  } catch (const Failure& e) {
    throw Failure(kWrongUsage, where + ": " + e.what());
  }
  return run;
}

Imported ImportLines(std::istream& lines, const std::string& where, Store& store) {
  Imported result;
  std::vector<StoredRun> runs;
  const auto put = [&] {
    result.added += store.Put(runs);
    runs.clear();
  };
  std::string line;
  try {
    for (long number = 1; std::getline(lines, line); ++number) {
      if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
      runs.push_back(ParseRun(line, where, number));
      ++result.read;
      if (runs.size() == kRunsAtOnce) put();
    }
  } catch (const Failure&) {
    put();
    throw;
  }
  put();
  return result;
}

}  // namespace qv
