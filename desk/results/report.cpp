#include "desk/results/report.h"

#include <algorithm>
#include <cmath>

#include "desk/base/clock.h"
#include "desk/base/text.h"
#include "desk/results/pack.h"
#include "desk/results/report_page.h"
#include "desk/results/svg_plot.h"

namespace qv {

namespace {

constexpr std::size_t kCurvePoints = 101;
constexpr double kCurveScale = 10000;     // curves are kept as whole ten-thousandths
constexpr std::size_t kMostCurves = 300;  // drawn one by one; more become bands

Json NumberOrWord(const std::optional<double>& value) {
  if (!value) return nullptr;
  if (std::isnan(*value)) return "nan";
  if (std::isinf(*value)) return *value > 0 ? "inf" : "-inf";
  return *value;
}

Json ToJson(const Bounds& bounds) {
  Json json = Json::object();
  const auto add = [&](const char* name, const std::optional<double>& bound) {
    if (bound) json[name] = *bound;
  };
  add("min", bounds.min);
  add("max", bounds.max);
  add("marginal_min", bounds.marginal_min);
  add("marginal_max", bounds.marginal_max);
  return json;
}

// The curve at 0, 0.01, ... 1 by straight lines between its points; NaN beyond its ends or where it has a gap.
std::vector<double> OnCommonAxis(const std::vector<std::pair<double, double>>& points) {
  std::vector<double> values(kCurvePoints, NAN);
  std::size_t next = 0;
  for (std::size_t i = 0; i < kCurvePoints; ++i) {
    const double x = static_cast<double>(i) / (kCurvePoints - 1);
    while (next < points.size() && points[next].first < x) ++next;
    if (next == points.size()) break;
    if (points[next].first == x) {
      values[i] = points[next].second;
    } else if (next > 0) {
      const auto& [x0, y0] = points[next - 1];
      const auto& [x1, y1] = points[next];
      values[i] = y0 + (y1 - y0) * (x - x0) / (x1 - x0);
    }
  }
  return values;
}

std::string LimitsName(const Json& record) {
  const Json& limits = MemberOf(MemberOf(record, "metadata"), "limits");
  const std::string name = TextAt(limits, "name");
  return name.empty() ? "" : name + " revision " + TextAt(limits, "revision");
}

// A reading and what it must keep to, for people.
std::string ReadingWords(const StoredFigure& figure) {
  const std::string value = !figure.list.empty() ? figure.list
                            : figure.value       ? Format("%.6g %s", *figure.value, figure.unit.c_str())
                                                 : "not measured";
  return figure.name + ": " + value + ", limit " +
         (figure.list_limits.empty() ? BoundsText(figure.bounds) : figure.list_limits);
}

std::string Xml(const std::string& text) {
  std::string safe;
  for (const char c : text) {
    switch (c) {
      case '<': safe += "&lt;"; break;
      case '>': safe += "&gt;"; break;
      case '&': safe += "&amp;"; break;
      case '"': safe += "&quot;"; break;
      default: safe += static_cast<unsigned char>(c) < 32 ? ' ' : c;
    }
  }
  return safe;
}

}  // namespace

std::size_t Report::Column::Place(const std::string& text) {
  const auto [found, made] = places.try_emplace(text, values.size());
  if (made) values.push_back(text);
  return found->second;
}

void Report::Add(const StoredRun& run) {
  const Json& record = run.record;
  const std::string measurement = TextAt(FirstOf(MemberOf(record, "phases")), "name");
  const std::string step = run.filing.step.empty() ? measurement : run.filing.step;
  const std::string outcome = TextAt(record, "outcome");
  const Json& marginal = MemberOf(record, "marginal");
  const std::size_t place = units_.size();
  const std::int64_t start = WholeAt(record, "start_time_millis");
  units_.push_back(TextAt(record, "dut_id"));
  starts_.push_back(start);
  marginal_.push_back(marginal.is_boolean() && marginal.get<bool>());
  station_.Add(TextAt(record, "station_id"));
  operator_.Add(run.filing.operator_name);
  lot_.Add(run.filing.lot);
  step_.Add(step);
  measurement_.Add(measurement);
  outcome_.Add(outcome);
  version_.Add(TextAt(MemberOf(record, "metadata"), "library_version"));
  limits_.Add(LimitsName(record));
  cases_.push_back({static_cast<double>(WholeAt(record, "end_time_millis") - start) / 1000, "", ""});
  AddFigures(place, step, record);
  AddWords(place, run, outcome != "PASS" && outcome != "MEASURED");
  for (const auto& [name, value] : run.filing.columns) {
    Column& column = columns_[name];
    column.index.resize(place, column.Place(""));
    column.Add(value);
  }
}

void Report::AddFigures(std::size_t run, const std::string& step, const Json& record) {
  for (const StoredFigure& figure : FiguresOf(record)) {
    const auto [at, made] = figure_places_.try_emplace(
        step + '\n' + figure.name + '\n' + figure.unit + '\n' + figure.method, figures_.size());
    if (made) figures_.emplace_back(FigureColumn{figure, step, {}, {}, {}, {}, {}, {}, {}, {}, {}});
    FigureColumn& column = figures_[at->second];
    const auto bound = std::find(column.bounds.begin(), column.bounds.end(), figure.bounds);
    column.bound.push_back(static_cast<std::size_t>(bound - column.bounds.begin()));
    if (bound == column.bounds.end()) column.bounds.push_back(figure.bounds);
    column.run.push_back(run);
    column.value.push_back(figure.value);
    column.uncertainty.push_back(figure.uncertainty);
    column.outcome.push_back(figure.outcome);
    column.marginal.push_back(figure.marginal);
    if (!figure.list.empty() || !figure.list_limits.empty()) {
      column.list[run] = figure.list;
      column.list_limits[run] = figure.list_limits;
    }
    if (figure.outcome != "FAIL" && figure.outcome != "UNSET") continue;
    (figure.outcome == "FAIL" ? cases_[run].failure : cases_[run].error) += ReadingWords(figure) + "\n";
  }
  for (const Json& phase : MemberOf(record, "phases")) {
    const Json& measurements = MemberOf(phase, "measurements");
    if (!measurements.is_object()) continue;
    for (const auto& [name, m] : measurements.items()) AddCurve(run, step, name, m);
  }
}

void Report::AddCurve(std::size_t run, const std::string& step, const std::string& name, const Json& measurement) {
  const Json& dimensions = MemberOf(measurement, "dimensions");
  const Json& value = MemberOf(measurement, "measured_value");
  if (!dimensions.is_array() || dimensions.empty() || TextAt(dimensions[0], "suffix") != "Nyquist" ||
      !value.is_array()) {
    return;
  }
  std::vector<std::pair<double, double>> points;
  for (const Json& point : value) {
    if (!point.is_array() || point.size() < 2 || !point[0].is_number()) continue;
    points.emplace_back(point[0].get<double>(), point[1].is_number() ? point[1].get<double>() : NAN);
  }
  const auto [at, made] = curve_places_.try_emplace(step + '\n' + name, curves_.size());
  if (made) curves_.push_back({name, step, TextAt(measurement, "docstring"), {}, {}});
  curves_[at->second].run.push_back(run);
  curves_[at->second].points.push_back(OnCommonAxis(points));
}

void Report::AddWords(std::size_t run, const StoredRun& source, bool failed) {
  Json sentences = Json::array();
  for (const Json& detail : MemberOf(source.record, "outcome_details")) {
    sentences.push_back(TextAt(detail, "description"));
    if (TextAt(source.record, "outcome") == "ERROR") cases_[run].error += TextAt(detail, "description") + "\n";
  }
  details_.push_back(std::move(sentences));
  Json inputs = Json::array();
  for (const Json& input : MemberOf(source.record, "inputs")) inputs.push_back(TextAt(input, "path"));
  inputs_.push_back(std::move(inputs));
  Json log = Json::array();
  for (const Json& line : MemberOf(source.record, "log_records")) log.push_back(TextAt(line, "message"));
  logs_.push_back(std::move(log));
  if (pictures_ == Pictures::kNone || (pictures_ == Pictures::kFailures && !failed)) return;
  for (const StoredPicture& picture : source.pictures) {
    const bool safe = picture.mimetype == "image/png" || picture.mimetype == "image/jpeg";
    if (!safe) continue;
    shown_pictures_.push_back({{"run", run},
                               {"name", picture.name},
                               {"source", "data:" + picture.mimetype + ";base64," + Base64(picture.content)}});
  }
}

Json Report::FiguresJson() const {
  Json figures = Json::array();
  for (const FigureColumn& f : figures_) {
    Json figure = {{"name", f.about.name},
                   {"step", f.step},
                   {"unit", f.about.unit},
                   {"method", f.about.method},
                   {"docstring", f.about.docstring},
                   {"bounds", Json::array()},
                   {"run", f.run},
                   {"bound", f.bound},
                   {"value", Json::array()},
                   {"uncertainty", Json::array()},
                   {"outcome", f.outcome},
                   {"marginal", f.marginal}};
    for (const Bounds& bounds : f.bounds) figure["bounds"].push_back(ToJson(bounds));
    for (const auto& value : f.value) figure["value"].push_back(NumberOrWord(value));
    for (const auto& uncertainty : f.uncertainty) figure["uncertainty"].push_back(NumberOrWord(uncertainty));
    for (const auto& [run, words] : f.list) figure["list"][std::to_string(run)] = words;
    for (const auto& [run, words] : f.list_limits) figure["list_limits"][std::to_string(run)] = words;
    figures.push_back(std::move(figure));
  }
  return figures;
}

Json Report::CurvesJson() const {
  Json curves = Json::array();
  for (const CurveColumn& c : curves_) {
    Json curve = {{"name", c.name},       {"step", c.step}, {"docstring", c.docstring},
                  {"scale", kCurveScale}, {"run", c.run},   {"points", Json::array()}};
    for (const std::vector<double>& points : c.points) {
      Json row = Json::array();
      for (const double value : points)
        row.push_back(std::isfinite(value) ? Json(std::lround(value * kCurveScale)) : Json());
      curve["points"].push_back(std::move(row));
    }
    curves.push_back(std::move(curve));
  }
  return curves;
}

Json Report::Data() const {
  const auto column = [](const Column& c) { return Json{{"values", c.values}, {"index", c.index}}; };
  Json data = {{"schema", "qvtester-report-1"},
               {"title", title_},
               {"made_millis", MillisSinceEpoch()},
               {"unit", units_},
               {"start_millis", starts_},
               {"marginal", marginal_},
               {"station", column(station_)},
               {"operator", column(operator_)},
               {"lot", column(lot_)},
               {"step", column(step_)},
               {"measurement", column(measurement_)},
               {"outcome", column(outcome_)},
               {"library_version", column(version_)},
               {"limits", column(limits_)},
               {"columns", Json::object()},
               {"figures", FiguresJson()},
               {"curves", CurvesJson()},
               {"details", details_},
               {"inputs", inputs_},
               {"logs", logs_},
               {"pictures", shown_pictures_}};
  for (const auto& [name, values] : columns_) {
    Column whole = values;
    whole.index.resize(units_.size(), whole.Place(""));
    data["columns"][name] = column(whole);
  }
  return data;
}

std::string Report::Html() const {
  const std::string page = ReportPage();
  const std::string mark = "<!--data-->";  // the page holds it once; what stands there is Base64, never HTML
  const std::size_t at = page.find(mark);
  return page.substr(0, at) + Pack(Data().dump(-1, ' ', false, Json::error_handler_t::replace), Effort::kSmall) +
         page.substr(at + mark.size());
}

std::string Report::JUnit() const {
  std::size_t failures = 0;
  std::size_t errors = 0;
  double seconds = 0;
  std::string cases;
  for (std::size_t i = 0; i < units_.size(); ++i) {
    const std::string& outcome = outcome_.values[outcome_.index[i]];
    const std::string& step = step_.values[step_.index[i]];
    seconds += cases_[i].seconds;
    cases += Format(R"(  <testcase classname="%s" name="%s" time="%.3f")", Xml(step).c_str(), Xml(units_[i]).c_str(),
                    cases_[i].seconds);
    const bool failed = outcome == "FAIL";
    const bool error = outcome != "PASS" && outcome != "MEASURED" && !failed;
    failures += failed ? 1U : 0U;
    errors += error ? 1U : 0U;
    const std::string why = failed ? cases_[i].failure : cases_[i].error;
    const std::string message = why.substr(0, why.find('\n'));
    const char* const tag = failed ? "failure" : "error";
    cases += failed || error ? std::string("><") + tag + " type=\"" + Xml(outcome) + "\" message=\"" + Xml(message) +
                                   "\">" + Xml(why) + "</" + tag + "></testcase>\n"
                             : "/>\n";
  }
  return Format(
             "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<testsuite name=\"%s\" tests=\"%zu\" failures=\"%zu\" "
             "errors=\"%zu\" time=\"%.3f\">\n",
             Xml(title_).c_str(), units_.size(), failures, errors, seconds) +
         cases + "</testsuite>\n";
}

namespace {

// The share below which so many of the values lie, between neighbours by straight lines.
double Quantile(std::vector<double>& values, double share) {
  std::sort(values.begin(), values.end());
  const double at = share * static_cast<double>(values.size() - 1);
  const auto low = static_cast<std::size_t>(at);
  const std::size_t high = std::min(low + 1, values.size() - 1);
  return values[low] + (values[high] - values[low]) * (at - static_cast<double>(low));
}

std::vector<SvgSeries> CurvesOf(const std::vector<std::vector<double>>& curves) {
  std::vector<SvgSeries> series;
  const auto x = [](std::size_t i) { return static_cast<double>(i) / (kCurvePoints - 1); };
  if (curves.size() <= kMostCurves) {
    for (const std::vector<double>& curve : curves) {
      SvgSeries& one = series.emplace_back();
      for (std::size_t i = 0; i < kCurvePoints; ++i) one.points.emplace_back(x(i), curve[i]);
    }
    return series;
  }
  const std::vector<std::pair<const char*, double>> shares = {
      {"5 %", 0.05}, {"25 %", 0.25}, {"median", 0.5}, {"75 %", 0.75}, {"95 %", 0.95}};
  for (const auto& [name, share] : shares) {
    SvgSeries& band = series.emplace_back();
    band.name = name;
    band.style = share == 0.5 ? 0 : share == 0.05 || share == 0.95 ? 2 : 1;
    for (std::size_t i = 0; i < kCurvePoints; ++i) {
      std::vector<double> column;
      for (const std::vector<double>& curve : curves) {
        if (std::isfinite(curve[i])) column.push_back(curve[i]);
      }
      if (!column.empty()) band.points.emplace_back(x(i), Quantile(column, share));
    }
  }
  return series;
}

}  // namespace

std::string Report::Plot() const {
  std::vector<SvgPanel> panels;
  for (const CurveColumn& curve : curves_) {
    panels.push_back({curve.step + ": " + curve.name, "frequency [Nyquist]", "response", CurvesOf(curve.points), {}});
  }
  for (const FigureColumn& figure : figures_) {
    std::vector<double> values;
    for (const auto& value : figure.value) {
      if (value && std::isfinite(*value)) values.push_back(*value);
    }
    const Bounds& bounds = figure.bounds.back();
    if (values.size() < 2 || (!bounds.min && !bounds.max)) continue;
    const auto [low, high] = std::minmax_element(values.begin(), values.end());
    const auto bins =
        static_cast<std::size_t>(std::min(60.0, std::ceil(2 * std::cbrt(static_cast<double>(values.size())))));
    const double width = *high > *low ? (*high - *low) / static_cast<double>(bins) : 1;
    SvgSeries bars = {"", {}, 0, true};
    for (std::size_t i = 0; i < bins; ++i) bars.points.emplace_back(*low + (static_cast<double>(i) + 0.5) * width, 0);
    for (const double value : values) {
      ++bars.points[std::min(bins - 1, static_cast<std::size_t>((value - *low) / width))].second;
    }
    SvgPanel panel = {
        figure.step + ": " + figure.about.name, figure.about.unit == "1" ? "" : figure.about.unit, "runs", {bars}, {}};
    if (bounds.min) panel.lines.emplace_back(*bounds.min, Format("min %.6g", *bounds.min));
    if (bounds.max) panel.lines.emplace_back(*bounds.max, Format("max %.6g", *bounds.max));
    panels.push_back(std::move(panel));
  }
  return SvgDocument(panels);
}

}  // namespace qv
