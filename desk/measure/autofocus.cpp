// Test 14: the spatial frequency responses of a chart photo.

#include "desk/measure/run_test.h"
#include "desk/measure/sharpness.h"
#include "desk/measure/widen.h"

namespace qv {

namespace {

class Autofocus : public Measurement {
 public:
  const Spec& spec() const override {
    static const Spec spec = {
        "camera_autofocus",
        QV_TEST_CAMERA_AUTOFOCUS,
        nullptr,
        {SharpnessInput()},
        SharpnessParameters(),
        SharpnessFigures(
            {{"sfr_vertical", kOne, Number::kReal, &kFrequencyAxis, kSfrMethod,
              "Spatial frequency response of the vertical region over frequency in units of Nyquist."},
             {"sfr_horizontal", kOne, Number::kReal, &kFrequencyAxis, kSfrMethod,
              "Spatial frequency response of the horizontal region over frequency in units of Nyquist."}})};
    return spec;
  }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    Phase& phase = record.phase;
    if (const QVResultData* results = RunNumberedTest(tester, spec(), request, phase)) {
      const std::vector<double> freq = Widen(results->af_sfr_first_, results->af_sfr_count_);
      phase.Add("mtf50_vertical", results->af_sfr_scalar1_);
      phase.Add("mtf50_horizontal", results->af_sfr_scalar2_);
      phase.Add("sfr_vertical", freq, Widen(results->af_sfr_second_, results->af_sfr_count_));
      phase.Add("sfr_horizontal", freq, Widen(results->af_sfr_third_, results->af_sfr_count_));
    }
    return LookAtSharpness(tester, record);
  }
};

}  // namespace

const Measurement& AutofocusMeasurement() {
  static const Autofocus autofocus;
  return autofocus;
}

}  // namespace qv
