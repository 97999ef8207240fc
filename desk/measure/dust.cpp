// Tests 17 and 21: dust on the lens, in a photo of a plain target.

#include <algorithm>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "desk/drawing/labels.h"
#include "desk/drawing/plot.h"
#include "desk/measure/areas.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/heading.h"
#include "desk/measure/histogram.h"
#include "desk/measure/load.h"
#include "desk/measure/run_test.h"
#include "desk/measure/spots.h"
#include "desk/measure/telling.h"
#include "tests/camera/lens_dust.h"

namespace qv {

namespace {

constexpr Unit kSpotAxis = {"spot", "C62", "1"};

constexpr Method kBlob = {
    "local threshold 15 x 15, blob detector at levels 0 and 125",
    "Of sharp-rimmed discs 0.3 or more darker than the target {dust_found} of 4 to 16 px are found, of 20 px and more "
    "{dust_hollow}; soft ones of 24 px are.",
    "Moved by focus on the target, by light (photos whose mean level is under 126 show none), by noise near the local "
    "threshold."};

constexpr Method kSpots = {
    "differences of Gaussians in a pyramid, after a smooth surface of the fourth degree is taken out",
    "Dark spots of 3 to 300 px, sharp or soft, whose contrast times the root of their pixels is 9 times the noise: "
    "{spots_found} are found, with under {spots_false} false ones a photo (docs/accuracy.md).",
    "Moved by noise, by structure of the target, by light that falls off otherwise than smoothly."};

constexpr double kDarkestToJudge = 126;  // the blob search sees nothing in photos whose mean is below

class DustFinding : public Finding {
 public:
  std::string Report(const Record& record) const override;
  std::optional<Picture> Draw(const Record& record) const override;

  cv::Mat photo;
  std::vector<cv::KeyPoint> blobs;  // that were counted
  SpotFinding spots;

 private:
  void DrawPhoto(Picture& picture, const Phase& phase, double top, double scale) const;
  void LabelSpots(Picture& picture, const Phase& phase, const PhotoPlace& place) const;
};

// The blobs that were counted: the first five outside the corners.
std::vector<cv::KeyPoint> CountedBlobs(QVTester& tester, int count) {
  std::vector<cv::KeyPoint> counted;
  const QVTester::Blobs& blobs = tester.kept_->blobs;
  for (const cv::KeyPoint& blob : blobs.keypoints) {
    if (static_cast<int>(counted.size()) == count) break;
    if (tester.isValidLocation(blobs.image.cols, blobs.image.rows, blob.pt)) counted.push_back(blob);
  }
  return counted;
}

std::string SpotReport(const Phase& phase, const SpotFinding& found) {
  constexpr std::size_t kMostLines = 12;
  std::string text = Format("spots      %zu%s", found.spots.size(), LimitText(*phase.Find("spot_count")).c_str());
  text += Format(", largest %.0f px%s, %.3g %% of the photo dark%s\n", found.largest_area,
                 LimitText(*phase.Find("spot_largest_area")).c_str(), 100 * found.dark_share,
                 LimitText(*phase.Find("spot_dark_share")).c_str());
  for (std::size_t i = 0; i < std::min(found.spots.size(), kMostLines); ++i) {
    const Spot& spot = found.spots[i];
    text += Format("           column %.0f, row %.0f, %.1f px across, %.1f %% darker\n", spot.centre.x, spot.centre.y,
                   spot.diameter_px(), 100 * spot.contrast);
  }
  if (found.spots.size() > kMostLines) text += "           and more, in the record\n";
  return text;
}

std::string DustFinding::Report(const Record& record) const {
  const Phase& phase = record.phase;
  std::string text = "blobs      not looked for in fake mode\n";
  if (const Reading* const count = phase.Find("blob_count")) {
    text = Format("blobs      %.0f%s%s\n", count->value(), count->value() == kMostPlaces ? " or more" : "",
                  LimitText(*count).c_str());
    const Reading& places = *phase.Find("blobs");
    for (std::size_t i = 0; i < places.values.size(); ++i) {
      text += Format("           column %.0f, row %.0f\n", places.axis[i], places.values[i]);
    }
  }
  text += SpotReport(phase, spots);
  text += Format("mean level %.2f of 255\n", phase.Find("mean_level")->value());
  if (const Reading* m = phase.Find("histogram_difference")) {
    text += Format("histogram  differs from the reference by %.0f pixels%s\n", m->value(), LimitText(*m).c_str());
  }
  return text;
}

// Spots of which some figure has a limit.
void DustFinding::LabelSpots(Picture& picture, const Phase& phase, const PhotoPlace& place) const {
  constexpr std::size_t kMost = 60;
  Labels labels({place.origin, cv::Size2d(photo.cols * place.scale, photo.rows * place.scale)});
  std::vector<cv::Rect2d> boxes;
  for (const Spot& spot : spots.spots) {
    const double reach = std::max(10.0, spot.diameter_px() / 2 * place.scale + 4);
    const cv::Point2d half(reach, reach);
    boxes.emplace_back(place(spot.centre) - half, place(spot.centre) + half);
    labels.Keep(boxes.back());
  }
  for (std::size_t i = 0; i < std::min(boxes.size(), kMost); ++i) {
    PlaceWords words(std::to_string(i), kDoubtful);
    for (const char* figure : {"spots", "spot_areas", "spot_contrasts"}) words.AddEntry(phase.Find(figure), i);
    if (words.judged()) labels.Add(picture, words.Lines(), boxes[i], words.tone(), 13);
  }
}

void DustFinding::DrawPhoto(Picture& picture, const Phase& phase, double top, double scale) const {
  const PhotoPlace place = picture.PlacePhoto(photo, {0, top}, scale);
  for (const cv::Point corner : {cv::Point(0, 0), {1, 0}, {0, 1}, {1, 1}}) {
    const cv::Point2d at(corner.x * (photo.cols - kCornerPx) - 0.5, corner.y * (photo.rows - kCornerPx) - 0.5);
    picture.Line({place(at), place(at + cv::Point2d(kCornerPx, 0)), place(at + cv::Point2d(kCornerPx, kCornerPx)),
                  place(at + cv::Point2d(0, kCornerPx))},
                 kInk, 1.5, true);
  }
  for (const cv::KeyPoint& blob : blobs) {
    picture.Circle(place(blob.pt), std::max(10.0, blob.size * scale), kPoor, 2.5);
  }
  for (const Spot& spot : spots.spots) {
    picture.Circle(place(spot.centre), std::max(6.0, spot.diameter_px() / 2 * scale + 4), kDoubtful, 1.5);
  }
  LabelSpots(picture, phase, place);
}

Plot HistogramPlot(const Record& record) {
  const Json& reference = record.request.parameters.value("reference", Json::array());
  Plot plot;
  plot.title = "Grey levels";
  plot.x_label = "grey level";
  plot.y_label = "share of pixels, %";
  plot.x_max = kGreyLevels - 1;
  plot.curves = {{"photo", {}, kSeries[0], true}};
  const std::vector<double>& counts = record.phase.Find("histogram")->values;
  const double pixels = std::accumulate(counts.begin(), counts.end(), 0.0);
  plot.y_max = 1;
  for (int i = 0; i < kGreyLevels; ++i) {
    plot.curves[0].points.emplace_back(i, 100 * counts[i] / pixels);
    plot.y_max = std::max(plot.y_max, 105 * counts[i] / pixels);
  }
  const auto levels = reference.get<std::vector<double>>();
  const double all = std::accumulate(levels.begin(), levels.end(), 0.0);
  if (all <= 0) return plot;
  Plot::Curve curve = {"reference", {}, kSeries[1]};
  curve.ends_only = true;
  for (std::size_t i = 0; i < levels.size(); ++i) {
    curve.points.emplace_back(static_cast<double>(i), 100 * levels[i] / all);
    plot.y_max = std::max(plot.y_max, 105 * levels[i] / all);
  }
  plot.curves.push_back(std::move(curve));
  return plot;
}

std::optional<Picture> DustFinding::Draw(const Record& record) const {
  constexpr double kPlot = 460;
  if (record.phase.code != QV_SUCCESS) return std::nullopt;
  const double scale = FitScale(photo, 1080);
  const double width = photo.cols * scale;
  const Reading* const count = record.phase.Find("blob_count");
  const bool counted = count != nullptr && count->outcome != Outcome::kUnset;
  const Heading heading(record,
                        record.test_name + (counted               ? ""
                                            : record.request.fake ? ": blobs not looked for in fake mode"
                                                                  : ": too dark to judge"),
                        width + kPlot + 10, {"blob_count", "spot_count", "spot_largest_area", "mean_level"});
  const double top = heading.height();
  Picture picture(cvRound(width + kPlot + 10), cvRound(std::max(photo.rows * scale, 440.0) + top));
  heading.Draw(picture);
  DrawPhoto(picture, record.phase, top, scale);
  DrawPlot(picture, HistogramPlot(record), {width + 10, top, kPlot, 380});
  DrawKey(picture, {width + 22, top + 410}, {{"blob", kPoor}, {"spot", kDoubtful}, {"corner, left out", kInk}});
  return picture;
}

constexpr double kMostClipped = 0.01;      // of the photo's pixels
constexpr double kDarkestOfTarget = 0.45;  // its darkest parts over its middle level
constexpr double kSurelyBlobPx = 14;       // discs up to 16 px across are counted, as far as their contrast goes
constexpr double kLeastContrast = 0.03;    // of a large spot; fainter ones are the lamp's as well as the lens's

bool IsLargeAndUncounted(const Spot& spot, const std::vector<cv::KeyPoint>& blobs) {
  const double width = spot.diameter_px();
  if (width <= kSurelyBlobPx || spot.contrast < kLeastContrast) return false;
  return std::none_of(blobs.begin(), blobs.end(), [&](const cv::KeyPoint& blob) {
    return cv::norm(cv::Point2d(blob.pt) - spot.centre) < width / 2;
  });
}

class Dust : public Measurement {
 public:
  explicit Dust(bool front) : front_(front) {
    spec_.name = front ? "lens_dust_front" : "lens_dust";
    spec_.test = front ? QV_TEST_LENS_DUST_2 : QV_TEST_LENS_DUST;
    spec_.inputs = {{"photo", front ? QV_RESOURCE_FRONT_DUST_PHOTO : QV_RESOURCE_DUST_PHOTO,
                     "Photo of a plain, evenly lit target"}};
    spec_.parameters = {
        {"reference",
         Parameter::kHistogram,
         "FILE",
         "Histogram to compare with: an earlier dust record, or 256 numbers",
         nullptr,
         0,
         0,
         {},
         front ? QV_PROPERTY_FRONT_DUST_HISTOGRAM : QV_PROPERTY_DUST_HISTOGRAM},
        {"step", Parameter::kWhole, "N", "Step number, which names the property that is published", 0, 0, 9999}};
    spec_.figures = Figures();
    spec_.publishes = true;
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    tester.SetStep(request.parameters.at("step"));
    auto finding = std::make_unique<DustFinding>();
    finding->photo = SlotPhoto(tester, spec_.inputs[0].slot);
    const QVResultData* results = RunNumberedTest(tester, spec_, request, record.phase);
    if (results == nullptr) return finding;
    AddHistogram(record.phase, *results, request);
    cv::Mat grey;
    cv::cvtColor(finding->photo, grey, cv::COLOR_RGB2GRAY);
    record.phase.Find("mean_level")->Trust({OfMeanLevel(grey, 1, MeanShift(record.inputs.at(0).codec))});
    finding->spots = FindSpots(finding->photo);
    AddSpots(record, finding->spots, static_cast<double>(finding->photo.total()));
    const double mean = record.phase.Find("mean_level")->value();
    if (mean < kDarkestToJudge) {
      record.Say(Remark::kNoJudgement, "too_dark",
                 Format("%s: too dark to judge: the mean grey level is %.0f, and blobs are seen from %.0f "
                        "up; use more light or a longer exposure",
                        record.inputs[0].path.c_str(), mean, kDarkestToJudge),
                 "mean_level");
      return finding;
    }
    const int count = front_ ? results->dust_blob_count_front_ : results->dust_blob_count_main_;
    finding->blobs = CountedBlobs(tester, count);
    AddBlobs(record.phase, count, finding->blobs);
    DoubtBlobCount(record, *finding);
    return finding;
  }

 private:
  static std::vector<Figure> Figures() {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    return {
        {"blob_count", kOne, kWhole, nullptr, kBlob,
         "Dark blobs outside the corners, counted up to five. Discs of 4 to 16 pixels are seen."},
        {"blobs", kPixel, kReal, &kColumnAxis, kBlob, "Places of the counted blobs, column and row."},
        {"spot_count", kOne, kWhole, nullptr, kSpots, "Dark spots of any size from 3 to 300 pixels."},
        {"spot_largest_area", kPixel, kReal, nullptr, kSpots, "Area of the largest spot, square pixels."},
        {"spot_dark_share", kOne, kReal, nullptr, kSpots, "Share of the photo's pixels that lie in spots."},
        {"spots", kPixel, kReal, &kColumnAxis, kSpots, "Places of the spots, column and row; the surest first."},
        {"spot_areas", kPixel, kReal, &kSpotAxis, kSpots, "Area of each spot, square pixels, at half its depth."},
        {"spot_contrasts", kOne, kReal, &kSpotAxis, kSpots, "Depth of each spot's middle, of the light about it."},
        {"noise", kOne, kReal, nullptr, kSpots, "Noise of a pixel, of the light there; median over the photo."},
        {"mean_level", kGreyLevel, kReal, nullptr, kBins, "Mean grey level of the photo; blobs are seen from 126 up."},
        {"histogram", kOne, kWhole, &kLevelAxis, kBins, "Pixels of each grey level."},
        {"histogram_difference", kOne, kWhole, nullptr, kBins,
         "Sum of absolute differences to the reference histogram, pixels."},
    };
  }

  void AddHistogram(Phase& phase, const QVResultData& results, const Request& request) const {
    const int* const bins = front_ ? results.dust_hist_front_ : results.dust_hist_main_;
    std::vector<double> levels(kGreyLevels);
    std::iota(levels.begin(), levels.end(), 0);
    const std::vector<double> counts(bins, bins + kGreyLevels);
    const double pixels = std::accumulate(counts.begin(), counts.end(), 0.0);
    phase.Add("mean_level", std::inner_product(levels.begin(), levels.end(), counts.begin(), 0.0) / pixels);
    phase.Add("histogram", levels, counts);
    if (!request.parameters.contains("reference")) return;
    phase.Add("histogram_difference", front_ ? results.dust_hist_diff_front_ : results.dust_hist_diff_main_);
  }

  static void AddSpots(Record& record, const SpotFinding& found, double pixels) {
    Phase& phase = record.phase;
    std::vector<double> columns, rows, numbers, areas, contrasts;  // NOLINT(readability-isolate-declaration)
    std::vector<Uncertainty> of_places, of_areas, of_contrasts;    // NOLINT(readability-isolate-declaration)
    double squares = 0;
    for (const Spot& spot : found.spots) {
      const SpotTrust trust = found.Trust(spot);
      of_places.push_back(trust.place);
      of_areas.push_back(trust.area);
      of_contrasts.push_back(trust.contrast);
      squares += trust.area.standard * trust.area.standard;
      columns.push_back(spot.centre.x);
      rows.push_back(spot.centre.y);
      numbers.push_back(static_cast<double>(numbers.size()));
      areas.push_back(spot.area_px);
      contrasts.push_back(spot.contrast);
    }
    phase.Add("spot_count", static_cast<double>(found.spots.size()));
    const auto largest = std::max_element(areas.begin(), areas.end());
    Reading& largest_area = phase.Add("spot_largest_area", found.largest_area);
    if (!areas.empty()) largest_area.Trust({of_areas[largest - areas.begin()]});
    Reading& dark_share = phase.Add("spot_dark_share", found.dark_share);
    if (!areas.empty()) dark_share.Trust({Combined(0, 1, std::sqrt(squares) / pixels, kSpotMethod)});
    phase.Add("spots", columns, rows).Trust(std::move(of_places));
    phase.Add("spot_areas", numbers, areas).Trust(std::move(of_areas));
    phase.Add("spot_contrasts", numbers, contrasts).Trust(std::move(of_contrasts));
    phase.Add("noise", found.noise).Trust({found.of_noise});
    if (!found.cut_short) return;
    record.Say(Doubt::kTooManySpots,
               record.inputs[0].path + ": more spots than a plain target has dust; is the target plain?", "spot_count");
  }

  // What the count can't see: no plain target, light cut off, specks larger than the discs that it knows.
  static void DoubtBlobCount(Record& record, const DustFinding& finding) {
    const std::vector<double>& counts = record.phase.Find("histogram")->values;
    const double pixels = std::accumulate(counts.begin(), counts.end(), 0.0);
    const auto level_of = [&](double share) {  // below which this share of the pixels lies
      double sum = 0;
      int level = 0;
      while (level + 1 < kGreyLevels && (sum += counts[level]) < share * pixels) ++level;
      return level;
    };
    const char* const path = record.inputs[0].path.c_str();
    if (counts.back() > kMostClipped * pixels) {
      record.Say(Doubt::kClipped,
                 Format("%s: %.0f %% of the photo is clipped at level 255, where no speck shows; use less light", path,
                        100 * counts.back() / pixels),
                 "histogram");
    }
    if (finding.spots.cut_short || level_of(0.03) < kDarkestOfTarget * level_of(0.5)) {
      record.Say(
          Doubt::kNoPlainTarget,
          Format("%s: this is no plain, evenly lit target: 3 in 100 of its pixels lie below level %d, half below %d",
                 path, level_of(0.03), level_of(0.5)),
          "histogram");
    }
    const auto large = std::count_if(finding.spots.spots.begin(), finding.spots.spots.end(),
                                     [&](const Spot& spot) { return IsLargeAndUncounted(spot, finding.blobs); });
    if (large > 0) {
      record.Say(
          Doubt::kLargeDarkAreas,
          Format("%s: %s wider than %.0f px and not among the blobs, which are discs of 4 to 16 px: see the spots",
                 path, Count(static_cast<std::size_t>(large), "dark area is", "dark areas are").c_str(), kSurelyBlobPx),
          "spot_largest_area");
    }
  }

  static void AddBlobs(Phase& phase, int count, const std::vector<cv::KeyPoint>& blobs) {
    if (count < 0) return;  // in fake mode they are not looked for
    phase.Add("blob_count", count);
    std::vector<double> columns;
    std::vector<double> rows;
    for (const cv::KeyPoint& blob : blobs) {
      columns.push_back(blob.pt.x);
      rows.push_back(blob.pt.y);
    }
    phase.Add("blobs", columns, rows);
  }

  bool front_;
  Spec spec_;
};

}  // namespace

const Measurement& DustMeasurement(bool front) {
  static const Dust main(false);
  static const Dust second(true);
  return front ? second : main;
}

}  // namespace qv
