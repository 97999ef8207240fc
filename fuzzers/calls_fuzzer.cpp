// Exported calls in any order on any content: whatever libFuzzer comes up with, no crash, no leak, every array that the
// result block names is there to be read, and every answer is a code of the library's.
//   calls_fuzzer -close_fd_mask=2 -max_total_time=60

#include <fuzzer/FuzzedDataProvider.h>

#include <climits>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <opencv2/imgproc.hpp>
#include <set>

#include "qvtester/api.h"
#include "qvtester/host_properties.h"
#include "qvtester/lcd.h"
#include "qvtester/tester.h"
#include "unit_tests/drawing.h"
#include "unit_tests/film_file.h"

namespace {

using Bytes = FuzzedDataProvider;

// A ground with many corners, shifted and spoilt where asked for: what prints are registered by.
cv::Mat PrintedSheet(int shift, bool spoilt) {
  cv::Mat sheet(150, 200, CV_8UC3, cv::Scalar::all(230));
  cv::RNG random(3);
  for (int i = 0; i < 60; ++i) {
    const cv::Point at{random.uniform(5, 190), random.uniform(5, 140)};
    const cv::Size size{random.uniform(3, 14), random.uniform(3, 14)};
    cv::rectangle(sheet, {at + cv::Point(shift, shift), size}, cv::Scalar::all(random.uniform(0, 120)), cv::FILLED);
  }
  if (spoilt) cv::rectangle(sheet, {90, 60, 12, 9}, cv::Scalar::all(10), cv::FILLED);
  return sheet;
}

// Displays as they are photographed: plain, dark, with bars, and what is none.
const std::vector<cv::Mat>& Displays() {
  static const std::vector<cv::Mat> photos = [] {
    const std::vector<cv::Point> corners = {{30, 20}, {170, 28}, {165, 108}, {34, 100}};
    const auto draw = [&](int ground, const cv::Scalar& screen) {
      cv::Mat photo(130, 200, CV_8UC3, cv::Scalar::all(ground));
      cv::fillConvexPoly(photo, corners, screen, cv::LINE_AA);
      cv::GaussianBlur(photo, photo, {}, 0.8);
      return photo;
    };
    std::vector<cv::Mat> all = {draw(30, {200, 210, 205}), draw(25, {20, 190, 30}), draw(180, {6, 5, 8})};
    cv::Mat bars = draw(20, {210, 210, 210});
    for (int i = 0; i < 3; ++i) {
      cv::rectangle(bars, {35 + 33 * i, 30, 33, 70}, cv::Scalar(i == 2 ? 200 : 0, i == 1 ? 200 : 0, i == 0 ? 200 : 0),
                    cv::FILLED);
    }
    cv::Mat tick = draw(20, {30, 180, 30});
    cv::line(tick, {60, 70}, {90, 90}, cv::Scalar::all(240), 6);
    cv::Mat dots = draw(20, {200, 200, 200});
    for (int i = 1; i < 9; ++i) cv::circle(dots, {30 + 15 * i, 60}, 1, cv::Scalar(0, 0, 0), cv::FILLED);
    all.insert(all.end(), {bars, tick, dots});
    all.emplace_back();
    for (const int type : {CV_16UC3, CV_32FC3}) all[0].convertTo(all.emplace_back(), type, 257);
    cv::extractChannel(all[0], all.emplace_back(), 1);
    cv::cvtColor(all[0], all.emplace_back(), cv::COLOR_BGR2BGRA);
    return all;
  }();
  return photos;
}

// Files to load: photos and films that some test finds something in, and what can't be read.
const std::vector<std::string>& Files() {
  static const TemporaryFolder folder;
  static const std::vector<std::string> files = [] {
    SetHostPropertyStore(folder.Path("properties").c_str());
    SetHostPreviewFolder(folder.Path("").c_str());
    cv::Mat dust(240, 320, CV_8UC3, cv::Scalar(220, 225, 210));
    for (int i = 1; i < 8; ++i) cv::circle(dust, {40 * i, 30 * i}, 5, cv::Scalar::all(120), cv::FILLED);
    const cv::Mat chart = DrawChart({3, 0, 0.04, {360, 360}, 0.5});
    const std::vector<cv::Mat> frames = {chart, chart, DrawChart({2, 0, 0.04, {360, 360}, 0.5}), chart};
    const std::string film = WriteFilm(folder.Path("film.mp4"), frames, kH264);
    const std::string bytes = ReadFile(film);
    return std::vector<std::string>{
        film,
        WriteFilm(folder.Path("film.avi"), {dust, 2 * dust, dust}),
        folder.Write("cut.mkv", ReadFile(WriteFilm(folder.Path("a.mkv"), frames, kH264)).substr(0, bytes.size() / 2)),
        folder.Write("cut.mp4", bytes.substr(0, bytes.size() - 9)),
        WriteFilm(folder.Path("one.mp4"), {chart}, kH264),
        WriteFilm(folder.Path("odd.mkv"), std::vector<cv::Mat>(3, dust(cv::Rect(0, 0, 31, 201)))),
        folder.Write("sizes.ts", ReadFile(WriteFilm(folder.Path("a.ts"), frames, kH264)) +
                                     ReadFile(WriteFilm(folder.Path("b.ts"), {dust, dust, dust}, kH264))),
        folder.Write("print.png", PrintedSheet(0, false)),
        folder.Write("print_2.png", PrintedSheet(1, false)),
        folder.Write("print_bad.png", PrintedSheet(4, true)),
        folder.Write("picture.mp4", ReadFile(folder.Write("picture.png", chart))),
        folder.Write("chart.png", chart),
        folder.Write("turned.png", DrawChart({3, 118, 0.04, {480, 400}, 0.5})),
        folder.Write("two.png", DrawChart({2, 0, 0.04, {360, 360}, 0.5})),
        folder.Write("cut.png", chart(cv::Rect(0, 0, 340, 300))),
        folder.Write("dust.png", dust),
        folder.Write("gray.png", cv::Mat(9, 1, CV_16UC1, cv::Scalar(4000))),
        folder.Write("none.jpg", std::string("no picture")),
        folder.Write("empty.png", std::string()),
        folder.Path("missing.png"),
        folder.Path("")};
  }();
  return files;
}

template <typename T>
void ReadAll(const T* array, int count) {
  const auto* const bytes = reinterpret_cast<const volatile char*>(array);
  for (std::size_t i = 0; i < count * sizeof(T); ++i) static_cast<void>(bytes[i]);
}

void ReadResults() {
  QVResultData* results = nullptr;
  if (GetResult(&results) != 1) return;
  for (const QVPreviewResult* preview : {&results->preview_main_, &results->preview_front_, &results->preview_video_}) {
    ReadAll(preview->preview_diff_map_, preview->preview_diff_rows_ * preview->preview_diff_cols_);
  }
  for (const float* sfr : {results->af_sfr_first_, results->af_sfr_second_, results->af_sfr_third_})
    ReadAll(sfr, results->af_sfr_count_);
  for (const QVCaptureResult* capture : {&results->capture_main_, &results->capture_front_}) {
    ReadAll(capture->capture_lab_, 3 * capture->capture_lab_count_);
    ReadAll(capture->capture_delta_e_, capture->capture_delta_e_count_);
  }
  ReadAll(results->video_af_time_, results->video_af_frame_count_);
  ReadAll(results->video_af_mtf50_vertical_, results->video_af_frame_count_);
  ReadAll(results->video_af_mtf50_horizontal_, results->video_af_frame_count_);
  ReadAll(results->video_flash_time_, results->video_flash_frame_count_);
  ReadAll(results->video_flash_mean_, results->video_flash_frame_count_);
  for (const QVVideoChartResult* film : {&results->video_record_, &results->video_play_}) {
    ReadAll(film->time_, film->frame_count_);
    for (const int* array : {film->mark_count_, film->corner_row_, film->corner_column_})
      ReadAll(array, film->frame_count_);
    ReadAll(film->angle_, film->frame_count_);
  }
  for (const QVLightResult* lights : {&results->led_, &results->touch_led_}) {
    ReadAll(lights->regions_, lights->region_count_);
    ReadAll(lights->error_areas_, lights->error_count_);
    ReadAll(lights->error_pixels_, lights->error_count_);
  }
  ReadAll(results->print_error_areas_, results->print_error_count_);
  ReadAll(results->print_error_pixels_, results->print_error_count_);
  for (const int* histogram : {results->dust_hist_main_, results->dust_hist_front_})
    if (histogram != nullptr) ReadAll(histogram, 256);
}

// What a setter is given: enough bytes for any kind, of which the fuzzer chooses the first.
template <typename T>
std::vector<T> Buffer(Bytes& bytes, std::size_t count) {
  std::vector<T> values(count);
  bytes.ConsumeData(values.data(), std::min<std::size_t>(count * sizeof(T), 32));
  return values;
}

int Property(Bytes& bytes) {
  alignas(8) static int shared[2][288];  // 87 and 88 go on reading the caller's memory
  const int index = bytes.ConsumeIntegralInRange(-2, 100);
  if (bytes.ConsumeBool()) {
    int out[288];
    return GetProperty(static_cast<QV_PROPERTY_INDEX>(index), out);
  }
  if (index == 76 || index == 78) return 1;  // Regions sets them: here no one knows how much they would read
  int* const value = shared[index == 88];
  bytes.ConsumeData(value, 36);
  return SetProperty(static_cast<QV_PROPERTY_INDEX>(index), value);
}

// As many records as are counted; the count may be set to anything afterwards.
int Regions(Bytes& bytes) {
  const bool second = bytes.ConsumeBool();
  std::vector<QVRegionRecord> records(4);
  for (QVRegionRecord& record : records) {
    const bool wild = bytes.ConsumeIntegralInRange(0, 9) == 0;
    for (int& field : record.fields) {
      field = wild ? bytes.ConsumeIntegral<int>() : bytes.ConsumeIntegralInRange(0, 40);
    }
  }
  int count = bytes.ConsumeIntegralInRange(0, 4);
  SetProperty(second ? QV_PROPERTY_REGION_COUNT_1 : QV_PROPERTY_REGION_COUNT_0, &count);
  return SetProperty(second ? QV_PROPERTY_REGION_LIST_1 : QV_PROPERTY_REGION_LIST_0, records.data());
}

const std::string& File(Bytes& bytes) {
  return Files()[bytes.ConsumeIntegralInRange<std::size_t>(0, Files().size() - 1)];
}

int List(Bytes& bytes, QV_RESOURCE_INDEX slot) {
  std::vector<std::string> files;
  for (int i = bytes.ConsumeIntegralInRange(0, 3); i > 0; --i) {
    files.push_back(File(bytes));
  }
  return SetResourceWithList(bytes.ConsumeBool() ? QV_RESOURCE_IMAGE_LIST : slot, files);
}

// A film of which some bytes are others: what decoders make of it is read like any film.
int SpoiltFilm(Bytes& bytes, QV_RESOURCE_INDEX slot) {
  static const TemporaryFolder folder;
  std::string film = ReadFile(Files()[bytes.ConsumeIntegralInRange(0, 1)]);
  for (int i = bytes.ConsumeIntegralInRange(0, 8); i > 0; --i) {
    film[bytes.ConsumeIntegral<std::uint32_t>() % film.size()] = bytes.ConsumeIntegral<char>();
  }
  if (bytes.ConsumeBool()) film.resize(bytes.ConsumeIntegral<std::uint32_t>() % film.size());
  std::string path = folder.Write("spoilt.film", film);
  return SetResource(slot, path.data());
}

// One of the tests 22 to 29 with a file in each slot that it needs.
int Run(Bytes& bytes) {
  const auto test = static_cast<QV_TEST_INDEX>(bytes.ConsumeIntegralInRange(22, 29));
  constexpr QV_RESOURCE_INDEX kSlots[][2] = {
      {QV_RESOURCE_VIDEO_PREVIEW_FIRST_FRAME, QV_RESOURCE_VIDEO_PREVIEW_SECOND_FRAME},
      {QV_RESOURCE_VIDEO, QV_RESOURCE_VIDEO},
      {QV_RESOURCE_VIDEO, QV_RESOURCE_VIDEO},
      {QV_RESOURCE_RECORDED_VIDEO, QV_RESOURCE_RECORDED_VIDEO},
      {QV_RESOURCE_VIDEO, QV_RESOURCE_VIDEO},
      {QV_RESOURCE_LED_PHOTO, QV_RESOURCE_LED_PHOTO},
      {QV_RESOURCE_TOUCH_PANEL_LED_PHOTO, QV_RESOURCE_TOUCH_PANEL_LED_PHOTO},
      {QV_RESOURCE_TOUCH_PANEL_PRINT_PHOTO, QV_RESOURCE_IMAGE_LIST}};
  for (const QV_RESOURCE_INDEX slot : kSlots[test - 22]) {
    std::string file = File(bytes);
    if (slot == QV_RESOURCE_IMAGE_LIST) {
      List(bytes, slot);
    } else {
      SetResource(slot, file.data());
    }
  }
  return RunTest(test, bytes.ConsumeBool());
}

// Rules of any value, among them none that are numbers.
void BendRules(Bytes& bytes, QVTester_LCD& lcd) {
  float* const numbers[] = {&lcd.min_screen_area_,  &lcd.min_edge_contrast_, &lcd.expected_ratio_,
                            &lcd.ratio_tolerance_,  &lcd.min_white_level_,   &lcd.white_share_tolerance_,
                            &lcd.min_colour_level_, &lcd.min_colour_share_,  &lcd.max_black_level_,
                            &lcd.min_field_excess_, &lcd.field_ratio_,       &lcd.margin_,
                            &lcd.dot_threshold_,    &lcd.dot_floor_,         &lcd.min_uniformity_};
  *bytes.PickValueInArray(numbers) = bytes.ConsumeBool()
                                         ? bytes.ConsumeFloatingPoint<float>()
                                         : bytes.PickValueInArray({-1.0f, 0.0f, 0.5f, 1e30f, INFINITY, -INFINITY, NAN});
  int* const counts[] = {&lcd.dot_radius_, &lcd.dot_distance_, &lcd.min_dot_pixels_, &lcd.max_error_count_};
  *bytes.PickValueInArray(counts) = bytes.PickValueInArray({-1, 0, 3, 1 << 20, INT_MAX, INT_MIN});
}

// A display's photo, or a part of one, or noise of any kind.
int Display(Bytes& bytes) {
  static QVTester_LCD lcd;
  if (bytes.ConsumeIntegralInRange(0, 3) == 0) lcd = QVTester_LCD();
  if (bytes.ConsumeIntegralInRange(0, 3) == 0) BendRules(bytes, lcd);
  lcd.keep_corners_ = bytes.ConsumeIntegralInRange(0, 7) == 0;
  cv::Mat photo = Displays()[bytes.ConsumeIntegralInRange<std::size_t>(0, Displays().size() - 1)];
  if (bytes.ConsumeIntegralInRange(0, 7) == 0) {
    const int rows = bytes.ConsumeIntegralInRange(0, 50);
    const int columns = bytes.ConsumeIntegralInRange(0, 50);
    photo = cv::Mat(rows, columns, CV_MAKETYPE(bytes.ConsumeIntegralInRange(0, 6), bytes.ConsumeIntegralInRange(1, 5)));
    const std::size_t size = photo.total() * photo.elemSize();
    std::fill_n(photo.data, size, static_cast<uchar>(7));
    if (size > 0) bytes.ConsumeData(photo.data, size);
  } else if (!photo.empty() && bytes.ConsumeIntegralInRange(0, 3) == 0) {
    photo = photo(cv::Rect(bytes.ConsumeIntegralInRange(0, 99), bytes.ConsumeIntegralInRange(0, 99),
                           bytes.ConsumeIntegralInRange(1, 100), bytes.ConsumeIntegralInRange(1, 31)));
  }
  const int pattern = bytes.ConsumeIntegralInRange(-1, 5);
  if (pattern == 5) return lcd.FindScreen(photo);
  if (bytes.ConsumeIntegralInRange(0, 3) == 0) {
    cv::Mat screen = bytes.ConsumeBool() ? photo : cv::Mat();
    return lcd.Straighten(photo, {bytes.ConsumeIntegralInRange(-1, 90), bytes.ConsumeIntegralInRange(-1, 90)}, screen);
  }
  QVLcdResult result;
  const int code = lcd.JudgePattern(photo, static_cast<QV_LCD_PATTERN>(pattern), &result);
  if (code == 1 && (result.reason_.empty() || lcd.corners_.size() != 4)) std::abort();
  if (static_cast<int>(result.error_areas_.size()) != result.error_count_) std::abort();
  return code;
}

int Call(Bytes& bytes) {
  const auto test = static_cast<QV_TEST_INDEX>(bytes.ConsumeIntegralInRange(-1, 31));
  const auto slot = static_cast<QV_RESOURCE_INDEX>(bytes.ConsumeIntegralInRange(-1, 38));
  const int width = bytes.ConsumeIntegralInRange(-1, 40);
  const int height = bytes.ConsumeIntegralInRange(-1, 40);
  const auto area = static_cast<std::size_t>(std::max(width, 0) * std::max(height, 0));
  float vertical = 0;
  float horizontal = 0;
  switch (bytes.ConsumeIntegralInRange(0, 24)) {
    case 0: return InitTestModule();
    case 1: return FinalizeTestModule() == 0 ? InitTestModule() : -1000;
    case 2: return SetLDRResource(slot, width, height, Buffer<unsigned short>(bytes, 3 * area + 1).data());
    case 3: return SetHDRResource(slot, width, height, bytes.ConsumeBool(), Buffer<float>(bytes, 3 * area + 1).data());
    case 4: return SetResource(slot, width, height, Buffer<unsigned char>(bytes, 2 * area + 1).data());
    case 5: return Property(bytes);
    case 6: return ReleaseImage(slot);
    case 7: return ReleaseDataForTest(test);
    case 8: return ReleaseTestResult(test);
    case 9: return SetStep(width);
    case 10: return CheckMTF(&vertical, &horizontal);
    case 11: return CheckPatternCircles(width % 4);
    case 12: return TestCameraCapture(bytes.ConsumeBool());
    case 13: return setWorkingBinaryThresh(8 * width);
    case 14: return SavePreview(Buffer<unsigned char>(bytes, 2 * area + 1).data(), height, width, height);
    case 15: {
      std::string file = File(bytes);
      return SetResource(slot, file.data());
    }
    case 16: return Regions(bytes);
    case 17: return List(bytes, slot);
    case 18: return SpoiltFilm(bytes, bytes.ConsumeBool() ? QV_RESOURCE_VIDEO : QV_RESOURCE_RECORDED_VIDEO);
    case 19:
    case 20: return Display(bytes);
    case 21:
    case 22:
    case 23: return Run(bytes);
    default: return RunTest(test, bytes.ConsumeBool());
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const std::set<int> codes = {1, 0, -87, -90, -91, -95, -97, -98};
  Files();
  Bytes bytes(data, size);
  if (InitTestModule() != 1) std::abort();
  for (int i = 0; i < 60 && bytes.remaining_bytes() > 0; ++i) {
    if (codes.count(Call(bytes)) == 0) std::abort();
    ReadResults();
  }
  FinalizeTestModule();
  return 0;
}
