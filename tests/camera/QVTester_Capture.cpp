// Tests 16 and 20: colour of a chart photo's patches, beside those of a standard photo of the same chart.

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>
#include <optional>

#include "chart/chart_layout.h"
#include "chart/find_chart.h"
#include "chart/points.h"
#include "chart/region_warp.h"
#include "chart/upright.h"
#include "core/slots.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

constexpr const char* kName = "TestCameraCapture";
constexpr std::size_t kFewestPatches = 15;  // up to the last of those

struct Triple {
  float x, y, z;
};

using Patches = std::vector<cv::Point3i>;

Triple ToXyz(QVTester& tester, const cv::Point3i& rgb) {
  Triple xyz = {};
  tester.ConvertRGB2XYZ(rgb.x, rgb.y, rgb.z, xyz.x, xyz.y, xyz.z);
  return xyz;
}

Triple ToLab(QVTester& tester, const Triple& xyz, const Triple& white) {
  Triple lab = {};
  tester.ConvertXYZ2LAB(xyz.x, xyz.y, xyz.z, white.x, white.y, white.z, lab.x, lab.y, lab.z);
  return lab;
}

// Half-open range of pixels about a patch's centre along one axis, or nothing where it leaves the image.
std::optional<cv::Range> PatchRange(const char* axis, int centre, int half, int end, const char* side) {
  const cv::Range range(centre - half, centre + half);
  if (range.start >= 0 && range.end >= range.start && range.end <= end) return range;
  const char* const name = "GetColorPatchRGB";
  QVDEBUGP("[%s] %sRange.(start,end)=(%d,%d)", name, axis, range.start, range.end);
  QVDEBUGP("[%s] %s-%s, assert!! before opencv", name, side, axis);
  return std::nullopt;
}

// Mean colours of the patches around a chart that lies upright in a picture of this size, of which `cut` gives a range
// of rows and columns.
template <typename Cut>
Patches SampleGrid(cv::Point corner, cv::Point second, cv::Point third, cv::Size size, Cut&& cut) {
  const char* const name = "GetColorPatchRGB";
  QVDEBUGP("[%s] img.(rows,cols)=(%d,%d)", name, size.height, size.width);
  const PatchGrid grid = PlacePatches(corner, second, third);

  constexpr std::array<const char*, 4> kSides = {"top", "bottom", "left", "right"};
  Patches colours;
  for (std::size_t i = 0; i < grid.centres.size(); ++i) {
    const char* const side = kSides[i / 6];
    if (i % 6 == 0) QVDEBUGP("[%s] %s", name, side);
    const auto rows = PatchRange("row", grid.centres[i].x, grid.half, size.height, side);
    if (!rows) return colours;
    const auto cols = PatchRange("col", grid.centres[i].y, grid.half, size.width, side);
    if (!cols) return colours;
    const cv::Scalar mean = cv::mean(cut(*rows, *cols));
    // Red, green, blue of a picture that holds blue first, whatever the grey conversions take it for.
    colours.emplace_back(static_cast<int>(mean[2]), static_cast<int>(mean[1]), static_cast<int>(mean[0]));
  }
  return colours;
}

// As its plain form, GetColorPatchRGB of what NormalizePatternImage gives, but only the patches are turned upright; a
// turn by exactly 0 degrees leaves the pixels of an 8-bit photo as they are.
Patches SamplePatches(QVTester& tester, const cv::Mat& photo, FoundChart& chart) {
  SetUpright(tester, chart);
  const UprightTurn& turn = chart.turn;
  const bool upright = LeavesPixels(turn, photo);
  return SampleGrid(chart.corner, chart.second, chart.third, turn.canvas, [&](cv::Range rows, cv::Range cols) {
    CV_Assert(!rows.empty());  // no columns can be cut from a band without rows
    const cv::Rect patch(cols.start, rows.start, cols.size(), rows.size());
    const bool inside = patch.br().x <= photo.cols && patch.br().y <= photo.rows;
    return upright && inside ? photo(patch) : WarpRegion(photo, turn.map, turn.canvas, patch);
  });
}

Triple WhiteOf(QVTester& tester, const Patches& patches) {
  return patches.size() > kWhitePatch ? ToXyz(tester, patches[kWhitePatch]) : Triple{};
}

// L*a*b* of the patches, three floats each.
std::unique_ptr<float[]> LabOf(QVTester& tester, const Patches& patches, const Triple& white) {
  auto lab = std::make_unique<float[]>(3 * patches.size());
  for (std::size_t i = 0; i < patches.size(); ++i) {
    const Triple value = ToLab(tester, ToXyz(tester, patches[i]), white);
    lab[3 * i] = value.x;
    lab[3 * i + 1] = value.y;
    lab[3 * i + 2] = value.z;
  }
  return lab;
}

// CIE 1976 colour difference of two triples, in single precision.
float DeltaE(const float* a, const float* b) {
  const float l = a[0] - b[0];
  const float u = a[1] - b[1];
  const float v = a[2] - b[2];
  return std::sqrt(l * l + u * u + v * v);
}

// Measures the standard photo, once in the tester's life. 1, or -91.
int ExtractStandard(QVTester& tester, const cv::Mat& photo, QVTester::ColorStandard& standard) {
  QVDEBUGP("[%s] !(*ptr_is_extracted) and is_standard_image_exists", kName);
  FoundChart& chart = tester.FindChart(photo, tester.prop_param_86_);
  chart.of_standard = true;
  const int count = static_cast<int>(chart.points.size());
  QVDEBUGP("[%s] finder point : %d", kName, count);
  if (chart.points.size() != kMarks) {
    QVDEBUGP("[%s] TestCameraCapture1, finder point : %d \n return PATTERN NOT FOUND!", kName, count);
    return QV_ERROR_PATTERN_NOT_FOUND;
  }
  const Patches& patches = chart.patches = SamplePatches(tester, photo, chart);
  standard.patches = patches;
  standard.standard_lab_ = LabOf(tester, patches, WhiteOf(tester, patches));
  standard.count = static_cast<int>(patches.size());
  standard.is_extracted = true;
  return QV_SUCCESS;
}

// Extracts the standard that a slot holds, unless that is done or there is none. 1, or -91.
int PrepareStandard(QVTester& tester, int slot, QVTester::ColorStandard& standard) {
  if (standard.is_extracted) return QV_SUCCESS;
  cv::Mat photo;
  if (tester.resources_[slot] != nullptr) tester.resources_[slot]->GetImage(&photo);
  if (!photo.empty()) return ExtractStandard(tester, photo, standard);
  QVDEBUGP("[%s] !(*ptr_is_extracted) just", kName);
  return QV_SUCCESS;
}

// Colours of the captured photo's patches. 1, -91, or -87.
int MeasurePatches(QVTester& tester, const cv::Mat& photo, Patches& patches) {
  FoundChart& chart = tester.FindChart(photo, tester.prop_binary_thr_working_, kName);
  if (chart.points.size() != kMarks) {
    QVDEBUGP("[%s] TestCameraCapture2 finder point : %d \n return PATTERN NOT FOUND!", kName,
             static_cast<int>(chart.points.size()));
    return QV_ERROR_PATTERN_NOT_FOUND;
  }
  patches = chart.patches = SamplePatches(tester, photo, chart);
  return patches.size() < kFewestPatches ? QV_ERROR_NO_PATCHES : QV_SUCCESS;
}

}  // namespace

int QVTester::TestCameraCapture(bool front) {
  QVDEBUGP(front ? "[OKAPI] Is Front Camera!!" : "[OKAPI] Is Main Camera!!");
  cv::Mat photo;
  const int slot = front ? QV_RESOURCE_FRONT_CHART_PHOTO : QV_RESOURCE_CHART_PHOTO;
  if (const int code = FetchImage(*this, slot, photo); code != QV_SUCCESS) return code;
  ColorStandard& standard = front ? kept_->standard_front : kept_->standard_main;
  const int slot_of_standard = front ? QV_RESOURCE_FRONT_CHART_STANDARD : QV_RESOURCE_CHART_STANDARD;
  if (const int code = PrepareStandard(*this, slot_of_standard, standard); code != QV_SUCCESS) return code;
  Patches patches;
  if (const int code = MeasurePatches(*this, photo, patches); code != QV_SUCCESS) return code;

  const Triple white = WhiteOf(*this, patches);
  std::unique_ptr<float[]> differences;
  int compared = 0;
  QVDEBUGP("[%s] calculate_differences, %s", kName, standard.is_extracted ? "true" : "false");
  if (standard.is_extracted) {
    compared = std::min(static_cast<int>(patches.size()), standard.count);
    differences = std::make_unique<float[]>(compared);
  } else {
    Patches chosen;
    for (const int number : kPatchesWithoutStandard) chosen.push_back(patches[number]);
    patches = chosen;
  }
  std::unique_ptr<float[]> lab = LabOf(*this, patches, white);
  for (int i = 0; i < compared; ++i) differences[i] = DeltaE(&lab[3 * i], &standard.standard_lab_[3 * i]);

  QVCaptureResult& result = front ? Results(*this).capture_front_ : Results(*this).capture_main_;
  ReleaseTestResult(front ? QV_TEST_CAMERA_CAPTURE_2 : QV_TEST_CAMERA_CAPTURE);
  result.capture_lab_ = lab.release();
  result.capture_lab_count_ = static_cast<int>(patches.size());
  result.capture_delta_e_ = differences.release();
  result.capture_delta_e_count_ = compared;
  return QV_SUCCESS;
}

std::vector<cv::Point3i> QVTester::GetColorPatchRGB(cv::Mat image, std::vector<cv::Point> finder_points) {
  cv::Point corner;
  cv::Point second;
  cv::Point third;
  SortPatternPoints(finder_points, corner, second, third);
  return SampleGrid(corner, second, third, image.size(),
                    [&](cv::Range rows, cv::Range cols) { return image.rowRange(rows).colRange(cols); });
}
