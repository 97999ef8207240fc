// Setters of the input slots. Each one reads its new content first and touches the slot only when that has succeeded.

#include <unistd.h>

#include <cstdint>
#include <limits>
#include <opencv2/imgproc.hpp>

#include "core/slots.h"
#include "platform/properties.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

using Slot = std::unique_ptr<QVResource>;

// Runs a setter of the slot's resource, creating one for an empty slot only when the setter succeeds.
template <typename Fill>
int FillSlot(Slot& slot, Fill&& fill) {
  if (slot != nullptr) return fill(*slot);
  auto fresh = std::make_unique<QVResource>();
  const int code = fill(*fresh);
  if (code == QV_SUCCESS) slot = std::move(fresh);
  return code;
}

bool TakesFiles(int slot) { return KindOfSlot(slot) == SlotKind::kImage || KindOfSlot(slot) == SlotKind::kVideo; }

}  // namespace

void ConvertPreviewFrame(void* data, int width, int height, cv::Mat& converted) {
  const std::int64_t rows = static_cast<std::int64_t>(height) + height / 2;
  if (rows > std::numeric_limits<int>::max()) CV_Error(cv::Error::StsBadSize, "the frame is too high");
  CheckedPixels(width, height, 4);
  cv::cvtColor(cv::Mat(static_cast<int>(rows), width, CV_8UC1, data), converted, cv::COLOR_YUV2BGR_NV21, 4);
}

int FetchImage(const QVTester& tester, int slot, cv::Mat& image) {
  const QVResource* resource = tester.resources_[slot].get();
  if (resource == nullptr) return QV_ERROR_SLOT_EMPTY;
  resource->GetImage(&image);
  if (image.empty()) CV_Error_(cv::Error::StsBadArg, ("slot %d holds no image", slot));
  return QV_SUCCESS;
}

void Publish(QVTester& tester, const char* key, const char* value) {
  QVTester::Kept& kept = *tester.kept_;
  if (kept.publishes) kept.published += static_cast<int>(platform::property_set(key, value) == 0);
}

QVResultData& Results(const QVTester& tester) {
  if (tester.results_ == nullptr) CV_Error(cv::Error::StsNullPtr, "the tester was not initialised");
  return *tester.results_;
}

int QVTester::SetResource(QV_RESOURCE_INDEX index, char* path) {
  if (!TakesFiles(index) || access(path, F_OK) != 0) return QV_ERROR_INVALID_ARGUMENT;
  const bool video = KindOfSlot(index) == SlotKind::kVideo;
  const int code = FillSlot(resources_[index], [&](QVResource& resource) {
    return video ? resource.SetVideo(path) : resource.SetImage(path);
  });
  if (code != QV_SUCCESS) return code;
  // A standard image overrides reference values that were given as a property.
  if (index == QV_RESOURCE_FRONT_CHART_STANDARD) ref_patch_values_0_set_ = false;
  if (index == QV_RESOURCE_CHART_STANDARD) ref_patch_values_1_set_ = false;
  return QV_SUCCESS;
}

int QVTester::SetResource(QV_RESOURCE_INDEX index, int width, int height, unsigned short* data) {
  if (!TakesFiles(index)) return QV_ERROR_INVALID_ARGUMENT;
  const cv::Mat image(height, width, CV_16UC3, data);
  return FillSlot(resources_[index], [&](QVResource& resource) { return resource.SetImage(image); });
}

int QVTester::SetResource(QV_RESOURCE_INDEX index, int width, int height, void* data) {
  if (KindOfSlot(index) == SlotKind::kNone) return QV_ERROR_INVALID_ARGUMENT;
  cv::Mat frame;
  ConvertPreviewFrame(data, width, height, frame);
  return FillSlot(resources_[index], [&](QVResource& resource) { return resource.SetImage(frame); });
}

int QVTester::SetResource(QV_RESOURCE_INDEX /*index*/, int /*width*/, int /*height*/, bool /*flag*/,
                          unsigned short* /*first*/, unsigned short* /*second*/, unsigned short* /*third*/,
                          unsigned short* /*fourth*/) {
  return QV_SUCCESS;
}

int QVTester::SetHDRResource(QV_RESOURCE_INDEX index, int width, int height, bool flag, float* data) {
  if (KindOfSlot(index) != SlotKind::kHdr) return QV_ERROR_INVALID_ARGUMENT;
  const int code = FillSlot(resources_[index],
                            [&](QVResource& resource) { return resource.SetHDRImage(data, width, height, flag); });
  if (code != QV_SUCCESS) return code;
  hdr_width_ = width;
  hdr_height_ = height;
  hdr_flag_ = flag;
  return QV_SUCCESS;
}

int QVTester::ReleaseImage(QV_RESOURCE_INDEX index) {
  if (KindOfSlot(index) != SlotKind::kHdr) return QV_ERROR_INVALID_ARGUMENT;
  resources_[index].reset();
  return QV_SUCCESS;
}

int QVTester::GetLDRImage(QV_RESOURCE_INDEX /*index*/, int* /*width*/, int* /*height*/, unsigned char** /*data*/) {
  return QV_SUCCESS;
}

int QVTester::SaveHDRImage(QV_RESOURCE_INDEX /*index*/, char* /*path*/) { return QV_SUCCESS; }
