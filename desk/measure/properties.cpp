#include "desk/measure/properties.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <map>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/library_tables.h"

namespace qv {

namespace {

// How many numbers a property holds, and of which kind.
struct Shape {
  int least = 1, most = 1;
  bool whole = false;
  int multiple = 1;

  std::string Text() const {
    const std::string kind = whole ? "whole number" : "number";
    if (most == 1) return "a " + kind;
    return (multiple > 1 ? std::to_string(multiple) + " " + kind + "s a record"
                         : std::to_string(most) + " " + kind + "s");
  }
};

struct ShapeOf {
  Shape operator()(const IntProperty& /*kind*/) const { return {1, 1, true}; }
  Shape operator()(const FloatProperty& /*kind*/) const { return {}; }
  Shape operator()(const FloatArray& /*kind*/) const { return {9, 9}; }
  Shape operator()(const MatrixProperty& p) const { return {p.rows * p.cols, p.rows * p.cols}; }
  Shape operator()(const RegionList& /*kind*/) const { return {5, 5 * 10'000, true, 5}; }
  Shape operator()(const SharedTable& p) const { return {p.length, p.length, true}; }
  Shape operator()(const PatchValues& /*kind*/) const { return {72, 72}; }
};

struct ValueReader {
  QVTester& tester;
  QV_PROPERTY_INDEX index;

  Json operator()(const IntProperty& /*kind*/) const { return Get<int, 1>()[0]; }
  Json operator()(const FloatProperty& /*kind*/) const { return Get<float, 1>()[0]; }
  Json operator()(const FloatArray& /*kind*/) const { return Get<float, 9>(); }
  Json operator()(const MatrixProperty& /*kind*/) const { return Get<float, 9>(); }
  Json operator()(const RegionList& /*kind*/) const { return nullptr; }
  Json operator()(const SharedTable& /*kind*/) const { return Get<int, 256>(); }
  Json operator()(const PatchValues& /*kind*/) const { return Get<float, 72>(); }

 private:
  template <typename T, std::size_t n>
  Json Get() const {
    std::array<T, n> values = {};
    return tester.GetProperty(index, values.data()) == QV_SUCCESS ? Json(values) : Json(nullptr);
  }
};

const QVProperty* Find(const std::string& index_or_name) {
  const auto* const found = std::find_if(std::begin(kProperties), std::end(kProperties), [&](const QVProperty& row) {
    return index_or_name == row.name || index_or_name == std::to_string(row.index);
  });
  return found == std::end(kProperties) ? nullptr : found;
}

bool IsNumber(const Json& value, bool whole) {
  if (!whole) return value.is_number() && std::isfinite(value.get<float>());
  return value.is_number_integer() && value == value.get<int>();
}

// Null for a value that the property can't have.
Json CheckedValue(const QVProperty& row, const Json& value) {
  const Shape shape = std::visit(ShapeOf{}, row.kind);
  if (shape.most == 1) return IsNumber(value, shape.whole) ? value : Json();
  const auto count = static_cast<int>(value.size());
  const bool fits = value.is_array() && count >= shape.least && count <= shape.most && count % shape.multiple == 0 &&
                    std::all_of(value.begin(), value.end(), [&](const Json& v) { return IsNumber(v, shape.whole); });
  return fits ? value : Json();
}

const QVProperty& Known(const std::string& index_or_name) {
  const QVProperty* const row = Find(index_or_name);
  if (row == nullptr) {
    std::vector<std::string> names;
    for (const QVProperty& known : kProperties) names.emplace_back(known.name);
    throw Failure(kWrongUsage, Printable(index_or_name) + ": no such property; `qvtester list properties` shows them" +
                                   DidYouMean(index_or_name, names));
  }
  return *row;
}

template <typename T>
void Set(QVTester& tester, QV_PROPERTY_INDEX index, const Json& value) {
  auto values = value.is_array() ? value.get<std::vector<T>>() : std::vector<T>{value.get<T>()};
  if (tester.SetProperty(index, values.data()) == QV_SUCCESS) return;
  throw Failure(kWrongUsage, "property " + std::to_string(index) + " can't be set");
}

}  // namespace

void AddProperty(Json& properties, const std::string& words) {
  const std::size_t equals = words.find('=');
  const std::string text = equals == std::string::npos ? "" : words.substr(equals + 1);
  const bool list = text.find(',') != std::string::npos;
  const Json value = Json::parse(list ? "[" + text + "]" : text, nullptr, false);
  if (value.is_discarded()) {
    throw Failure(kWrongUsage, words + ": give a property and its value, as 86=110 or 64=0.1,0,0,0,0");
  }
  const std::string name = words.substr(0, equals);
  if (properties.contains(name)) throw Failure(kWrongUsage, "property " + name + " is given twice");
  properties[name] = value;
}

Json CheckedProperties(const Json& properties) {
  if (!properties.is_object()) throw Failure(kWrongUsage, "properties: an object of values by index or name is needed");
  std::map<int, Json> by_index;
  for (const auto& [name, value] : properties.items()) {
    const QVProperty& row = Known(name);
    const Json checked = CheckedValue(row, value);
    if (checked.is_null()) {
      throw Failure(kWrongUsage,
                    "property " + name + ": " + value.dump() + " is not " + std::visit(ShapeOf{}, row.kind).Text());
    }
    if (!by_index.emplace(row.index, checked).second) {
      throw Failure(kWrongUsage, "property " + name + " is given twice: by index and by name");
    }
  }
  Json in_order = Json::object();
  for (const auto& [index, value] : by_index) in_order[std::to_string(index)] = value;
  return in_order;
}

SetProperties::SetProperties(QVTester& tester, const Json& properties) : tester_(tester) {
  for (const auto& [name, value] : properties.items()) {
    const QVProperty& row = Known(name);
    const auto index = static_cast<QV_PROPERTY_INDEX>(row.index);
    if (const auto* table = std::get_if<SharedTable>(&row.kind)) {
      tester.SetProperty(index, tables_.emplace_back(value.get<std::vector<int>>()).data());
      borrowed_.push_back(table->member);
    } else if (const auto* list = std::get_if<RegionList>(&row.kind)) {
      if (5 * tester.*list->count != static_cast<int>(value.size())) {
        throw Failure(kWrongUsage, "property " + name + ": set the number of its records, property " +
                                       std::to_string(row.index - 1) + ", too");
      }
      Set<std::int32_t>(tester, index, value);
    } else if (std::visit(ShapeOf{}, row.kind).whole) {
      Set<int>(tester, index, value);
    } else {
      Set<float>(tester, index, value);
    }
  }
}

SetProperties::~SetProperties() {
  for (cv::Mat QVTester::*table : borrowed_) (tester_.*table).release();
}

Json PropertiesOffDefault(QVTester& tester) {
  QVTester defaults;
  Json changed = Json::object();
  for (const QVProperty& property : kProperties) {
    const auto index = static_cast<QV_PROPERTY_INDEX>(property.index);
    const Json value = std::visit(ValueReader{tester, index}, property.kind);
    if (value != std::visit(ValueReader{defaults, index}, property.kind))
      changed[std::to_string(property.index)] = value;
  }
  return changed;
}

Json DefaultOf(QV_PROPERTY_INDEX index) {
  QVTester defaults;
  return std::visit(ValueReader{defaults, index}, Known(std::to_string(index)).kind);
}

}  // namespace qv
