#include <algorithm>
#include <cmath>
#include <iostream>
#include <memory>
#include <unordered_map>

#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/results/study.h"
#include "desk/results/svg_plot.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

struct StudyOptions {
  StoreOptions store;
  std::vector<std::string> figures;
  std::string limits, parts, operators, labels, output, plot;
  double propose = 0;
};

using Columns = std::unordered_map<std::int64_t, std::string>;

Columns ReadColumn(Store& store, const std::string& name) {
  Columns values;
  store.EachValue(name, [&](std::int64_t run, const std::string& value) { values[run] = value; });
  return values;
}

std::string Number(double value) { return std::isfinite(value) ? Format("%.6g", value) : "-"; }

std::string IntervalText(const std::optional<Interval>& interval) {
  return interval ? Format("%.2f (%.2f to %.2f)", interval->value, interval->low, interval->high) : "-";
}

std::string TitleOf(const FigureStudy& figure) {
  const std::string step = figure.step.empty() ? "" : Printable(figure.step) + ": ";
  return step + figure.quantity.name + (figure.quantity.unit == "1" ? "" : " [" + figure.quantity.unit + "]");
}

std::string Overview(const Study& study) {
  std::vector<std::vector<std::string>> lines = {
      {"figure", "count", "mean", "deviation", "min", "max", "limits", "Cp (95 %)", "Cpk (95 %)"}};
  std::string notes;
  for (const FigureStudy& figure : study.figures) {
    const Moments& m = figure.moments;
    const bool any = m.count() > 0;
    lines.push_back({TitleOf(figure), std::to_string(m.count()), any ? Number(m.mean()) : "-", Number(m.deviation()),
                     any ? Number(m.min()) : "-", any ? Number(m.max()) : "-", BoundsText(figure.bounds),
                     IntervalText(figure.capability.cp), IntervalText(figure.capability.cpk)});
    if (m.not_finite() > 0) {
      notes += TitleOf(figure) + ": " + Count(static_cast<std::size_t>(m.not_finite()), "reading") +
               " not finite, counted nowhere above\n";
    }
    if (figure.bounds_vary)
      notes += TitleOf(figure) + ": the limits changed among these runs; those of the latest count\n";
  }
  return Table(lines, {false, true, true, true, true, true, false, true, true}) + notes;
}

std::string GaugeText(const FigureStudy& figure, const GaugeStudy& gauge) {
  std::vector<std::vector<std::string>> lines = {{"  source", "df", "mean square", "F", "p"}};
  const auto row = [&](const char* name, const VarianceRow& r, bool tested) {
    lines.push_back({std::string("  ") + name, std::to_string(r.degrees), Number(r.mean_square),
                     tested ? Format("%.4g", r.f) : "", tested ? Format("%.3g", r.p) : ""});
  };
  row("part", gauge.part, true);
  row("operator", gauge.operators_row, true);
  row("part x operator", gauge.interaction, true);
  row("repeatability", gauge.repeatability, false);
  std::vector<std::vector<std::string>> parts = {{"  component", "deviation", "% of total", "% of variance"}};
  for (const GaugeComponent* c :
       {&gauge.equipment, &gauge.appraiser, &gauge.interaction_part, &gauge.gauge, &gauge.part_to_part, &gauge.all}) {
    parts.push_back({std::string("  ") + c->name, Number(c->deviation), Format("%.1f", c->percent_of_total),
                     Format("%.2f", c->percent_contribution)});
  }
  std::string text = TitleOf(figure) +
                     Format(": %d parts, %d operators, %d trials", gauge.parts, gauge.operators, gauge.trials) +
                     (gauge.pooled ? "; the interaction is pooled with repeatability\n" : "\n");
  text += Table(lines, {false, true, true, true, true}) + Table(parts, {false, true, true, true});
  text += Format("  %%GRR %.1f, distinct categories %d", gauge.gauge.percent_of_total, gauge.distinct_categories);
  if (std::isfinite(gauge.percent_of_tolerance))
    text += Format(", %.1f %% of the tolerance", gauge.percent_of_tolerance);
  return text + "\n";
}

void StudyGauges(const Study& study, const Columns& parts, const Columns& operators) {
  std::size_t studied = 0;
  std::string refused;
  for (const FigureStudy& figure : study.figures) {
    std::vector<GaugeReading> readings;
    for (std::size_t i = 0; i < figure.runs.size(); ++i) {
      const auto part = parts.find(figure.runs[i]);
      const auto who = operators.find(figure.runs[i]);
      if (part == parts.end() || who == operators.end()) continue;
      readings.push_back({part->second, who->second, figure.readings[i].value});
    }
    try {
      std::cout << "\n" << GaugeText(figure, StudyGauge(readings, figure.bounds));
      ++studied;
    } catch (const Failure& e) {
      refused += TitleOf(figure) + ": " + e.what() + "\n";
    }
  }
  if (studied == 0) throw Failure(kWrongUsage, refused.substr(0, refused.find('\n')));
  std::cerr << refused;
}

void Propose(const Study& study, double cpk, const std::string& output) {
  Json limits = Json::object();
  std::vector<std::vector<std::string>> lines = {{"figure", "proposed", "yield", "false accepts", "false rejects"}};
  for (const FigureStudy& figure : study.figures) {
    if (!(figure.moments.deviation() > 0)) continue;
    const Bounds bounds = ProposeBounds(figure.moments, cpk, figure.bounds);
    const LimitsEffect effect = EffectOf(figure.readings, bounds);
    const auto share = [](const std::optional<double>& s) {
      return s ? Format("%.3g %%", 100 * *s) : std::string("?");
    };
    lines.push_back({TitleOf(figure), BoundsText(bounds), Format("%.2f %%", 100 * effect.yield),
                     share(effect.false_accepts), share(effect.false_rejects)});
    Json& limit = limits[figure.quantity.name];
    if (bounds.min) limit["min"] = *bounds.min;
    if (bounds.max) limit["max"] = *bounds.max;
    limit["unit"] = figure.quantity.unit;
  }
  std::cout << "\n"
            << Format("limits at a Cpk of %g (?: readings without uncertainty)\n", cpk)
            << Table(lines, {false, false, true, true, true});
  if (output.empty()) return;
  const Json file = {{"name", "proposed"}, {"revision", Format("Cpk %g", cpk)}, {"limits", limits}};
  WriteOutput(output, file.dump(2, ' ', false, Json::error_handler_t::replace) + "\n");
}

std::int64_t Wrong(const LimitTrial& trial) { return trial.escapes + trial.false_rejects; }

// The first of those with the fewest wrong verdicts.
const LimitTrial& Best(const LabelStudy& labels) {
  return *std::min_element(labels.trials.begin(), labels.trials.end(),
                           [](const LimitTrial& a, const LimitTrial& b) { return Wrong(a) < Wrong(b); });
}

// Shares change at the readings only: a minimum's just above each, a maximum's at it.
SvgPanel PanelOf(const FigureStudy& figure, const LabelStudy& labels) {
  SvgPanel panel;
  panel.title = TitleOf(figure);
  panel.x_label = std::string(labels.low_is_bad ? "minimum" : "maximum") + " [" + figure.quantity.unit + "]";
  panel.y_label = "share of bad accepted, of good rejected";
  SvgSeries escapes = {"escapes", {}, 0};
  SvgSeries rejects = {"false rejects", {}, 1};
  for (const LimitTrial& trial : labels.trials) {
    for (const auto& [series, count, all] :
         {std::tuple(&escapes, trial.escapes, labels.bad), {&rejects, trial.false_rejects, labels.good}}) {
      const double share = static_cast<double>(count) / static_cast<double>(all);
      if (!series->points.empty()) {
        const auto [limit, before] = series->points.back();
        series->points.emplace_back(labels.low_is_bad ? limit : trial.limit, labels.low_is_bad ? share : before);
      }
      series->points.emplace_back(trial.limit, share);
    }
  }
  panel.series = {escapes, rejects};
  panel.lines = {{Best(labels).limit, Format("fewest of both: %.4g", Best(labels).limit)}};
  return panel;
}

// The limits worth knowing: the loosest without an escape, the tightest without a false reject, and the one with the
// fewest of both.
std::string LabelText(const FigureStudy& figure, const LabelStudy& labels) {
  std::string text = TitleOf(figure) + Format(": %lld good, %lld bad; a bad unit reads %s with probability %.3f\n",
                                              static_cast<long long>(labels.good), static_cast<long long>(labels.bad),
                                              labels.low_is_bad ? "lower" : "higher", labels.area);
  const auto show = [&](const char* what, const LimitTrial* trial) {
    if (trial == nullptr) {
      text += Format("  %-22s none\n", what);
      return;
    }
    text += Format("  %-22s %s %.6g: %lld escapes, %lld false rejects\n", what, labels.low_is_bad ? "min" : "max",
                   trial->limit, static_cast<long long>(trial->escapes), static_cast<long long>(trial->false_rejects));
  };
  const LimitTrial* no_escape = nullptr;
  const LimitTrial* no_reject = nullptr;
  for (const LimitTrial& trial : labels.trials) {
    if (trial.escapes == 0 && (no_escape == nullptr || trial.false_rejects < no_escape->false_rejects))
      no_escape = &trial;
    if (trial.false_rejects == 0 && (no_reject == nullptr || trial.escapes < no_reject->escapes)) no_reject = &trial;
  }
  show("without an escape", no_escape);
  show("without a false reject", no_reject);
  show("fewest of both", labels.trials.empty() ? nullptr : &Best(labels));
  return text;
}

void StudyLabelled(const Study& study, const Columns& labels, const std::string& plot) {
  std::vector<SvgPanel> panels;
  for (const FigureStudy& figure : study.figures) {
    std::vector<double> good;
    std::vector<double> bad;
    for (std::size_t i = 0; i < figure.runs.size(); ++i) {
      const auto label = labels.find(figure.runs[i]);
      if (label == labels.end()) continue;
      if (label->second != "good" && label->second != "bad") {
        throw Failure(kWrongUsage, R"(a label is "good" or "bad", not ")" + Printable(label->second) + "\"");
      }
      (label->second == "good" ? good : bad).push_back(figure.readings[i].value);
    }
    try {
      const LabelStudy result = StudyLabels(good, bad);
      std::cout << "\n" << LabelText(figure, result);
      panels.push_back(PanelOf(figure, result));
    } catch (const Failure& e) {
      std::cerr << TitleOf(figure) << ": " << e.what() << "\n";
    }
  }
  if (panels.empty()) throw Failure(kWrongUsage, "no figure has both good and bad units");
  if (!plot.empty()) WriteOutput(plot, SvgDocument(panels));
}

// The whole words that a name holds, one after another: "a_b" holds "a", "b" and "a_b".
void AddParts(const std::string& name, std::vector<std::string>& parts) {
  std::vector<std::size_t> begins = {0};
  for (std::size_t at = name.find('_'); at != std::string::npos; at = name.find('_', at + 1)) begins.push_back(at + 1);
  begins.push_back(name.size() + 1);
  for (std::size_t i = 0; i < begins.size(); ++i) {
    for (std::size_t k = i + 1; k < begins.size(); ++k) {
      parts.push_back(name.substr(begins[i], begins[k] - 1 - begins[i]));
    }
  }
}

// A name that no stored figure's holds would drop out of the table without a word.
void RefuseUnknown(Store& store, const std::vector<std::string>& asked) {
  const std::vector<Quantity> quantities = store.Quantities();
  for (const std::string& part : asked) {
    const bool held = std::any_of(quantities.begin(), quantities.end(), [&](const Quantity& quantity) {
      return quantity.name.find(part) != std::string::npos;
    });
    if (held) continue;
    std::vector<std::string> known;
    for (const Quantity& quantity : quantities) AddParts(quantity.name, known);
    throw Failure(kWrongUsage, "--figure " + Printable(part) + ": " + store.name() +
                                   " has no figure whose name holds it" + DidYouMean(part, known));
  }
}

int RunStudy(const StudyOptions& options) {
  if (options.parts.empty() != options.operators.empty()) {
    throw Failure(kWrongUsage, "--parts and --operators belong together: give both");
  }
  if (!options.plot.empty() && options.labels.empty())
    throw Failure(kWrongUsage, "--plot draws what --labels finds: give both");
  if (!options.output.empty() && options.propose <= 0)
    throw Failure(kWrongUsage, "-o takes the limits of --propose: give both");
  if (!options.plot.empty() && options.plot != "-" && LowerExtension(options.plot) != ".svg") {
    throw Failure(kWrongUsage, Printable(options.plot) + ": the plot is an SVG: name a .svg file");
  }
  CheckOutputs({{"the store", options.store.store}, {"the limits", options.limits}},
               {{"the proposed limits", options.output}, {"the plot", options.plot}});
  Store store(options.store.store, Store::Use::kRead);
  RefuseUnknown(store, options.figures);
  const std::map<std::string, Bounds> limits =
      options.limits.empty() ? std::map<std::string, Bounds>() : ReadArchiveLimits(options.limits).by_name;
  const bool keep = !options.parts.empty() || !options.labels.empty() || options.propose > 0;
  const Study study = StudyFigures(store, options.store.selection(), options.figures, limits, keep);
  if (study.figures.empty()) throw Failure(kWrongUsage, store.name() + ": no figure to study among these runs");
  std::cout << Count(static_cast<std::size_t>(study.runs), "run");
  if (study.left_out > 0) std::cout << "; " << study.left_out << " that ended in ERROR are left out";
  std::cout << "\n" << Overview(study);
  if (!options.parts.empty()) {
    StudyGauges(study, ReadColumn(store, options.parts), ReadColumn(store, options.operators));
  }
  if (!options.labels.empty()) StudyLabelled(study, ReadColumn(store, options.labels), options.plot);
  if (options.propose > 0) Propose(study, options.propose, options.output);
  return kExitWithinLimits;
}

}  // namespace

CommandBody DeclareStudy(Options& command) {
  auto options = std::make_shared<StudyOptions>();
  options->store.DeclareOn(command);
  command.Texts("--figure", options->figures, "Only figures whose name holds this; may be given again", "NAME");
  command.Text("--limits", options->limits, "Limits for Cp and Cpk in place of the stored ones", "FILE");
  command.Text("--parts", options->parts, "Gauge study: the column that names the part", "COLUMN");
  command.Text("--operators", options->operators, "Gauge study: the column that names the operator", "COLUMN");
  command.Number("--propose", options->propose, 0.1, 10, "Propose limits at this Cpk", "CPK");
  command.Text("-o,--output", options->output, "Write the proposed limits", "FILE");
  command.Text("--labels", options->labels, R"(Try limits on units known to be "good" or "bad" by this column)",
               "COLUMN");
  command.Text("--plot", options->plot, "Draw what --labels finds", "SVG");
  return [options] { return RunStudy(*options); };
}

}  // namespace qv
