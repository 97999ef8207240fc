// The two MTF50 values of a chart photo, outside the numbered tests.

#include "desk/measure/run_test.h"
#include "desk/measure/sharpness.h"

namespace qv {

namespace {

class MtfCheck : public Measurement {
 public:
  const Spec& spec() const override {
    static const Spec spec = {"mtf_check",        std::nullopt,          "CheckMTF",
                              {SharpnessInput()}, SharpnessParameters(), SharpnessFigures()};
    return spec;
  }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& /*request*/, Record& record) const override {
    float vertical = 0;
    float horizontal = 0;
    if (RunRoutine(record.phase, "CheckMTF", [&] { return tester.CheckMTF(&vertical, &horizontal); })) {
      record.phase.Add("mtf50_vertical", vertical);
      record.phase.Add("mtf50_horizontal", horizontal);
    }
    return LookAtSharpness(tester, record);
  }
};

}  // namespace

const Measurement& MtfCheckMeasurement() {
  static const MtfCheck mtf_check;
  return mtf_check;
}

}  // namespace qv
