#include "desk/measure/figures.h"

#include <algorithm>

#include "desk/measure/measurement.h"
#include "desk/measure/promises.h"

namespace qv {

std::string Accuracy(const Method& method) { return WithNumbers(method.accuracy); }

std::string Explanation(const Figure& figure) {
  return std::string(figure.docstring) + " " + Accuracy(figure.method) + " " + figure.method.moved_by;
}

double Repeatability(const Figure& figure) { return figure.number == Number::kWhole ? 0 : figure.unit.repeatability; }

const std::vector<FigureInfo>& AllFigures() {
  static const std::vector<FigureInfo> all = [] {
    std::vector<FigureInfo> list;
    for (const Measurement* measurement : Measurements()) {
      const Spec& spec = measurement->spec();
      for (const Figure& figure : spec.figures) {
        list.push_back({std::string(spec.name) + "_" + figure.name, spec.name, &figure});
      }
    }
    return list;
  }();
  return all;
}

const FigureInfo* FindFigure(std::string_view name) {
  const auto found =
      std::find_if(AllFigures().begin(), AllFigures().end(), [&](const FigureInfo& info) { return info.name == name; });
  return found == AllFigures().end() ? nullptr : &*found;
}

}  // namespace qv
