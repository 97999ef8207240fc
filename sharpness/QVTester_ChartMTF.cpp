// Sharpness of a chart photo: its finder marks, the upright picture, the two slanted-edge regions. The chain with the
// whole upright picture is in unit_tests/plain/chart_mtf.h.

#include <cstdlib>

#include "chart/chart_layout.h"
#include "chart/find_chart.h"
#include "chart/points.h"
#include "chart/region_warp.h"
#include "core/slots.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"

namespace {

// A region of the upright picture, which is not drawn beyond it.
cv::Mat Cut(const FoundChart& chart, const cv::Rect& region) {
  return WarpRegion(chart.gray, chart.turn.map, chart.turn.canvas, region);
}

void PlaceRegions(FoundChart& chart, int columns) {
  const float scale = static_cast<float>(columns) / kChartSide;
  chart.vertical = PlaceRegion(kVerticalRegion, chart.corner, scale);
  chart.horizontal = PlaceRegion(kHorizontalRegion, chart.corner, scale);
}

cv::Mat InFloat(const cv::Mat& region) {
  cv::Mat values;
  region.convertTo(values, CV_32F);
  return values;
}

void LogGeometry(const char* name, const FoundChart& chart) {
  const cv::Point a = chart.corner;
  const cv::Point b = chart.second;
  const cv::Point c = chart.third;
  QVDEBUGP("%s distance between Topleft(x:%d,y:%d) to Topright(x:%d,y:%d) : %f", name, a.x, a.y, b.x, b.y,
           Distance(a, b));
  QVDEBUGP("%s distance between Topleft(x:%d,y:%d) to bottomleft(x:%d,y:%d) : %f", name, a.x, a.y, c.x, c.y,
           Distance(a, c));
  QVDEBUGP("%s distance between Bottomleft(x:%d,y:%d) to Topright(x:%d,y:%d) : %f", name, c.x, c.y, b.x, b.y,
           Distance(c, b));
}

}  // namespace

int QVTester::GetSFRFromImage(cv::Mat image, std::vector<float>& freq, std::vector<float>& sfrVertical,
                              std::vector<float>& sfrHorizontal, float& mtf50Vertical, float& mtf50Horizontal) {
  const char* const name = "GetSFRFromImage";
  FoundChart& chart = FindChart(image, prop_binary_thr_working_, name);
  if (chart.points.size() != kMarks) {
    QVDEBUGP("[%s] GetSFRFromImage, finder point : %d \n return PATTERN NOT FOUND!", name,
             static_cast<int>(chart.points.size()));
    return QV_ERROR_PATTERN_NOT_FOUND;
  }

  SetUpright(*this, chart);
  PlaceRegions(chart, chart.second.y - chart.corner.y);
  chart.vertical_pixels = Cut(chart, chart.vertical);
  chart.horizontal_pixels = Cut(chart, chart.horizontal);
  CalculateSFR(InFloat(chart.vertical_pixels), freq, sfrVertical, mtf50Vertical);
  std::vector<float> same_freq;  // both regions have the same smaller side, so one axis serves both
  CalculateSFR(InFloat(chart.horizontal_pixels), same_freq, sfrHorizontal, mtf50Horizontal);
  return QV_SUCCESS;
}

int QVTester::GetMTFFromImage(cv::Mat image, float& mtf50Vertical, float& mtf50Horizontal) {
  const char* const name = "GetMTFFromImage";
  FoundChart& chart = FindChart(image, prop_binary_thr_working_, name);
  const int count = static_cast<int>(chart.points.size());
  QVDEBUGP("%s %d circle is detected using finder_point algorithm!", name, count);
  if (chart.points.size() != kMarks) {
    QVDEBUGP("[%s] finder point : %d \n return PATTERN NOT FOUND!", name, count);
    return QV_ERROR_PATTERN_NOT_FOUND;
  }

  SetUpright(*this, chart);
  LogGeometry(name, chart);
  PlaceRegions(chart, std::abs(chart.second.y - chart.corner.y));  // its absolute value here, the signed one above

  const cv::Rect& v = chart.vertical;
  const cv::Mat& vertical = chart.vertical_pixels = Cut(chart, v);
  QVDEBUGP("%s vertical roi region x : %d, y : %d, width : %d, height : %d, row : %d, col : %d", name, v.x, v.y,
           v.width, v.height, vertical.rows, vertical.cols);
  const cv::Rect& h = chart.horizontal;
  const cv::Mat& horizontal = chart.horizontal_pixels = Cut(chart, h);
  QVDEBUGP("%s horizontal roi region x : %d, y : %d, width : %d, height : %d, row : %d, col : %d", name, h.x, h.y,
           h.width, h.height, horizontal.rows, horizontal.cols);
  CalculateMTF(InFloat(vertical), mtf50Vertical);
  CalculateMTF(InFloat(horizontal), mtf50Horizontal);
  return QV_SUCCESS;
}

int QVTester::CheckMTF(float* mtf50Vertical, float* mtf50Horizontal) {
  cv::Mat photo;
  if (const int code = FetchImage(*this, QV_RESOURCE_CHART_PHOTO, photo); code != QV_SUCCESS) return code;
  std::vector<float> freq;
  std::vector<float> sfr_vertical;
  std::vector<float> sfr_horizontal;
  float vertical = 0;
  float horizontal = 0;
  const int code = GetSFRFromImage(photo, freq, sfr_vertical, sfr_horizontal, vertical, horizontal);
  if (code != QV_SUCCESS) {
    QVDEBUGP("%s Fail to get SFR data (Result:%d)", "CheckMTF", code);
    return code;
  }
  *mtf50Vertical = vertical;
  *mtf50Horizontal = horizontal;
  return QV_SUCCESS;
}
