#include "desk/measure/measure.h"

#include <algorithm>

#include "desk/base/clock.h"
#include "desk/base/failure.h"
#include "desk/base/log_lines.h"
#include "desk/measure/guarded.h"
#include "desk/measure/load.h"
#include "desk/measure/measurement.h"
#include "desk/measure/properties.h"
#include "desk/measure/repeats.h"

namespace qv {

namespace {

// While one lives, the tester writes system properties, or none.
class Publishing {
 public:
  Publishing(QVTester& tester, bool publishes) : tester_(tester) { tester_.kept_->publishes = publishes; }
  ~Publishing() { tester_.kept_->publishes = true; }
  Publishing(const Publishing&) = delete;
  Publishing& operator=(const Publishing&) = delete;

 private:
  QVTester& tester_;
};

std::string NamesOf(const std::vector<RecordedInput>& inputs) {
  std::string names;
  for (const RecordedInput& input : inputs) names += (names.empty() ? "" : ", ") + input.path;
  return names;
}

// The library's last line says what was refused; which input it was, only the measurement may know.
void SayCause(Record& record, const std::vector<LogLine>& lines) {
  const int code = record.phase.code;
  if ((code != QV_ERROR_UNUSABLE_INPUT && code != QV_ERROR_INTERNAL) || lines.empty()) return;
  const std::string whose = record.refused ? record.inputs.at(*record.refused).path : NamesOf(record.inputs);
  record.Say(Remark::kMiss, "refused_input", whose + ": " + lines.back().text);
}

// Those of the request, and those that its parameters set.
Json PropertiesOf(const Spec& spec, const Request& request) {
  Json properties = request.properties;
  for (const Parameter& parameter : spec.parameters) {
    if (!parameter.property || !request.parameters.contains(parameter.name)) continue;
    properties[std::to_string(*parameter.property)] = request.parameters[parameter.name];
  }
  return CheckedProperties(properties);
}

// Limits of other measurements alone would let this one pass unjudged.
void RefuseForeignLimits(const Spec& spec, const Limits& limits) {
  const bool own = std::any_of(limits.by_name.begin(), limits.by_name.end(),
                               [&](const auto& limit) { return FindFigure(limit.first)->measurement == spec.name; });
  if (limits.given() && !own) {
    throw Failure(kWrongUsage, std::string("the limits hold none for ") + spec.name + "; they are of " +
                                   FindFigure(limits.by_name.begin()->first)->measurement);
  }
}

Record NewRecord(const Request& request, const Spec& spec, const Limits& limits) {
  Record record;
  record.start_millis = MillisSinceEpoch();
  record.request = request;
  record.test_name = spec.test_name();
  if (spec.test) record.test_index = *spec.test;
  record.phase.name = spec.name;
  record.limits = limits;
  record.advice = request.parameters.contains("raw") ? "is that the frame's size, and the file whole?" : spec.advice;
  return record;
}

// Not judged yet.
Record MeasureOnce(QVTester& tester, const Request& resolved, const Limits& limits) {
  const Measurement& measurement = *FindMeasurement(resolved.measurement);
  const Spec& spec = measurement.spec();
  RefuseForeignLimits(spec, limits);
  Record record = NewRecord(resolved, spec, limits);
  LogCollector log;
  const Publishing publishing(tester, resolved.publish);

  tester.Initialize();
  const SetProperties properties(tester, PropertiesOf(spec, resolved));
  const bool loaded = LoadInputs(tester, spec, resolved, record, log);
  record.phase.start_millis = record.phase.end_millis = MillisSinceEpoch();
  if (loaded) {
    // Whatever a measurement of the desk throws is a code, too: one photo must not end a batch.
    const int code = Guarded(spec.name, [&] {
      record.finding = measurement.Run(tester, resolved, record);
      return static_cast<int>(QV_SUCCESS);
    });
    if (code != QV_SUCCESS) record.phase.code = code;
    SayCause(record, log.lines());
  }
  record.properties = PropertiesOffDefault(tester);
  record.log_lines = std::move(log.lines());
  record.end_millis = MillisSinceEpoch();
  return record;
}

}  // namespace

Record Measure(QVTester& tester, const Request& request, const Limits& limits) {
  const Request resolved = Resolved(request);
  Record record = MeasureOnce(tester, resolved, limits);
  std::vector<Record> others;
  for (const Input& photo : resolved.repeats) {
    Request again = resolved;
    again.repeats.clear();
    again.inputs.at(0) = photo;
    QVTester fresh;
    others.push_back(MeasureOnce(fresh, again, limits));
  }
  if (!others.empty()) JoinRepeats(record, others);
  record.Judge();
  return record;
}

Record MeasureAnew(const Request& request, const Limits& limits) {
  QVTester tester;
  return Measure(tester, request, limits);
}

}  // namespace qv
