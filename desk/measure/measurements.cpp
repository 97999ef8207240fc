#include <algorithm>

#include "desk/measure/library_tables.h"
#include "desk/measure/measurement.h"
#include "desk/measure/run_test.h"

namespace qv {

const Measurement& AutofocusMeasurement();
const Measurement& MtfCheckMeasurement();
const Measurement& CaptureMeasurement(bool front);
const Measurement& CircleCheckMeasurement();
const Measurement& DustMeasurement(bool front);
const Measurement& DotsMeasurement();
const Measurement& LcdMeasurement();
const Measurement& RegistrationMeasurement();
const Measurement& PreviewMeasurement(bool front);
const Measurement& FlashMeasurement(bool vt);
const Measurement& VideoPreviewMeasurement();
const Measurement& VideoFocusMeasurement();
const Measurement& VideoFlashMeasurement();
const Measurement& VideoChartMeasurement(bool record);
const Measurement& LightsMeasurement(bool touch_panel);
const Measurement& PrintMeasurement();

const std::vector<const Measurement*>& Measurements() {
  static const std::vector<const Measurement*> all = {
      &AutofocusMeasurement(),       &MtfCheckMeasurement(),    &CaptureMeasurement(false),
      &CaptureMeasurement(true),     &CircleCheckMeasurement(), &DustMeasurement(false),
      &DustMeasurement(true),        &DotsMeasurement(),        &RegistrationMeasurement(),
      &PreviewMeasurement(false),    &PreviewMeasurement(true), &FlashMeasurement(false),
      &FlashMeasurement(true),       &LcdMeasurement(),         &VideoPreviewMeasurement(),
      &VideoFocusMeasurement(),      &VideoFlashMeasurement(),  &VideoChartMeasurement(true),
      &VideoChartMeasurement(false), &LightsMeasurement(false), &LightsMeasurement(true),
      &PrintMeasurement(),
  };
  return all;
}

const Measurement* FindMeasurement(std::string_view name) {
  const auto found = std::find_if(Measurements().begin(), Measurements().end(),
                                  [&](const Measurement* measurement) { return name == measurement->spec().name; });
  return found == Measurements().end() ? nullptr : *found;
}

const char* Spec::test_name() const { return test ? kTests[*test].name : routine; }

const QVResultData* RunNumberedTest(QVTester& tester, const Spec& spec, const Request& request, Phase& phase) {
  if (!RunRoutine(phase, "RunTest", [&] { return tester.RunTest(*spec.test, request.fake); })) return nullptr;
  return tester.results_.get();
}

}  // namespace qv
