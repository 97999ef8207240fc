// Tests 25 and 26: frames and time stamps of a film, and the chart's marks in each frame.

#include "chart/cut_photo.h"
#include "chart/points.h"
#include "core/slots.h"
#include "qvtester/tester.h"
#include "tests/video/film.h"

namespace {

struct ChartCourse {
  int found = 0;
  std::vector<int> mark_count, corner_row, corner_column;
  std::vector<float> angle;

  void Append(QVTester& tester, const std::vector<cv::Point>& marks) {
    const bool whole = marks.size() == kMarks;
    const cv::Point corner = whole ? tester.GetCornerPoint(marks) : cv::Point(-1, -1);
    found += whole ? 1 : 0;
    mark_count.push_back(static_cast<int>(marks.size()));
    angle.push_back(tester.GetPatternAngle(marks));
    corner_row.push_back(corner.x);
    corner_column.push_back(corner.y);
  }
};

int MeasureChart(QVTester& tester, int slot, const char* name, QV_TEST_INDEX test,
                 QVVideoChartResult QVResultData::*fields) {
  Film film;
  ChartCourse course;
  const auto measure = [&](const cv::Mat& frame) {
    course.Append(tester, FindMarks(tester, frame, tester.prop_binary_thr_working_));
  };
  if (const int code = ReadFilm(tester, slot, name, 0, measure, film); code != QV_SUCCESS) return code;

  QVVideoChartResult& result = Results(tester).*fields;
  auto time = ArrayOf(film.time);
  auto mark_count = ArrayOf(course.mark_count);
  auto angle = ArrayOf(course.angle);
  auto corner_row = ArrayOf(course.corner_row);
  auto corner_column = ArrayOf(course.corner_column);
  tester.ReleaseTestResult(test);
  result = {film.promised,
            static_cast<int>(film.time.size()),
            film.lost,
            film.bad,
            film.mean_rate,
            film.longest_gap,
            course.found,
            time.release(),
            mark_count.release(),
            angle.release(),
            corner_row.release(),
            corner_column.release()};
  return course.found > 0 ? QV_SUCCESS : QV_ERROR_PATTERN_NOT_FOUND;
}

}  // namespace

int QVTester::TestVideoRecord() {
  return MeasureChart(*this, QV_RESOURCE_RECORDED_VIDEO, "TestVideoRecord", QV_TEST_VIDEO_RECORD,
                      &QVResultData::video_record_);
}

int QVTester::TestVideoPlay() {
  return MeasureChart(*this, QV_RESOURCE_VIDEO, "TestVideoPlay", QV_TEST_VIDEO_PLAY, &QVResultData::video_play_);
}
