// Fast forms against their plain forms on whatever bytes libFuzzer comes up with: results must agree to the last bit.
//   fast_forms_fuzzer -max_total_time=60

#include <fuzzer/FuzzedDataProvider.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <opencv2/imgproc.hpp>

#include "chart/chart_rows.h"
#include "chart/region_warp.h"
#include "core/file_gate.h"
#include "unit_tests/plain/colour.h"
#include "unit_tests/plain/error_areas.h"
#include "unit_tests/plain/finder.h"
#include "unit_tests/plain/hdr_dots.h"
#include "unit_tests/plain/sfr.h"

namespace {

using Bytes = FuzzedDataProvider;

void Demand(bool same, const char* what) {
  if (same) return;
  std::fprintf(stderr, "%s: not as its plain form\n", what);
  std::abort();
}

// Bit patterns as they come, or levels of a photo.
std::vector<float> Floats(Bytes& bytes, std::size_t count) {
  const bool levels = bytes.ConsumeBool();
  std::vector<float> values;
  for (std::size_t i = 0; i < count; ++i) {
    const auto bits = bytes.ConsumeIntegral<std::uint32_t>();
    auto value = static_cast<float>(bits & 255);
    if (!levels) std::memcpy(&value, &bits, sizeof value);
    values.push_back(value);
  }
  return values;
}

void Finder(Bytes& bytes) {
  cv::Mat image(bytes.ConsumeIntegralInRange(0, 90), bytes.ConsumeIntegralInRange(0, 300), CV_8UC1, cv::Scalar(255));
  while (bytes.remaining_bytes() > 0) {
    const cv::Point at(bytes.ConsumeIntegralInRange(-9, 300), bytes.ConsumeIntegralInRange(-9, 90));
    const int module = bytes.ConsumeIntegralInRange(0, 9);
    if (module > 0) {
      for (const int side : {7, 5, 3}) {
        const cv::Point inset = cv::Point(7 - side, 7 - side) * module / 2;
        image(cv::Rect(at + inset, cv::Size(side, side) * module) & cv::Rect({}, image.size())) = side == 5 ? 1 : 0;
      }
    } else {
      const cv::Size size(bytes.ConsumeIntegralInRange(1, 40), bytes.ConsumeIntegralInRange(1, 40));
      image(cv::Rect(at, size) & cv::Rect({}, image.size())) = bytes.ConsumeIntegralInRange(0, 2);
    }
  }
  QVTester fast;
  QVTester plain;
  Demand(plain::GetFinderPoints(plain, image) == fast.GetFinderPoints(image), "GetFinderPoints");
  const auto left = [](const QVTester& tester) {
    std::vector<float> values = {tester.hasSkipped ? 1.0f : 0.0f};
    for (const QVFinderPattern& c : tester.possibleCenters) {
      values.insert(values.end(), {c.x, c.y, c.estimatedModuleSize, c.average});
    }
    return values;
  };
  Demand(plain::Bits(left(plain)) == plain::Bits(left(fast)), "GetFinderPoints' candidates");
  if (image.empty()) return;
  cv::Mat photo;
  cv::cvtColor(image, photo, cv::COLOR_GRAY2BGR);
  QVTester rows;
  Demand(plain.GetFinderPoints(image) == FindMarks(rows, photo, 0), "FindMarks");
  Demand(plain::Bits(left(plain)) == plain::Bits(left(rows)), "FindMarks' candidates");
}

void Dots(Bytes& bytes) {
  const int height = bytes.ConsumeIntegralInRange(0, 30);
  const int width = bytes.ConsumeIntegralInRange(0, 60);
  const int radius = bytes.ConsumeIntegralInRange(0, 6);
  const float threshold = Floats(bytes, 1)[0];
  const std::size_t size = static_cast<std::size_t>(height) * width;
  std::vector<float> data = Floats(bytes, 3 * size);
  std::vector<unsigned char> expected(size, 7);
  std::vector<unsigned char> mask = expected;
  plain::DetectDot(data.data(), height, width, threshold, radius, expected.data());
  QVTester().DetectDot(data.data(), height, width, threshold, radius, mask.data());
  Demand(expected == mask, "DetectDot");
}

void Sfr(Bytes& bytes) {
  cv::Mat region(bytes.ConsumeIntegralInRange(1, 60), bytes.ConsumeIntegralInRange(1, 60), CV_32F);
  const std::vector<float> values =
      Floats(bytes, std::min<std::size_t>(region.total(), bytes.remaining_bytes() / 4 + 1));
  for (std::size_t i = 0; i < region.total(); ++i) region.ptr<float>()[i] = values[i % values.size()];
  QVTester tester;
  Demand(plain::Outcome([&](auto&... out) { plain::CalculateSFR(tester, region, out...); }) ==
             plain::Outcome([&](auto&... out) { tester.CalculateSFR(region, out...); }),
         "CalculateSFR");
}

void Areas(Bytes& bytes) {
  const int distance = bytes.ConsumeIntegralInRange(0, 12);
  std::vector<plain::ErrorArea> given;
  while (bytes.remaining_bytes() > 0 && given.size() < 300) {
    const cv::Point at(bytes.ConsumeIntegral<std::uint8_t>(), bytes.ConsumeIntegral<std::uint8_t>());
    const cv::Point size(bytes.ConsumeIntegralInRange(0, 15), bytes.ConsumeIntegralInRange(0, 15));
    given.push_back({at, at + size, 1, 0});
  }
  Demand(plain::ErrorAreaClustering(distance, 200, 200, given) == plain::ClusterByTester(distance, 200, 200, given),
         "ErrorAreaClustering");
}

void Temperatures(Bytes& bytes) {
  const std::size_t pixels = bytes.remaining_bytes() / 12;
  std::vector<float> xyz = Floats(bytes, 3 * pixels);
  std::vector<float> expected(pixels);
  plain::xyz2cct(xyz.data(), pixels, expected.data());
  float* const cct = QVTester().xyz2cct(xyz.data(), static_cast<int>(pixels), 1);
  Demand(plain::Bits(expected) == plain::Bits({cct, cct + pixels}), "xyz2cct");
  std::free(cct);
}

void Warp(Bytes& bytes) {
  cv::Mat image(bytes.ConsumeIntegralInRange(1, 40), bytes.ConsumeIntegralInRange(1, 80),
                bytes.ConsumeBool() ? CV_8UC3 : CV_8UC1);
  const cv::Size canvas(bytes.ConsumeIntegralInRange(1, 90), bytes.ConsumeIntegralInRange(1, 90));
  const cv::Mat map = cv::getRotationMatrix2D({canvas.width * 0.5f, canvas.height * 0.5f},
                                              bytes.ConsumeFloatingPointInRange(-720.0, 720.0),
                                              bytes.ConsumeFloatingPointInRange(0.1, 8.0));
  const int x = bytes.ConsumeIntegralInRange(0, canvas.width - 1);
  const int y = bytes.ConsumeIntegralInRange(0, canvas.height - 1);
  const cv::Rect region(x, y, bytes.ConsumeIntegralInRange(0, canvas.width - x),
                        bytes.ConsumeIntegralInRange(0, canvas.height - y));
  for (std::size_t i = 0; i < image.total() * image.elemSize(); ++i) image.data[i] = bytes.ConsumeIntegral<uchar>();
  cv::Mat whole;
  cv::warpAffine(image, whole, map, canvas, cv::INTER_LINEAR, cv::BORDER_CONSTANT, cv::Scalar(0));
  const cv::Mat expected = whole(region);
  const cv::Mat warped = WarpRegion(image, map, canvas, region);
  Demand(expected.size() == warped.size() && (warped.empty() || cv::norm(expected, warped, cv::NORM_INF) == 0),
         "WarpRegion");
}

// No plain form: whatever a file holds, its header is read within its bytes.
void Gate(Bytes& bytes) {
  static const char* const kStarts[] = {"\xFF\xD8\xFF", "\xFF\x4F\xFF\x51", "BM", "P6\n", "P7\n",
                                        "#?RGBE\n",     "\x76\x2F\x31\x01"};
  const std::string start = bytes.PickValueInArray(kStarts);
  std::vector<unsigned char> file(start.begin(), start.end());
  const std::vector<unsigned char> rest = bytes.ConsumeRemainingBytes<unsigned char>();
  if (!rest.empty() && rest[0] % 2 == 0) file.clear();
  file.insert(file.end(), rest.begin(), rest.end());
  Demand(RefusePicture(file, 0) != nullptr, "RefusePicture");
  static_cast<void>(StartsAsFilm(file));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static constexpr std::array kSubjects = {Finder, Dots, Sfr, Areas, Temperatures, Warp, Gate};
  Bytes bytes(data, size);
  kSubjects[bytes.ConsumeIntegralInRange<std::size_t>(0, kSubjects.size() - 1)](bytes);
  return 0;
}
