#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstdlib>
#include <memory>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/drawing/picture.h"
#include "tools/commands.h"
#include "tools/measure.h"
#include "tools/options.h"

namespace qv {

namespace {

constexpr QV_RESOURCE_INDEX kSlot = QV_RESOURCE_HDR_FIRST;
constexpr int kMostSpots = 20'000;  // merging is quadratic; so many are noise, not defects

struct DotsOptions : MeasureOptions {
  std::string picture;
  double deviation = 0.1;
  int radius = 10;
  int distance = 8;
  std::string channel = "red";
};

struct Dots {
  cv::Mat mask;  // CV_8UC1, 1 at a dot
  std::vector<cv::Rect> areas;
  std::vector<int> pixels;  // dots in each area
  int spots = 0;            // connected dots, before they are merged
  int non_finite = 0;       // pixels
};

// The picture as three floats a pixel, the channel that is searched first.
cv::Mat ReadFloatPicture(const std::string& path, const std::string& channel) {
  cv::Mat picture;
  try {
    picture = cv::imread(path, cv::IMREAD_UNCHANGED);
  } catch (const cv::Exception& e) {
    if (e.code == cv::Error::StsNoMem) throw;
  }
  if (picture.empty()) throw Failure(kCouldNotMeasure, "not a picture that can be decoded");
  if (picture.depth() != CV_32F) {
    throw Failure(kCouldNotMeasure,
                  "not a float picture; dots are looked for in .exr, .hdr, .pfm and 32-bit float .tif files");
  }
  if (picture.channels() == 1) {
    cv::cvtColor(picture, picture, cv::COLOR_GRAY2BGR);
  } else if (picture.channels() == 4) {
    cv::cvtColor(picture, picture, cv::COLOR_BGRA2BGR);
  }
  cv::Mat first;
  cv::extractChannel(picture, first, channel == "red" ? 2 : channel == "green" ? 1 : 0);
  cv::cvtColor(picture, picture, cv::COLOR_BGR2RGB);
  cv::insertChannel(first, picture, 0);
  return picture;
}

cv::Mat SlotFloats() {
  float* data = nullptr;
  int width = 0;
  int height = 0;
  theTester->resources_[kSlot]->GetHDRImage(&data);
  theTester->resources_[kSlot]->GetHDRWidth(&width);
  theTester->resources_[kSlot]->GetHDRHeight(&height);
  return {height, width, CV_32FC3, data};
}

// What malloc gave and the clustering exchanges.
template <typename T>
struct CArray {
  explicit CArray(std::size_t count) : data(static_cast<T*>(std::malloc(std::max<std::size_t>(count, 1) * sizeof(T)))) {
    if (data == nullptr) throw Failure(kInternalFault, "no memory for the areas");
  }
  ~CArray() { std::free(data); }
  CArray(const CArray&) = delete;
  CArray& operator=(const CArray&) = delete;
  T* data;
};

void MergeSpots(Dots& dots, const cv::Mat& stats, int distance) {
  CArray<int> counts(dots.spots);
  CArray<cv::Point> top_left(dots.spots);
  CArray<cv::Point> bottom_right(dots.spots);
  std::vector<int> indices(dots.spots);
  for (int i = 0; i < dots.spots; ++i) {
    const int* const spot = stats.ptr<int>(i + 1);  // row 0 is the ground
    const cv::Rect box(spot[cv::CC_STAT_LEFT], spot[cv::CC_STAT_TOP], spot[cv::CC_STAT_WIDTH],
                       spot[cv::CC_STAT_HEIGHT]);
    indices[i] = i;
    counts.data[i] = spot[cv::CC_STAT_AREA];
    new (&top_left.data[i]) cv::Point(box.tl());
    new (&bottom_right.data[i]) cv::Point(box.br() - cv::Point(1, 1));
  }
  const int areas = theTester->ErrorAreaClustering(distance, dots.mask.cols, dots.mask.rows, &indices, &counts.data,
                                                   &top_left.data, &bottom_right.data);
  for (int i = 0; i < areas; ++i) {
    dots.areas.emplace_back(top_left.data[i], bottom_right.data[i] + cv::Point(1, 1));
    dots.pixels.push_back(counts.data[i]);
  }
}

Dots FindDots(const DotsOptions& options) {
  cv::Mat picture = SlotFloats();
  Dots dots;
  dots.mask = cv::Mat::zeros(picture.size(), CV_8U);
  theTester->DetectDot(picture.ptr<float>(), picture.rows, picture.cols, static_cast<float>(options.deviation),
                       options.radius, dots.mask.data);
  cv::Mat first;
  cv::extractChannel(picture, first, 0);
  dots.non_finite = static_cast<int>(
      std::count_if(first.begin<float>(), first.end<float>(), [](float value) { return !std::isfinite(value); }));
  cv::Mat labels;
  cv::Mat stats;
  cv::Mat centres;
  dots.spots = cv::connectedComponentsWithStats(dots.mask, labels, stats, centres) - 1;
  if (dots.spots <= kMostSpots) MergeSpots(dots, stats, options.distance);
  return dots;
}

void Collect(Phase& phase, const Dots& dots) {
  phase.Add("dot_count", cv::countNonZero(dots.mask));
  if (dots.spots > kMostSpots) return;
  phase.Add("area_count", static_cast<double>(dots.areas.size()));
  std::vector<double> columns, rows, numbers, pixels, widths, heights;  // NOLINT(readability-isolate-declaration)
  for (std::size_t i = 0; i < dots.areas.size(); ++i) {
    const cv::Rect& area = dots.areas[i];
    columns.push_back(area.x + (area.width - 1) / 2.0);
    rows.push_back(area.y + (area.height - 1) / 2.0);
    numbers.push_back(static_cast<double>(i));
    pixels.push_back(dots.pixels[i]);
    widths.push_back(area.width);
    heights.push_back(area.height);
  }
  phase.Add("areas", columns, rows);
  phase.Add("area_pixels", numbers, pixels);
  phase.Add("area_width", numbers, widths);
  phase.Add("area_height", numbers, heights);
}

void Look(Record& record, const Dots& dots, const DotsOptions& options) {
  const std::string& path = record.inputs[0].path;
  const int side = 2 * options.radius + 1;
  if (dots.mask.cols < side || dots.mask.rows < side) {
    record.cannot_judge = true;
    record.details.push_back(
        Format("%s: the picture is smaller than the window, %d x %d pixels; use a smaller --radius", path.c_str(), side,
               side));
  }
  if (dots.spots > kMostSpots) {
    record.cannot_judge = true;
    record.details.push_back(
        Format("%s: %d separate dots are noise, not defects; use a higher --threshold", path.c_str(), dots.spots));
  }
  if (dots.non_finite > 0) {
    record.cannot_judge = true;
    record.details.push_back(Format("%s: %d pixels are not finite, and no dot is seen below and to the right of one",
                                    path.c_str(), dots.non_finite));
  }
}

std::string Report(const Record& record, const Dots& dots) {
  constexpr std::size_t kShown = 20;
  const Measurement& count = *record.phase.Find("dot_count");
  const Measurement& areas = *record.phase.Find("area_count");
  std::string text = Format("dots       %.0f%s\nareas      %.0f%s\n", count.value(), LimitText(count).c_str(),
                            areas.value(), LimitText(areas).c_str());
  for (std::size_t i = 0; i < std::min(dots.areas.size(), kShown); ++i) {
    const cv::Rect& area = dots.areas[i];
    text += Format("           column %d, row %d, %d x %d, %d dots\n", area.x, area.y, area.width, area.height,
                   dots.pixels[i]);
  }
  if (dots.areas.size() > kShown) text += Format("           and %zu more\n", dots.areas.size() - kShown);
  return text;
}

// Every dot as a ring of its own would hide small areas: dots are coloured pixels, areas frames with their numbers.
std::string Annotate(const Record& record, const Dots& dots) {
  constexpr double kSide = 1280;
  constexpr double kHead = 44;
  constexpr double kFrame = 6;  // picture pixels around an area
  cv::Mat floats = SlotFloats().clone();
  floats.setTo(0, cv::Mat(cv::abs(floats.reshape(1)) <= FLT_MAX).reshape(3) == 0);
  cv::Mat first;
  cv::extractChannel(floats, first, 0);
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(first, mean, deviation);
  cv::insertChannel(cv::min(first, mean[0] + 4 * deviation[0]), floats, 0);  // one hot dot does not black out the rest
  cv::Mat seen;
  cv::cvtColor(theTester->HDR2UCHAR(floats), seen, cv::COLOR_GRAY2BGR);
  seen.setTo(cv::Scalar(25, 25, 230), dots.mask);
  const int longer = std::max(seen.cols, seen.rows);
  const double scale = longer < kSide / 2 ? std::floor(kSide / longer) : std::min(1.0, kSide / longer);
  Picture picture(std::max(640, cvRound(seen.cols * scale)), cvRound(seen.rows * scale + kHead));
  picture.Text(Format("HDR dots: %d dots in %zu areas, %s", cv::countNonZero(dots.mask), dots.areas.size(),
                      Name(record.outcome())),
               {12, 28}, 18, kInk);
  const PhotoPlace place = picture.PlacePhoto(seen, {0, kHead}, scale);
  for (std::size_t i = 0; i < dots.areas.size(); ++i) {
    const cv::Rect& area = dots.areas[i];
    const cv::Point2d from = place(cv::Point2d(area.tl()) - cv::Point2d(0.5, 0.5)) - cv::Point2d(kFrame, kFrame);
    const cv::Point2d to = place(cv::Point2d(area.br()) - cv::Point2d(0.5, 0.5)) + cv::Point2d(kFrame, kFrame);
    picture.Line({from, {to.x, from.y}, to, {from.x, to.y}}, kDoubtful, 2, true);
    const bool at_right = to.x + 30 > picture.width();
    picture.Text(std::to_string(i), {at_right ? from.x - 4 : to.x + 4, std::max(from.y + 10, kHead + 12)}, 13,
                 kDoubtful, at_right ? Align::kRight : Align::kLeft, true);
  }
  return picture.Png();
}

}  // namespace

CommandBody DeclareDots(Options& command) {
  auto options = std::make_shared<DotsOptions>();
  command.Argument(
      "FILE", options->picture,
      "Float picture of a lit panel; - is standard input. OpenEXR (.exr, lossy when its values are halves), "
      "Radiance (.hdr, lossy: 8 bits a channel and a common exponent), float TIFF (lossless, unless as LogLuv) and "
      "PFM (lossless)");
  command.Number("--threshold", options->deviation, 0, 1e9, "Departure from the local mean that makes a dot, a share",
                 "SHARE");
  command.Whole("--radius", options->radius, 1, 10'000, "Half the side of the window of the local mean", "PX");
  command.Whole("--distance", options->distance, 0, 100'000, "Areas closer than this are merged", "PX");
  command.Choice("--channel", options->channel, {"red", "green", "blue"},
                 "Channel that is searched: red, green or blue", "NAME");
  options->DeclareOn(command);
  return [options] {
    auto dots = std::make_shared<Dots>();
    Measuring m;
    m.phase = "hdr_dots";
    m.test_name = "DetectDot";
    m.look_at = "is it a float picture of an evenly lit panel?";
    m.inputs = {{kSlot, options->picture}};
    m.load = [options](const std::string& path) {
      cv::Mat picture = ReadFloatPicture(path, options->channel);
      return SetHDRResource(kSlot, picture.cols, picture.rows, false, picture.ptr<float>());
    };
    m.run = [options, dots] {
      *dots = FindDots(*options);
      return static_cast<int>(QV_SUCCESS);
    };
    m.collect = [dots](Phase& phase, const QVResultData& /*results*/) { Collect(phase, *dots); };
    m.look = [options, dots](Record& record) { Look(record, *dots, *options); };
    m.report = [dots](const Record& record) { return Report(record, *dots); };
    m.annotate = [dots](const Record& record) { return Annotate(record, *dots); };
    return Measure(*options, m);
  };
}

}  // namespace qv
