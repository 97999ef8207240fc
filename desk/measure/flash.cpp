// Tests 15 and 18: mean brightness of a flash photo.

#include <algorithm>
#include <array>
#include <opencv2/core.hpp>

#include "desk/base/text.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kMean = {
    "mean over all pixels of the first channel", "Exact for the photo as stored.",
    "Moved by exposure, flash, shading and clipping; the first channel of a photo read from a file is blue."};

constexpr Method kChannels = {"mean and counts over all pixels of each channel", "Exact for the photo as stored.",
                              "Moved by exposure, flash, shading and white balance."};
constexpr std::array<const char*, 3> kChannelNames = {"blue", "green", "red"};  // in the order of a decoded photo

// A clipped pixel has the channel at its largest level.
void CollectChannels(Phase& phase, const cv::Mat& photo, double shift) {
  const double full = photo.depth() == CV_16U ? 65535 : 255;
  for (int i = 0; i < std::min(photo.channels(), 3); ++i) {
    cv::Mat channel;
    cv::extractChannel(photo, channel, i);
    const cv::Mat clipped = channel >= full;
    phase.Add(std::string("mean_") + kChannelNames[i], cv::mean(channel)[0] * 255 / full)
        .Trust({OfMeanLevel(channel, 255 / full, shift)});
    phase
        .Add(std::string("clipped_") + kChannelNames[i],
             cv::countNonZero(clipped) / static_cast<double>(clipped.total()))
        .Trust({OfShare(clipped)});
  }
}

class FlashFinding : public Finding {
 public:
  explicit FlashFinding(cv::Mat photo) : photo_(std::move(photo)) {}

  std::string Report(const Record& record) const override {
    const Reading& mean = *record.phase.Find("mean");
    std::string text =
        Format("mean of the first channel  %s of 255%s\n", ValueText(mean, 2).c_str(), LimitText(mean).c_str());
    for (const char* channel : kChannelNames) {
      const Reading* const level = record.phase.Find(std::string("mean_") + channel);
      const Reading* const clipped = record.phase.Find(std::string("clipped_") + channel);
      if (level == nullptr || level->values.empty()) continue;
      text += Format("%-5s  mean %s%s, clipped %.2f %%%s\n", channel, ValueText(*level, 2).c_str(),
                     LimitText(*level).c_str(), 100 * clipped->value(), LimitText(*clipped).c_str());
    }
    return text;
  }

  std::optional<Picture> Draw(const Record& record) const override {
    if (record.phase.code != QV_SUCCESS) return std::nullopt;
    const double scale = FitScale(photo_, 1200);
    const double width = std::max(640.0, photo_.cols * scale);
    const Heading heading(record, record.test_name + ": levels over the whole photo", width,
                          {"mean", "mean_red", "mean_green", "mean_blue"});
    Picture picture(cvRound(width), cvRound(photo_.rows * scale + heading.height()));
    heading.Draw(picture);
    picture.PlacePhoto(photo_, {0, heading.height()}, scale);
    return picture;
  }

 private:
  cv::Mat photo_;
};

class Flash : public Measurement {
 public:
  explicit Flash(bool vt) {
    spec_.name = vt ? "camera_flash_vt" : "camera_flash";
    spec_.test = vt ? QV_TEST_CAMERA_FLASH_VT : QV_TEST_CAMERA_FLASH;
    spec_.inputs = {{"photo", vt ? QV_RESOURCE_VT_FLASH_PHOTO : QV_RESOURCE_FLASH_PHOTO, "Photo taken with the flash"}};
    spec_.figures = {
        {"mean", kGreyLevel, Number::kReal, nullptr, kMean, "Mean brightness of the flash photo, 0 to 255."},
        {"mean_red", kGreyLevel, Number::kReal, nullptr, kChannels, "Mean of the red channel, 0 to 255."},
        {"mean_green", kGreyLevel, Number::kReal, nullptr, kChannels, "Mean of the green channel, 0 to 255."},
        {"mean_blue", kGreyLevel, Number::kReal, nullptr, kChannels, "Mean of the blue channel, 0 to 255."},
        {"clipped_red", kOne, Number::kReal, nullptr, kChannels, "Share of pixels whose red is at its largest level."},
        {"clipped_green", kOne, Number::kReal, nullptr, kChannels,
         "Share of pixels whose green is at its largest level."},
        {"clipped_blue", kOne, Number::kReal, nullptr, kChannels,
         "Share of pixels whose blue is at its largest level."}};
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    if (const QVResultData* results = RunNumberedTest(tester, spec_, request, record.phase)) {
      const bool vt = spec_.test == QV_TEST_CAMERA_FLASH_VT;
      cv::Mat first;
      cv::extractChannel(SlotPhoto(tester, spec_.inputs[0].slot), first, 0);
      const double shift = MeanShift(record.inputs.at(0).codec);
      record.phase.Add("mean", vt ? results->flash_mean_vtcam_ : results->flash_mean_)
          .Trust({OfMeanLevel(first, 1, shift)});
      CollectChannels(record.phase, SlotPhoto(tester, spec_.inputs[0].slot), shift);
    }
    return std::make_unique<FlashFinding>(SlotPhoto(tester, spec_.inputs[0].slot));
  }

 private:
  Spec spec_;
};

}  // namespace

const Measurement& FlashMeasurement(bool vt) {
  static const Flash main(false);
  static const Flash second(true);
  return vt ? second : main;
}

}  // namespace qv
