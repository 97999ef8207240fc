#include <iostream>
#include <map>
#include <memory>

#include "desk/base/text.h"
#include "desk/measure/library_tables.h"
#include "desk/measure/measurement.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

struct KindText {
  std::string operator()(const IntProperty& p) const { return Format("int        %d", p.initial); }
  std::string operator()(const FloatProperty& p) const { return Format("float      %.9g", p.initial); }
  std::string operator()(const FloatArray& p) const { return "float[9]  " + Values(p.initial, 9); }
  std::string operator()(const MatrixProperty& p) const {
    return Format("float[%d]  ", p.rows * p.cols) + Values(p.initial, p.rows * p.cols);
  }
  std::string operator()(const RegionList& /*kind*/) const { return "records    none; set its count first"; }
  std::string operator()(const SharedTable& p) const {
    return Format("int[%d]   none; stays in the caller's memory", p.length);
  }
  std::string operator()(const PatchValues& /*kind*/) const { return "float[72]  none"; }

 private:
  static std::string Values(const std::array<float, 9>& values, int count) {
    std::string text;
    for (int i = 0; i < count; ++i) text += Format(" %.9g", values[i]);
    return text;
  }
};

void ListTests() {
  std::cout << "index  name                       slots needed  runs\n";
  for (const QVTest& test : kTests) {
    std::string slots;
    for (const int slot : test.needs)
      slots += slot == kNoSlot ? "" : (slots.empty() ? "" : ", ") + std::to_string(slot);
    std::cout << Format("%5d  %-25s  %-12s  %s\n", test.index, test.name, slots.empty() ? "-" : slots.c_str(),
                        test.routine != nullptr ? "yes" : "no routine: answers -97");
  }
}

void ListSlots() {
  std::map<int, std::string> used_by;
  for (const QVTest& test : kTests) {
    for (const int slot : test.needs) used_by[slot] += (used_by[slot].empty() ? "" : ", ") + std::string(test.name);
  }
  std::cout << "slot  holds                needed by\n";
  for (const SlotRange& range : kSlotRanges) {
    for (int slot = range.first; slot <= range.last; ++slot) {
      std::cout << Format("%4d  %-19s  %s\n", slot, range.holds, used_by.count(slot) ? used_by[slot].c_str() : "-");
    }
  }
}

void ListProperties() {
  std::cout << "index  name                           type       default\n";
  for (const QVProperty& property : kProperties) {
    std::cout << Format("%5d  %-29s  %s\n", property.index, property.name,
                        std::visit(KindText{}, property.kind).c_str());
  }
}

void ListCodes() {
  for (const ResultCode& row : kResultCodes) {
    std::cout << Format("%4d  %-26s  %s\n", row.code, row.name, row.meaning);
    if (*row.look_at != '\0') std::cout << Format("%4s  %-26s  %s\n", "", "", row.look_at);
  }
}

void ListMeasurements() {
  for (const Measurement* measurement : Measurements()) {
    const Spec& spec = measurement->spec();
    std::cout << spec.name << "  (" << spec.test_name() << ")\n";
    for (const InputSpec& input : spec.inputs) {
      std::cout << Format("  %-9s  %-12s  %s\n", input.optional ? "parameter" : "input", input.name, input.help);
    }
    for (const Parameter& parameter : spec.parameters) {
      std::cout << Format("  parameter  %-12s  %s\n", parameter.name, HelpOf(parameter).c_str());
    }
  }
}

const std::map<std::string, void (*)()> kLists = {{"tests", ListTests},
                                                  {"slots", ListSlots},
                                                  {"properties", ListProperties},
                                                  {"codes", ListCodes},
                                                  {"measurements", ListMeasurements}};

}  // namespace

CommandBody DeclareList(Options& command) {
  auto what = std::make_shared<std::string>();
  std::vector<std::string> names;
  for (const auto& [name, print] : kLists) names.push_back(name);
  command.ChoiceArgument("WHAT", *what, names, "What to list");
  return [what] {
    kLists.at (*what)();
    return static_cast<int>(kExitWithinLimits);
  };
}

}  // namespace qv
