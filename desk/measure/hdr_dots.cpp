// Bright and dark dots in a high-dynamic-range picture of a lit panel.

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstdlib>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/areas.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kDots = {
    "relative difference to the mean of a square window, single precision",
    "Of 1,000 dots of contrast 0.2 {dots_found} are found at a threshold of 0.1 and 0.5 % noise, corners included; the "
    "means are single precision, whose rounding counts on large pictures with small windows.",
    "Moved by the picture's noise, by neighbouring dots in the same window, by formats that round."};
constexpr Method kAreas = {"connected dots, then rectangles closer than the distance, merged until none are",
                           "Exact for the dots that were found.", "Moved by the dots and by the distance."};

constexpr Method kNoise = {"picture's own departures from the local mean (median), taken for normal ones",
                           "As good as noise is normal: within a fifth for Gaussian noise.",
                           "Moved by exposure and by the threshold; structure of the panel counts as noise."};

struct Dots {
  cv::Mat mask;  // CV_8UC1, 1 at a dot
  Areas areas;
  int spots = 0;        // connected dots, before they are merged
  int non_finite = 0;   // pixels
  double by_noise = 0;  // dots that noise alone would give
};

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

void MergeSpots(QVTester& tester, Dots& dots, const cv::Mat& stats, int distance) {
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
  const int areas = tester.ErrorAreaClustering(distance, dots.mask.cols, dots.mask.rows, &indices, &counts.data,
                                               &top_left.data, &bottom_right.data);
  for (int i = 0; i < areas; ++i) {
    dots.areas.rectangles.emplace_back(top_left.data[i], bottom_right.data[i] + cv::Point(1, 1));
    dots.areas.pixels.push_back(counts.data[i]);
  }
}

// The channel that is searched first, as the test reads it.
cv::Mat WithChannelFirst(const cv::Mat& rgb, const std::string& channel) {
  cv::Mat picture = rgb.clone();
  cv::Mat first;
  cv::extractChannel(rgb, first, channel == "red" ? 0 : channel == "green" ? 1 : 2);
  cv::insertChannel(first, picture, 0);
  return picture;
}

// Dots to be expected of normal noise as strong as the picture's departures from their local mean are in the median.
double DotsByNoise(const cv::Mat& first, double threshold, int radius) {
  constexpr std::size_t kStep = 7;  // pixels looked at: one of so many
  const int side = 2 * radius + 1;
  cv::Mat mean;
  cv::boxFilter(first, mean, CV_64F, {side, side});
  std::vector<double> departures;
  for (std::size_t i = 0; i < first.total(); i += kStep) {
    const int row = static_cast<int>(i / first.cols);
    const int column = static_cast<int>(i % first.cols);
    const double departure = std::fabs(first.at<float>(row, column) / mean.at<double>(row, column) - 1);
    if (std::isfinite(departure)) departures.push_back(departure);
  }
  if (departures.empty()) return 0;
  const auto middle = departures.begin() + static_cast<std::ptrdiff_t>(departures.size() / 2);
  std::nth_element(departures.begin(), middle, departures.end());
  const double sigma = *middle / 0.6745;
  return sigma > 0 ? static_cast<double>(first.total()) * std::erfc(threshold / sigma / std::sqrt(2.0)) : 0;
}

Dots FindDots(QVTester& tester, cv::Mat& picture, const Json& parameters) {
  Dots dots;
  dots.mask = cv::Mat::zeros(picture.size(), CV_8U);
  tester.DetectDot(picture.ptr<float>(), picture.rows, picture.cols, parameters.at("threshold").get<float>(),
                   parameters.at("radius"), dots.mask.data);
  cv::Mat first;
  cv::extractChannel(picture, first, 0);
  dots.non_finite = static_cast<int>(
      std::count_if(first.begin<float>(), first.end<float>(), [](float value) { return !std::isfinite(value); }));
  if (dots.non_finite == 0) {
    dots.by_noise = DotsByNoise(first, parameters.at("threshold"), parameters.at("radius"));
  }
  cv::Mat labels;
  cv::Mat stats;
  cv::Mat centres;
  dots.spots = cv::connectedComponentsWithStats(dots.mask, labels, stats, centres) - 1;
  if (dots.spots <= kMostSpots) MergeSpots(tester, dots, stats, parameters.at("distance"));
  return dots;
}

void Collect(Phase& phase, const Dots& dots) {
  phase.Add("dot_count", cv::countNonZero(dots.mask));
  phase.Add("dots_by_noise", dots.by_noise);
  if (dots.spots > kMostSpots) return;
  AddAreas(phase, dots.areas);
}

void Look(Record& record, const Dots& dots) {
  const char* const path = record.inputs[0].path.c_str();
  const int side = 2 * record.request.parameters.at("radius").get<int>() + 1;
  const auto refuse = [&](const char* name, const std::string& sentence) {
    record.Say(Remark::kNoJudgement, name, sentence, "dot_count");
  };
  if (dots.mask.cols < side || dots.mask.rows < side) {
    refuse(
        "picture_smaller_than_window",
        Format("%s: the picture is smaller than the window, %d x %d pixels; use a smaller --radius", path, side, side));
  }
  if (dots.spots > kMostSpots) {
    refuse("too_many_dots",
           Format("%s: %d separate dots are noise, not defects; use a higher --threshold", path, dots.spots));
  }
  constexpr double kMostByNoise = 0.5;
  const int count = cv::countNonZero(dots.mask);
  if (dots.by_noise > kMostByNoise && count > 0 && dots.spots <= kMostSpots) {
    record.Say(
        Doubt::kDotsInNoise,
        Format("%s: doubtful: noise as strong as this picture's alone would give %.*f dots, and %d are seen; use a "
               "higher --threshold or a longer exposure",
               path, dots.by_noise < 10 ? 1 : 0, dots.by_noise, count),
        "dots_by_noise");
  }
  if (dots.non_finite > 0) {
    refuse("pixels_not_finite", Format("%s: %d pixels are not finite, and no dot is seen below and to the right of one",
                                       path, dots.non_finite));
  }
}

constexpr Tone kBright = kDoubtful;
constexpr Tone kDark = kGood;

// 255 at dots that are brighter than the median about them; dots that are larger than the window count as they are.
cv::Mat BrightDots(const cv::Mat& picture, const cv::Mat& mask) {
  cv::Mat first;
  cv::extractChannel(picture, first, 0);
  cv::patchNaNs(first, 0);
  cv::Mat around;
  cv::blur(first, around, {21, 21}, {-1, -1}, cv::BORDER_REPLICATE);
  return (first > around) & (mask != 0);
}

cv::Scalar BgrOf(Tone tone) {
  const Colour colour = OnLabel(tone);
  return 255 * cv::Scalar(colour.blue, colour.green, colour.red);
}

// As grey levels for people, dots in colour. One hot dot does not black out the rest.
cv::Mat Seen(const cv::Mat& picture, const cv::Mat& mask, const cv::Mat& bright) {
  cv::Mat floats = picture.clone();
  floats.setTo(0, cv::Mat(cv::abs(floats.reshape(1)) <= FLT_MAX).reshape(3) == 0);
  cv::Mat first;
  cv::extractChannel(floats, first, 0);
  cv::Scalar mean;
  cv::Scalar deviation;
  cv::meanStdDev(first, mean, deviation);
  cv::insertChannel(cv::min(first, mean[0] + 4 * deviation[0]), floats, 0);
  QVTester painter;
  cv::Mat seen;
  cv::cvtColor(painter.HDR2UCHAR(floats), seen, cv::COLOR_GRAY2BGR);
  seen.setTo(BgrOf(kDark), mask);
  seen.setTo(BgrOf(kBright), bright);
  return seen;
}

class DotsFinding : public Finding {
 public:
  std::string Report(const Record& record) const override {
    const Reading& count = *record.phase.Find("dot_count");
    const Reading& areas = *record.phase.Find("area_count");
    return Format("dots       %.0f%s\nareas      %.0f%s\n", count.value(), LimitText(count).c_str(), areas.value(),
                  LimitText(areas).c_str()) +
           AreaLines(dots.areas, "dots");
  }

  // Every dot as a ring of its own would hide small areas: dots are coloured pixels, areas frames with their numbers.
  std::optional<Picture> Draw(const Record& record) const override {
    constexpr double kSide = 1280;
    if (record.phase.code != QV_SUCCESS) return std::nullopt;
    constexpr double kKey = 34;
    const cv::Mat bright = BrightDots(searched, dots.mask);
    const cv::Mat seen = Seen(searched, dots.mask, bright);
    const int longer = std::max(seen.cols, seen.rows);
    const double scale = longer < kSide / 2 ? std::floor(kSide / longer) : std::min(1.0, kSide / longer);
    const double width = std::max(640.0, seen.cols * scale);
    const int count = cv::countNonZero(dots.mask);
    const Heading heading(record, "HDR dots", width, {"dot_count", "area_count"});
    const double top = heading.height() + kKey;
    Picture picture(cvRound(width), cvRound(seen.rows * scale + top));
    heading.Draw(picture);
    const int bright_count = cv::countNonZero(bright);
    DrawKey(
        picture, {12, top - 16},
        {{Format("bright dots: %d", bright_count), kBright}, {Format("dark dots: %d", count - bright_count), kDark}});
    const PhotoPlace place = picture.PlacePhoto(seen, {0, top}, scale);
    Labels labels({0, top, width, seen.rows * scale});
    std::vector<Tone> tones;
    for (const cv::Rect& area : dots.areas.rectangles) {
      tones.push_back(2 * cv::countNonZero(bright(area)) >= cv::countNonZero(dots.mask(area)) ? kBright : kDark);
    }
    DrawAreas(picture, labels, place, dots.areas, record.phase, tones);
    return picture;
  }

  cv::Mat searched;  // CV_32FC3, the channel that was searched first
  Dots dots;
};

class HdrDots : public Measurement {
 public:
  HdrDots() {
    spec_.name = "hdr_dots";
    spec_.routine = "DetectDot";
    spec_.inputs = {{"file", QV_RESOURCE_HDR_FIRST,
                     "Float picture of a lit panel. OpenEXR (.exr, lossy when its values are halves), "
                     "Radiance (.hdr, lossy: 8 bits a channel and a common exponent), float TIFF (lossless, unless as "
                     "LogLuv) and PFM (lossless)"}};
    spec_.parameters = {
        {"threshold", Parameter::kReal, "SHARE", "Departure from the local mean that makes a dot, a share", 0.1, 0,
         1000},
        {"radius", Parameter::kWhole, "PX", "Half the side of the window of the local mean", 10, 1, 10'000},
        {"distance", Parameter::kWhole, "PX", "Areas closer than this are merged", 8, 0, 100'000},
        {"channel", Parameter::kWord, "NAME", "Channel that is searched", "red", 0, 0, {"red", "green", "blue"}}};
    spec_.figures = Figures();
    spec_.advice = "is it a float picture of an evenly lit panel?";
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    auto finding = std::make_unique<DotsFinding>();
    const bool done = RunRoutine(record.phase, spec_.routine, [&] {
      finding->searched = WithChannelFirst(SlotFloats(tester, spec_.inputs[0].slot), request.parameters.at("channel"));
      finding->dots = FindDots(tester, finding->searched, request.parameters);
      return static_cast<int>(QV_SUCCESS);
    });
    if (!done) return finding;
    Collect(record.phase, finding->dots);
    Look(record, finding->dots);
    return finding;
  }

 private:
  static std::vector<Figure> Figures() {
    std::vector<Figure> figures = {
        {"dot_count", kOne, Number::kWhole, nullptr, kDots, "Pixels that depart from their local mean."},
        {"dots_by_noise", kOne, Number::kReal, nullptr, kNoise,
         "Dots to be expected of the picture's noise alone, at this threshold."}};
    for (const Figure& figure : AreaFigures(kAreas)) figures.push_back(figure);
    return figures;
  }

  Spec spec_;
};

}  // namespace

const Measurement& DotsMeasurement() {
  static const HdrDots dots;
  return dots;
}

}  // namespace qv
