// Tests 27 and 28: light, colour and dots of lit regions.

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <opencv2/imgproc.hpp>

#include "core/slots.h"
#include "qvtester/tester.h"
#include "tests/camera/colour.h"
#include "tests/led_touch/spots.h"

namespace {

constexpr int kBlocks = 8;  // a side
constexpr int kLevels = 256;

struct LightTest {
  const char* name;
  QV_TEST_INDEX index;
  QV_RESOURCE_INDEX slot;
  QVRegionList QVTester::*list;
  int QVTester::*count;
  QVLightResult QVResultData::*result;
};

struct Region {
  cv::Rect area;
  int label;
};

// As many regions of the list as are counted and were set; the whole photo where there is none.
std::vector<Region> Regions(const QVTester& tester, const LightTest& test, cv::Size photo) {
  const QVRegionList& list = tester.*test.list;
  const int count = std::min(tester.*test.count, list.count);
  if (count <= 0) return {{{{}, photo}, 0}};
  std::vector<Region> regions;
  for (int i = 0; i < count; ++i) {
    const auto& [left, top, width, height, label] = list.records[i].fields;
    if (left < 0 || top < 0 || width <= 0 || height <= 0 || width > photo.width - left || height > photo.height - top) {
      CV_Error_(cv::Error::StsOutOfRange, ("region %d, label %d (left %d, top %d, %d x %d) does not lie inside the "
                                           "photo of %d x %d",
                                           i, label, left, top, width, height, photo.width, photo.height));
    }
    regions.push_back({{left, top, width, height}, label});
  }
  return regions;
}

struct Light {
  std::array<double, 3> linear = {};  // red, green, blue
  double clipped_share = 0;
};

// The photo holds blue, green, red.
Light MeasureLight(QVTester& tester, const cv::Mat& photo) {
  std::array<std::array<int, kLevels>, 3> histograms = {};
  int clipped = 0;
  const int channels = photo.channels();
  for (int y = 0; y < photo.rows; ++y) {
    const unsigned char* pixel = photo.ptr(y);
    for (int x = 0; x < photo.cols; ++x, pixel += channels) {
      for (int i = 0; i < 3; ++i) ++histograms[i][pixel[2 - i]];
      clipped += static_cast<int>(std::max({pixel[0], pixel[1], pixel[2]}) == kLevels - 1);
    }
  }
  const auto pixels = static_cast<double>(photo.total());
  Light light;
  for (int i = 0; i < 3; ++i) {
    for (int v = 0; v < kLevels; ++v) light.linear[i] += static_cast<double>(tester.GetLinearRGB(v)) * histograms[i][v];
    light.linear[i] /= pixels;
  }
  light.clipped_share = clipped / pixels;
  return light;
}

// Smallest over largest mean of blocks of equal size; 0 in the dark.
double Uniformity(const cv::Mat& gray) {
  const int across = std::min(kBlocks, gray.cols);
  const int down = std::min(kBlocks, gray.rows);
  const auto end = [](int i, int size, int blocks) {
    return static_cast<int>(static_cast<std::int64_t>(i) * size / blocks);
  };
  double smallest = kLevels;
  double largest = 0;
  for (int i = 0; i < down; ++i) {
    for (int k = 0; k < across; ++k) {
      const cv::Range rows(end(i, gray.rows, down), end(i + 1, gray.rows, down));
      const cv::Range columns(end(k, gray.cols, across), end(k + 1, gray.cols, across));
      const double mean = cv::mean(gray(rows, columns))[0];
      smallest = std::min(smallest, mean);
      largest = std::max(largest, mean);
    }
  }
  return largest == 0 ? 0 : smallest / largest;
}

QVLightRegion MeasureRegion(QVTester& tester, const cv::Mat& photo, const cv::Mat& gray, const Region& region) {
  const cv::Rect& area = region.area;
  QVLightRegion result = {region.label, area.x, area.y, area.width, area.height, 0, {}, {}, {}, 0, 0, 0};
  result.mean_grey_ = static_cast<float>(cv::mean(gray(area))[0]);
  const Light light = MeasureLight(tester, photo(area));
  for (int i = 0; i < 3; ++i) result.linear_rgb_[i] = static_cast<float>(light.linear[i]);
  const auto& [r, g, b] = result.linear_rgb_;
  const std::array<float, 3> xyz = LinearToXyz(r, g, b);
  std::copy(xyz.begin(), xyz.end(), result.xyz_);
  const float sum = xyz[0] + xyz[1] + xyz[2];
  for (int i = 0; i < 2; ++i) result.chromaticity_[i] = xyz[i] / sum;
  const std::unique_ptr<float, decltype(&std::free)> cct(tester.xyz2cct(result.xyz_, 1, 1), &std::free);
  if (cct == nullptr) throw std::bad_alloc();
  result.cct_ = *cct;
  result.clipped_share_ = static_cast<float>(light.clipped_share);
  result.uniformity_ = static_cast<float>(Uniformity(gray(area)));
  return result;
}

// Each region by itself: what lies around a light is no part of its local mean.
void FlagDots(QVTester& tester, const cv::Mat& gray, const cv::Rect& area, cv::Mat& flagged) {
  cv::Mat level;
  gray(area).convertTo(level, CV_32F);
  cv::Mat capture(area.size(), CV_32FC3);
  cv::insertChannel(level, capture, 0);  // the only one that is read
  cv::Mat mask = cv::Mat::zeros(area.size(), CV_8U);
  tester.DetectDot(capture.ptr<float>(), capture.rows, capture.cols, tester.prop_param_53_, tester.prop_param_55_,
                   mask.data);
  flagged(area) |= mask;
}

int MeasureLights(QVTester& tester, const LightTest& test) {
  cv::Mat photo;
  if (const int code = FetchImage(tester, test.slot, photo); code != QV_SUCCESS) return code;
  if (photo.depth() != CV_8U) CV_Error(cv::Error::StsUnsupportedFormat, "lights need 8 bits a channel");
  const std::vector<Region> regions = Regions(tester, test, photo.size());
  QVLightResult& result = Results(tester).*test.result;

  cv::Mat& gray = tester.kept_->gray;
  cv::cvtColor(photo, gray, cv::COLOR_RGB2GRAY);
  std::unique_ptr<QVLightRegion[]> measured(new QVLightRegion[regions.size()]);
  cv::Mat flagged = cv::Mat::zeros(photo.size(), CV_8U);
  for (std::size_t i = 0; i < regions.size(); ++i) {
    measured[i] = MeasureRegion(tester, photo, gray, regions[i]);
    FlagDots(tester, gray, regions[i].area, flagged);
  }
  ErrorAreas errors = FindErrorAreas(tester, test.name, flagged);

  tester.ReleaseTestResult(test.index);
  result = {static_cast<int>(regions.size()), measured.release(), errors.count, errors.areas.release(),
            errors.pixels.release()};
  return QV_SUCCESS;
}

}  // namespace

int QVTester::TestLEDLight() {
  return MeasureLights(*this, {"TestLEDLight", QV_TEST_LED_LIGHT, QV_RESOURCE_LED_PHOTO, &QVTester::prop_region_list_0_,
                               &QVTester::prop_region_count_0_, &QVResultData::led_});
}

int QVTester::TestTouchPanelLED() {
  return MeasureLights(*this,
                       {"TestTouchPanelLED", QV_TEST_TOUCH_PANEL_LED, QV_RESOURCE_TOUCH_PANEL_LED_PHOTO,
                        &QVTester::prop_region_list_1_, &QVTester::prop_region_count_1_, &QVResultData::touch_led_});
}
