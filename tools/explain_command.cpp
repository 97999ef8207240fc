#include <algorithm>
#include <iostream>
#include <memory>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/doubt_names.h"
#include "desk/measure/figures.h"
#include "desk/measure/measurement.h"
#include "desk/measure/trust_table.h"
#include "desk/measure/uncertainty.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

constexpr std::size_t kWidth = 99;

std::string Line(const char* label, const std::string& text) {
  constexpr std::size_t kLabel = 17;
  return Format("  %-15s", label) + Wrapped(text, kWidth - kLabel, kLabel) + "\n";
}

std::string MethodText(const Method& method) {
  return Line("method", method.name) + Line("how true", Accuracy(method)) + Line("what moves it", method.moved_by);
}

std::string UnitText(const Figure& figure) {
  std::string text = figure.unit.name;
  if (figure.axis != nullptr) text = std::string("a list over ") + figure.axis->name + "; " + text;
  const double repeatability = Repeatability(figure);
  return text + (repeatability == 0
                     ? "; the same photo gives the same number on every machine"
                     : Format("; the same photo may give %g more or less on another machine", repeatability));
}

std::string TrustText(const FigureInfo& info) {
  const TrustLaw* const law = LawOf(info);
  if (law == nullptr) return "";
  if (law->method == nullptr) return Line("no uncertainty", law->reason);
  return Line("uncertainty", std::string(law->method) + (law->on_request ? "; with --uncertainty" : ""));
}

std::string Explain(const FigureInfo& info) {
  const Figure& figure = *info.figure;
  return info.name + "\n" + Line("meaning", figure.docstring) + Line("unit", UnitText(figure)) +
         MethodText(figure.method) + TrustText(info);
}

std::string Title(const Spec& spec) {
  return std::string(spec.name) + "  (" + spec.test_name() + (spec.test ? Format(", test %d", *spec.test) : "") + ")";
}

// Its figures; a method that several share is told once.
std::string Explain(const Spec& spec) {
  std::string text = Title(spec) + "\n";
  for (const InputSpec& input : spec.inputs) text += Line("of", input.help);
  const Method* method = nullptr;
  for (const Figure& figure : spec.figures) {
    if (method == nullptr || std::string(method->name) != figure.method.name) text += "\n" + MethodText(figure.method);
    method = &figure.method;
    text += std::string(spec.name) + "_" + figure.name + "\n" + Line("meaning", figure.docstring) +
            Line("unit", UnitText(figure)) + TrustText(*FindFigure(std::string(spec.name) + "_" + figure.name));
  }
  return text;
}

// A line each.
void ListFigures() {
  for (const Measurement* measurement : Measurements()) {
    const Spec& spec = measurement->spec();
    std::cout << Title(spec) << '\n';
    for (const Figure& figure : spec.figures) {
      const std::string name =
          Format("  %s_%-*s  ", spec.name, static_cast<int>(42 - std::string(spec.name).size()), figure.name);
      const std::string meaning = figure.docstring;
      std::cout << name << Shortened(meaning, kWidth - name.size()) << '\n';
    }
  }
  std::cout << "\n`qvtester explain NAME` tells more of one, or of all of a measurement; `qvtester explain\n"
               "uncertainty` how far figures may be trusted, `qvtester explain doubts` what makes a run an ERROR\n"
               "although it measured.\n";
}

// How far figures may be trusted is told by method: many figures share one.
void ExplainUncertainty() {
  std::cout << Wrapped(
                   "How far a figure may be trusted stands behind it (\"0.4390 ± 0.0021\") and in the record's "
                   "`uncertainty`: the standard uncertainty, and the expanded one, within which the true value "
                   "lies 95 times in 100 (JCGM 100). \"Type B\" is what does not show in the photo itself. It is "
                   "found by one of these methods, which the record names:",
                   kWidth)
            << '\n';
  for (const UncertaintyMethod& method : UncertaintyMethods()) {
    std::cout << '\n' << method.name << "\n  " << Wrapped(method.text, kWidth - 2, 2) << '\n';
  }
}

void ExplainDoubts() {
  std::cout
      << Wrapped(
             "A doubt makes a run an ERROR: it was measured, and its figures are not to be trusted. A plant whose "
             "limits were found in spite of one may accept it in its limits file "
             "(\"accept_doubts\": [\"uneven_light\"]), and the record says that it did.",
             kWidth)
      << "\n\n";
  for (const DoubtInfo& info : Doubts()) std::cout << Format("  %-27s  %s\n", info.name, info.meaning);
}

// The doubt of that name, and all figures of it, or those whose names hold it.
void ExplainFigures(const std::string& name) {
  const bool exact = FindFigure(name) != nullptr;
  std::vector<std::string> known = {"uncertainty", "doubts"};
  const DoubtInfo* const doubt = FindDoubt(name);
  if (doubt != nullptr) std::cout << doubt->name << "\n" << Line("a doubt", doubt->meaning);
  bool found = doubt != nullptr;
  for (const FigureInfo& info : AllFigures()) {
    known.push_back(info.name);
    if (exact ? info.name != name : info.name.find(name) == std::string::npos) continue;
    std::cout << (found ? "\n" : "") << Explain(info);
    found = true;
  }
  if (found) return;
  for (const Measurement* measurement : Measurements()) known.emplace_back(measurement->spec().name);
  throw Failure(kWrongUsage, Printable(name) + ": no measurement has this name; `qvtester explain` lists them" +
                                 DidYouMean(name, known));
}

}  // namespace

CommandBody DeclareExplain(Options& command) {
  auto names = std::make_shared<std::vector<std::string>>();
  command.Arguments("NAME", *names,
                    "A measurement, a figure as records name it, or a part of such names; \"uncertainty\": how far "
                    "figures may be trusted; \"doubts\", or a doubt's name; without any, figures are listed",
                    "NAME", false);
  return [names] {
    if (names->empty()) ListFigures();
    for (const std::string& name : *names) {
      if (name == "uncertainty") {
        ExplainUncertainty();
      } else if (name == "doubts") {
        ExplainDoubts();
      } else if (const Measurement* const measurement = FindMeasurement(name)) {
        std::cout << Explain(measurement->spec());
      } else if (name.empty()) {
        throw Failure(kWrongUsage, "\"\": an empty name; `qvtester explain` lists what there is");
      } else {
        ExplainFigures(name);
      }
    }
    return static_cast<int>(kExitWithinLimits);
  };
}

}  // namespace qv
