// A display in a photo: what it shows, judged by the library's own rules.

#include <algorithm>
#include <array>
#include <cmath>
#include <opencv2/imgproc.hpp>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/measure/areas.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/mean_trust.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"
#include "qvtester/lcd.h"

namespace qv {

namespace {

constexpr Method kScreen = {
    "lines fitted to the screen's edges, each a blurred step fitted to its profile",
    "Corners lie within {display_corners} in the median, up to 30 degrees of pan and tilt; within {display_jpeg} on "
    "JPEGs of quality 75 (docs/accuracy.md).",
    "Moved by lens distortion, by what covers an edge; rounded corners are taken for sharp ones."};
constexpr Method kVerdict = {
    "means of the colour channels, relative to one another and to the full range, and the ratio of the sides",
    "At most {display_wrong} of the judgements of simulated photos are wrong (docs/accuracy.md).",
    "Moved by exposure and white balance of the outer camera, by light that the glass mirrors."};
constexpr Method kMeans = {"means of stored levels over the straightened screen", "Exact for the photo as stored.",
                           "Moved by exposure, by light that the glass mirrors, by the lens's shading."};
constexpr Method kScreenDots = {
    "relative difference to the mean of a square window, by channel; dots that lie close are one area",
    "Points of 4 px and more that differ by half are found; none within 2 % of the rim.",
    "Moved by noise, focus and moire between the camera's pixels and the display's."};

constexpr Unit kPointAxis = {"point", "C62", "1"};
// A slot for a photo that no numbered test reads: what holds the display's photo meanwhile.
constexpr auto kSlot = static_cast<QV_RESOURCE_INDEX>(33);

const std::vector<std::string> kPatternNames = {"control", "green", "black", "white", "result"};

std::vector<double> Numbers(std::size_t count) {
  std::vector<double> numbers(count);
  for (std::size_t i = 0; i < count; ++i) numbers[i] = static_cast<double>(i);
  return numbers;
}

class LcdFinding : public Finding {
 public:
  std::string Report(const Record& record) const override;
  std::optional<Picture> Draw(const Record& record) const override;

  cv::Mat photo, screen;
  std::vector<cv::Point2f> corners;
  QVLcdResult result;
};

std::string LcdFinding::Report(const Record& record) const {
  const Phase& phase = record.phase;
  std::string text = Format("verdict    %d: %s%s\n", result.verdict_, result.reason_.c_str(),
                            LimitText(*phase.Find("verdict")).c_str());
  const auto value = [&](const char* figure, int decimals) { return ValueText(*phase.Find(figure), decimals); };
  text += "means      red " + value("mean_red", 2) + ", green " + value("mean_green", 2) + ", blue " +
          value("mean_blue", 2) + " of 255\n";
  text += "sides      " + value("ratio", 3) + " to 1" + LimitText(*phase.Find("ratio")) + "\n";
  text += "uniformity " + value("uniformity", 4) + LimitText(*phase.Find("uniformity")) + "\n";
  text += Format("dots       %d%s\n", result.error_count_, LimitText(*phase.Find("dot_count")).c_str());
  for (const QVRECT& r : result.error_areas_) {
    text += Format("           column %d to %d, row %d to %d of the screen\n", r.left, r.right, r.top, r.bottom);
  }
  return text;
}

// The photo with the screen outlined; beside it the screen, straightened, with its dots.
std::optional<Picture> LcdFinding::Draw(const Record& record) const {
  constexpr double kScreenPx = 560;
  if (record.phase.code != QV_SUCCESS && record.phase.code != QV_ERROR_PATTERN_NOT_FOUND) return std::nullopt;
  const double scale = FitScale(photo, 900);
  const double width = photo.cols * scale;
  const double whole = std::max(width + (screen.empty() ? 0 : kScreenPx + 20), 640.0);
  const auto pattern = record.request.parameters.at("pattern").get<std::string>();
  const std::string verdict = screen.empty()         ? ": no screen found"
                              : result.verdict_ == 1 ? ", verdict 1: " + result.reason_
                                                     : Format(", verdict %d", result.verdict_);
  const Heading heading(record, pattern + verdict, whole, {"ratio", "uniformity", "dot_count"});
  const double top = heading.height();
  Picture picture(cvRound(whole), cvRound(std::max(photo.rows * scale, 420.0) + top));
  heading.Draw(picture);
  const PhotoPlace place = picture.PlacePhoto(photo, {0, top}, scale);
  if (screen.empty()) return picture;
  Labels labels({0, top, width, photo.rows * scale});
  std::vector<cv::Point2d> outline;
  for (const cv::Point2f& corner : corners) outline.push_back(place(corner));
  picture.Line(outline, kGood, 2, true);
  for (std::size_t i = 0; i < outline.size(); ++i) {
    labels.Add(picture, {std::to_string(i)}, {outline[i], cv::Size2d(1, 1)}, kGood);
  }
  const PhotoPlace at = picture.PlacePhoto(screen, {width + 20, top}, FitScale(screen, kScreenPx));
  Labels levels({width + 20, top, screen.cols * at.scale, screen.rows * at.scale});
  for (const QVRECT& r : result.error_areas_) {
    const cv::Point2d middle((r.left + r.right) / 2.0, (r.top + r.bottom) / 2.0);
    const double radius = std::max(8.0, std::hypot(r.right - r.left + 1, r.bottom - r.top + 1) / 2 * at.scale + 4);
    picture.Circle(at(middle), radius, kPoor, 2);
    levels.Keep(cv::Rect2d(at(middle) - cv::Point2d(radius, radius), at(middle) + cv::Point2d(radius, radius)));
  }
  for (int i = 0; i < 9; ++i) {
    const int row = i / 3;
    const cv::Point2d point((2 * (i % 3) + 1) * screen.cols / 6.0, (2 * row + 1) * screen.rows / 6.0);
    PlaceWords words("");
    words.AddEntry(record.phase.Find("levels"), i);
    levels.Add(picture, {Format("%.0f", result.levels_[i]), words.Verdict()}, {at(point), cv::Size2d(1, 1)},
               words.tone(), 14);
  }
  DrawKey(picture, {width + 20, top + screen.rows * at.scale + 26},
          {{"mean grey level at each point", kGood}, {"dot", kPoor}});
  return picture;
}

void Collect(Phase& phase, const LcdFinding& found) {
  const QVLcdResult& r = found.result;
  Reading& verdict = phase.Add("verdict", r.verdict_);
  verdict.limit.min = 1;  // the library's own judgement is one, without a limits file too
  verdict.outcome = r.verdict_ == 1 ? Outcome::kPass : Outcome::kFail;
  const char* const channels[] = {"red", "green", "blue"};
  for (int i = 0; i < 3; ++i) {
    phase.Add(std::string("mean_") + channels[i], r.sums_[i]);
    phase.Add(std::string("share_") + channels[i], r.shares_[i]);
  }
  phase.Add("ratio", r.ratio_);
  phase.Add("levels", Numbers(9), {std::begin(r.levels_), std::end(r.levels_)});
  phase.Add("uniformity", r.uniformity_);
  phase.Add("dot_count", r.error_count_);
  std::vector<double> columns;
  std::vector<double> rows;
  for (const QVRECT& area : r.error_areas_) {
    columns.push_back((area.left + area.right) / 2.0);
    rows.push_back((area.top + area.bottom) / 2.0);
  }
  phase.Add("dots", columns, rows);
  columns.clear();
  rows.clear();
  for (const cv::Point2f& corner : found.corners) {
    columns.push_back(corner.x);
    rows.push_back(corner.y);
  }
  phase.Add("corners", columns, rows);
}

// What straightening to whole levels adds to a mean, in levels: it weighs four neighbours by 32nds of a pixel each way,
// and rounds halves up. Of sums in steps of 1 / q that is 1 / (2 q), unless neighbours are alike.
double HalvesRoundedUp(const LcdFinding& found, const cv::Mat& within) {
  constexpr int kPositions = 32;
  constexpr int kEvery = 5;  // rows and columns, which tell as much as all
  const cv::Size size = found.screen.size();
  const auto right = static_cast<float>(size.width - 0.5);
  const auto below = static_cast<float>(size.height - 0.5);
  const std::array<cv::Point2f, 4> edges = {{{-0.5f, -0.5f}, {right, -0.5f}, {right, below}, {-0.5f, below}}};
  const cv::Matx33d map(cv::getPerspectiveTransform(edges.data(), found.corners.data()));
  const auto step = [](double place) {  // largest power of two up to 32 that divides the position
    const int position = cvRound(place * kPositions) & (kPositions - 1);
    return position == 0 ? 1.0 : static_cast<double>(position & -position) / kPositions;
  };
  double sum = 0;
  int count = 0;
  for (int row = 0; row < size.height; row += kEvery) {
    for (int column = 0; column < size.width; column += kEvery, ++count) {
      const cv::Vec3d at = map * cv::Vec3d(column, row, 1);
      const double steps = step(at[0] / at[2]) * step(at[1] / at[2]);
      if (steps < 1) sum += steps / 2;
    }
  }
  const cv::Size pairs(within.cols - 1, within.rows);
  if (pairs.width < 1) return 0;
  const double differ = cv::norm(within(cv::Rect({0, 0}, pairs)), within(cv::Rect({1, 0}, pairs)), cv::NORM_L2SQR) /
                        (3.0 * pairs.area());  // of neighbours, squared
  return sum / count * (1 - std::exp(-CV_PI * CV_PI * differ / 2));
}

// By how much the screen's mean is off for each side found a pixel too far out: clockwise from the upper one.
std::array<cv::Vec3d, 4> OffBySides(const cv::Mat& screen) {
  constexpr int kStrip = 4;  // pixels
  const int w = screen.cols;
  const int h = screen.rows;
  const int strip = std::min({kStrip, w, h});
  const cv::Scalar mean = cv::mean(screen);
  std::array<cv::Vec3d, 4> off;
  const std::array<cv::Rect, 4> sides = {cv::Rect(0, 0, w, strip), cv::Rect(w - strip, 0, strip, h),
                                         cv::Rect(0, h - strip, w, strip), cv::Rect(0, 0, strip, h)};
  for (int i = 0; i < 4; ++i) {
    const cv::Scalar more = (cv::mean(screen(sides[i])) - mean) / (i % 2 == 0 ? h : w);
    off[i] = {more[0], more[1], more[2]};
  }
  return off;
}

cv::Mat PlainPhoto(const cv::Mat& photo) {
  cv::Mat plain;
  photo.convertTo(plain, CV_8U, photo.depth() == CV_16U ? 1.0 / 257 : 1);
  if (plain.channels() != 3)
    cv::cvtColor(plain, plain, plain.channels() == 1 ? cv::COLOR_GRAY2BGR : cv::COLOR_BGRA2BGR);
  return plain;
}

// Noise is that of the photo within the screen: straightening makes neighbours alike. Of the result field's and the
// bars' colours it is taken to be the same. Straightening rounds again, to whole levels; so does the change to grey.
void TrustMeans(Phase& phase, const LcdFinding& found, const CodecSteps& codec) {
  constexpr int kDraws = 2000;
  constexpr double kRounding = 1.0 / 12;  // variance of a whole level, of a pixel
  constexpr double kSidePx = 0.02;        // standard uncertainty of a side's place
  constexpr double kGreyOfRounded = 0.299 * 0.299 + 0.587 * 0.587 + 0.114 * 0.114;
  const cv::Mat photo = PlainPhoto(found.photo);
  const cv::Mat corners(found.corners);
  const cv::Rect bounds = cv::boundingRect(corners);
  const cv::Point middle = (bounds.tl() + bounds.br()) / 2;
  const cv::Size half(bounds.width / 4, bounds.height / 4);  // within, however it is turned
  const cv::Mat within = photo(cv::Rect(middle - cv::Point(half), half * 2) & cv::Rect({}, photo.size()));
  const MeanErrors errors(within, codec);
  const double halves = found.photo.depth() == CV_8U ? HalvesRoundedUp(found, within) : 0;
  const cv::Size size = found.screen.size();
  const double area = cv::contourArea(corners);
  const double rim = 2 * QVTester_LCD().margin_ * std::min(size.width, size.height);
  const double inner = area * (1 - rim / size.width) * (1 - rim / size.height);
  std::vector<cv::Vec3d> off = errors.OfMean(inner, kDraws);
  const std::array<cv::Vec3d, 4> by_side = OffBySides(PlainPhoto(found.screen));
  cv::RNG random(12);
  for (cv::Vec3d& one : off) {
    for (int k = 0; k < 3; ++k) one[k] += halves + std::sqrt(kRounding / inner) * random.gaussian(1);
    for (const cv::Vec3d& side : by_side) one += side * (kSidePx * random.gaussian(1));
  }
  const char* const channels[] = {"red", "green", "blue"};
  const QVLcdResult& r = found.result;
  for (int i = 0; i < 3; ++i) {
    const auto mean = [&](const cv::Vec3d& bgr, int k) { return std::max(r.sums_[k] + bgr[2 - k], 0.0); };
    phase.Find(std::string("mean_") + channels[i])->Trust({OfDrawn(off, r.sums_[i], [&](const cv::Vec3d& bgr) {
      return mean(bgr, i);
    })});
    phase.Find(std::string("share_") + channels[i])->Trust({OfDrawn(off, r.shares_[i], [&](const cv::Vec3d& bgr) {
      const double total = mean(bgr, 0) + mean(bgr, 1) + mean(bgr, 2);
      return total > 0 ? mean(bgr, i) / total : 0;
    })});
  }
  // Of a point, as the library has it; its rim's pixels, weighed in part, make it a third of one larger to noise.
  const int side = std::min(size.width, size.height) / 12;
  const double part = std::pow(side + 1.0 / 3, 2) * area / static_cast<double>(found.screen.total());  // of the photo
  const double rounded = kRounding * (1 + kGreyOfRounded) / part;
  std::vector<double> off_point = errors.OfGreyPart(part, kDraws);
  for (double& one : off_point) one += halves + std::sqrt(rounded) * random.gaussian(1);
  phase.Find("levels")->Trust(std::vector<Uncertainty>(9, FromErrors(std::move(off_point), kPixelMethod)));
  cv::Mat levels(3, 3, CV_64F);
  std::copy(std::begin(r.levels_), std::end(r.levels_), levels.begin<double>());
  phase.Find("uniformity")->Trust({errors.OfEvenness(levels, part, rounded, std::sqrt(9 * part / area))});
}

class Lcd : public Measurement {
 public:
  Lcd() {
    const QVTester_LCD defaults;
    spec_.name = "lcd";
    spec_.routine = "QVTester_LCD::JudgePattern";
    spec_.inputs = {{"photo", kSlot, "Photo of the display"}};
    Parameter pattern = {"pattern", Parameter::kWord, "P", "What the display was told to show"};
    pattern.words = kPatternNames;
    pattern.required = true;
    spec_.parameters = {pattern,
                        {"ratio", Parameter::kReal, "R", "Ratio of the display's sides, either way round",
                         defaults.expected_ratio_, 0.1, 10},
                        {"dot_threshold", Parameter::kReal, "SHARE", "How far a dot departs from what is about it",
                         defaults.dot_threshold_, 0.001, 10}};
    spec_.figures = Figures();
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    auto finding = std::make_unique<LcdFinding>();
    finding->photo = SlotPhoto(tester, kSlot);
    QVTester_LCD lcd;
    lcd.expected_ratio_ = request.parameters.at("ratio");
    lcd.dot_threshold_ = request.parameters.at("dot_threshold");
    const auto pattern = std::find(kPatternNames.begin(), kPatternNames.end(), request.parameters.at("pattern"));
    const auto index = static_cast<QV_LCD_PATTERN>(pattern - kPatternNames.begin());
    if (!RunRoutine(record.phase, spec_.routine,
                    [&] { return lcd.JudgePattern(finding->photo, index, &finding->result); })) {
      if (record.phase.code != QV_ERROR_PATTERN_NOT_FOUND) return finding;
      record.Say(Remark::kMiss, "no_screen", record.inputs[0].path + ": no screen is seen");
      record.meaning = "the pattern was not found";
      record.advice =
          "are all four of its sides in view, brighter than what lies around it, or darker if it is to be black?";
      return finding;
    }
    finding->corners = lcd.corners_;
    lcd.keep_corners_ = true;
    lcd.Straighten(finding->photo, lcd.screen_size_, finding->screen);
    Collect(record.phase, *finding);
    TrustMeans(record.phase, *finding, record.inputs.at(0).codec);
    if (finding->result.verdict_ != 1) record.Say(Remark::kWarning, "verdict", finding->result.reason_, "verdict");
    return finding;
  }

 private:
  static std::vector<Figure> Figures() {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    return {
        {"verdict", kOne, kWhole, nullptr, kVerdict, "1 when the display shows the pattern, else 0."},
        {"mean_red", kGreyLevel, kReal, nullptr, kMeans, "Mean of the red channel over the screen, 0 to 255."},
        {"mean_green", kGreyLevel, kReal, nullptr, kMeans, "Mean of the green channel over the screen, 0 to 255."},
        {"mean_blue", kGreyLevel, kReal, nullptr, kMeans, "Mean of the blue channel over the screen, 0 to 255."},
        {"share_red", kOne, kReal, nullptr, kMeans, "Share of red in the three means."},
        {"share_green", kOne, kReal, nullptr, kMeans, "Share of green in the three means."},
        {"share_blue", kOne, kReal, nullptr, kMeans, "Share of blue in the three means."},
        {"ratio", kOne, kReal, nullptr, kScreen, "Width to height of the screen as seen, foreshortened as it is."},
        {"levels", kGreyLevel, kReal, &kPointAxis, kMeans,
         "Mean grey at 3 x 3 points of the screen, row by row from the upper left."},
        {"uniformity", kOne, kReal, nullptr, kMeans, "Smallest over largest of the nine levels."},
        {"dot_count", kOne, kWhole, nullptr, kScreenDots, "Dots on the screen; none are looked for in a result field."},
        {"dots", kPixel, kReal, &kColumnAxis, kScreenDots,
         "Middles of the dots, column and row of the straightened screen."},
        {"corners", kPixel, kReal, &kColumnAxis, kScreen,
         "The screen's corners in the photo, column and row, clockwise from the upper left."},
    };
  }

  Spec spec_;
};

}  // namespace

const Measurement& LcdMeasurement() {
  static const Lcd lcd;
  return lcd;
}

}  // namespace qv
