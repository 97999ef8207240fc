#include <memory>

#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "tools/commands.h"
#include "tools/measure.h"

namespace qv {

CommandBody DeclareFlash(Options& command) {
  struct Options : MeasureOptions {
    std::string photo;
    bool vt = false;
  };
  auto options = std::make_shared<Options>();
  command.Argument("PHOTO", options->photo, "Photo taken with the flash; - is standard input");
  command.Flag("--vt", options->vt, "The second camera's flash (test 18)");
  options->DeclareOn(command);
  return [options] {
    const QV_TEST_INDEX test = options->vt ? QV_TEST_CAMERA_FLASH_VT : QV_TEST_CAMERA_FLASH;
    const QV_RESOURCE_INDEX slot = options->vt ? QV_RESOURCE_VT_FLASH_PHOTO : QV_RESOURCE_FLASH_PHOTO;
    Measuring m;
    m.phase = options->vt ? "camera_flash_vt" : "camera_flash";
    m.test_name = options->vt ? "QV_TEST_CAMERA_FLASH_VT" : "QV_TEST_CAMERA_FLASH";
    m.test_index = test;
    m.inputs = {{slot, options->photo}};
    m.run = [test] { return RunTest(test, false); };
    m.collect = [vt = options->vt](Phase& phase, const QVResultData& results) {
      phase.Add("mean", vt ? results.flash_mean_vtcam_ : results.flash_mean_);
    };
    m.report = [](const Record& record) {
      const Measurement& mean = *record.phase.Find("mean");
      return Format("mean of the first channel  %.2f of 255%s\n", mean.value(), LimitText(mean).c_str());
    };
    m.annotate = [slot](const Record& record) {
      const cv::Mat photo = SlotPhoto(slot);
      const double scale = std::min(1.0, 1200.0 / std::max(photo.cols, photo.rows));
      Picture picture(std::max(640, cvRound(photo.cols * scale)), cvRound(photo.rows * scale) + 40);
      picture.Text(Format("Flash: mean of the first channel %.2f of 255 (%s)", record.phase.Find("mean")->value(),
                          Name(record.outcome())),
                   {12, 26}, 16, kInk);
      picture.PlacePhoto(photo, {0, 40}, scale);
      return picture.Png();
    };
    return Measure(*options, m);
  };
}

}  // namespace qv
