// Tests 27 and 28: light, colour and dots of lit regions.

#include <algorithm>
#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/areas.h"
#include "desk/measure/codec_steps.h"
#include "desk/measure/heading.h"
#include "desk/measure/light_trust.h"
#include "desk/measure/load.h"
#include "desk/measure/regions.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kLight = {
    "means over the region's pixels, linear light by the transfer function of IEC 61966-2-1",
    "Exact for the photo as stored; x and y within {lights_xy} of simulated black bodies at 2 % noise.",
    "Moved by exposure, clipping, white balance and the camera's own colour matrix: comparable "
    "between photos of one camera at one setting."};
constexpr Method kTemperature = {
    "correlated colour temperature by a fit to the Planckian locus on either side of 5550 K",
    "The fit alone is off by up to {lights_fit} from 2,700 to 10,000 K on the locus.",
    "Moved as x and y are, and more the further the light lies from the locus; 0 where the fit has no answer."};
constexpr Method kEvenness = {"smallest over largest mean of 8 x 8 equal blocks", "Exact for the photo as stored.",
                              "Moved by a lens's own fall-off, by spots, and by a region that reaches over the rim."};
constexpr Method kLightDots = {
    "relative difference of grey to the mean of a square window, areas merged within the distance",
    "Of squares 40 % darker {lights_spots} of 2 px and more are found at 1 % noise; of 25 % {lights_spots} from 3 px, "
    "of "
    "15 % {lights_spots} from 5 px.",
    "Moved by noise, by the window's size and by what else lies in it."};

constexpr double kClipped = 0.01;  // share of a region's pixels, above which its colour is another one
constexpr double kDarkGrey = 5;    // mean grey, below which a colour is one of noise

struct LightTest {
  const char* name;
  QV_TEST_INDEX test;
  InputSpec input;
  QVRegionList QVTester::*list;
  int QVTester::*count;
  QVLightResult QVResultData::*result;
};

const LightTest kLightTests[] = {{"led_light",
                                  QV_TEST_LED_LIGHT,
                                  {"photo", QV_RESOURCE_LED_PHOTO, "Photo of the indicator light"},
                                  &QVTester::prop_region_list_0_,
                                  &QVTester::prop_region_count_0_,
                                  &QVResultData::led_},
                                 {"touch_panel_led",
                                  QV_TEST_TOUCH_PANEL_LED,
                                  {"photo", QV_RESOURCE_TOUCH_PANEL_LED_PHOTO, "Photo of the touch panel's lights"},
                                  &QVTester::prop_region_list_1_,
                                  &QVTester::prop_region_count_1_,
                                  &QVResultData::touch_led_}};

using Regions = std::vector<QVLightRegion>;

struct LightFigure {
  Figure figure;
  double (*of)(const QVLightRegion& region);
  bool least, most;                                      // has figures of its own, for limits
  const Uncertainty& (*trust)(const LightTrust& trust);  // null for whole numbers
};

const std::vector<LightFigure>& LightFigures() {
  constexpr auto kWhole = Number::kWhole;
  constexpr auto kReal = Number::kReal;
  using R = const QVLightRegion&;
  using T = const LightTrust&;
  using U = const Uncertainty&;
  static const std::vector<LightFigure> figures = {
      {{"label", kOne, kWhole, &kRegionAxis, kLight, "Label of each region."},
       [](R r) -> double { return r.label_; },
       false,
       false,
       nullptr},
      {{"mean_grey", kGreyLevel, kReal, &kRegionAxis, kLight, "Mean grey level of each region, 0 to 255."},
       [](R r) -> double { return r.mean_grey_; },
       true,
       true,
       [](T t) -> U { return t.mean_grey; }},
      {{"linear_red", kOne, kReal, &kRegionAxis, kLight, "Mean red light of each region, 0 to 1."},
       [](R r) -> double { return r.linear_rgb_[0]; },
       false,
       false,
       [](T t) -> U { return t.linear[0]; }},
      {{"linear_green", kOne, kReal, &kRegionAxis, kLight, "Mean green light of each region, 0 to 1."},
       [](R r) -> double { return r.linear_rgb_[1]; },
       false,
       false,
       [](T t) -> U { return t.linear[1]; }},
      {{"linear_blue", kOne, kReal, &kRegionAxis, kLight, "Mean blue light of each region, 0 to 1."},
       [](R r) -> double { return r.linear_rgb_[2]; },
       false,
       false,
       [](T t) -> U { return t.linear[2]; }},
      {{"luminance", kOne, kReal, &kRegionAxis, kLight, "CIE Y of each region; white of level 255 is 1."},
       [](R r) -> double { return r.xyz_[1]; },
       true,
       true,
       [](T t) -> U { return t.luminance; }},
      {{"chromaticity_x", kOne, kReal, &kRegionAxis, kLight, "CIE x of each region; none where there is no light."},
       [](R r) -> double { return r.chromaticity_[0]; },
       true,
       true,
       [](T t) -> U { return t.chromaticity[0]; }},
      {{"chromaticity_y", kOne, kReal, &kRegionAxis, kLight, "CIE y of each region; none where there is no light."},
       [](R r) -> double { return r.chromaticity_[1]; },
       true,
       true,
       [](T t) -> U { return t.chromaticity[1]; }},
      {{"cct", kKelvin, kReal, &kRegionAxis, kTemperature,
        "Correlated colour temperature of each region; 0 where there "
        "is none."},
       [](R r) -> double { return r.cct_; },
       true,
       true,
       [](T t) -> U { return t.cct; }},
      {{"clipped_share", kOne, kReal, &kRegionAxis, kLight, "Share of each region's pixels with a channel at 255."},
       [](R r) -> double { return r.clipped_share_; },
       false,
       true,
       [](T t) -> U { return t.clipped_share; }},
      {{"uniformity", kOne, kReal, &kRegionAxis, kEvenness, "Darkest over lightest block of each region; 1 is even."},
       [](R r) -> double { return r.uniformity_; },
       true,
       false,
       [](T t) -> U { return t.uniformity; }},
  };
  return figures;
}

// A colour's figure for people: the dark has none, nor has a light too far from white a temperature.
std::string ColourText(const char* format, double value) {
  return std::isnan(value) || value == 0 ? "none" : Format(format, value);
}

// The least and the largest of all regions, which limits may be set on.
struct Extreme {
  std::string name, docstring;
  const LightFigure* figure;
  bool most;
};

const std::vector<Extreme>& Extremes() {
  static const std::vector<Extreme> extremes = [] {
    std::vector<Extreme> all;
    for (const LightFigure& row : LightFigures()) {
      const std::string name = row.figure.name;
      if (row.least) all.push_back({name + "_min", "Smallest " + name + " of all regions.", &row, false});
      if (row.most) all.push_back({name + "_max", "Largest " + name + " of all regions.", &row, true});
    }
    return all;
  }();
  return extremes;
}

// NaN where a region has none: what is missing is no extreme, and breaks a limit.
double ExtremeOf(const Extreme& extreme, const Regions& regions) {
  double value = NAN;
  for (const QVLightRegion& region : regions) {
    const double one = extreme.figure->of(region);
    if (std::isnan(one)) return one;
    if (std::isnan(value) || (extreme.most ? one > value : one < value)) value = one;
  }
  return value;
}

// Each region's, and of the least and the largest that of the region that it is of.
void TrustLights(Phase& phase, const std::vector<LightTrust>& trusts) {
  for (const LightFigure& row : LightFigures()) {
    if (row.trust == nullptr) continue;
    std::vector<Uncertainty> known;
    for (const LightTrust& trust : trusts) known.push_back(row.trust(trust));
    phase.Find(row.figure.name)->Trust(std::move(known));
  }
  for (const Extreme& extreme : Extremes()) {
    const std::vector<double>& all = phase.Find(extreme.figure->figure.name)->values;
    Reading& reading = *phase.Find(extreme.name);
    const auto whose = std::find(all.begin(), all.end(), reading.value());
    if (whose != all.end()) reading.Trust({extreme.figure->trust(trusts[whose - all.begin()])});
  }
}

void Collect(Phase& phase, const Regions& regions, const Areas& areas) {
  phase.Add("region_count", static_cast<double>(regions.size()));
  std::vector<double> numbers(regions.size());
  for (std::size_t i = 0; i < regions.size(); ++i) numbers[i] = static_cast<double>(i);
  for (const LightFigure& row : LightFigures()) {
    std::vector<double> values;
    for (const QVLightRegion& region : regions) values.push_back(row.of(region));
    phase.Add(row.figure.name, numbers, values);
  }
  for (const Extreme& extreme : Extremes()) phase.Add(extreme.name, ExtremeOf(extreme, regions));
  AddAreas(phase, areas);
}

void Look(Record& record, const Regions& regions, const Areas& areas) {
  const char* const path = record.inputs[0].path.c_str();
  const int window = 2 * record.request.parameters.at("radius").get<int>() + 1;
  for (const QVLightRegion& region : regions) {
    const std::string which = regions.size() == 1 ? path : Format("%s: region with label %d", path, region.label_);
    if (region.clipped_share_ > kClipped) {
      record.Say(Doubt::kClipped,
                 Format("%s: doubtful: %.0f %% of its pixels are clipped, and its colour is another one; expose less",
                        which.c_str(), 100 * region.clipped_share_),
                 "clipped_share_max");
    }
    if (region.mean_grey_ < kDarkGrey) {
      record.Say(Remark::kWarning, "dark_region",
                 Format("%s: mean grey %.1f: is it lit? Its colour is one of noise", which.c_str(), region.mean_grey_),
                 "mean_grey_min");
    }
    if (region.width_ < window || region.height_ < window) {
      record.Say(Doubt::kSmallRegion,
                 Format("%s: doubtful: smaller than the dots' window, %d x %d pixels: no dots were looked for; use a "
                        "smaller --radius",
                        which.c_str(), window, window),
                 "area_count");
    }
  }
  if (areas.rectangles.size() > kMostSpots) {
    record.Say(Doubt::kTooManyDots,
               Format("%s: doubtful: %zu separate dots are noise, not defects; use a higher --threshold", path,
                      areas.rectangles.size()),
               "area_count");
  }
}

class LightFinding : public Finding {
 public:
  explicit LightFinding(cv::Mat photo) : photo_(std::move(photo)) {}

  std::string Report(const Record& record) const override {
    std::string text = "region  label   grey      Y        x       y      CCT   clipped  uniformity\n";
    for (std::size_t i = 0; i < regions.size(); ++i) {
      const QVLightRegion& r = regions[i];
      text += Format("%6zu %6d %6.1f %7.4f  %7s %7s %8s %7.1f %% %8.3f\n", i, r.label_, r.mean_grey_, r.xyz_[1],
                     ColourText("%.4f", r.chromaticity_[0]).c_str(), ColourText("%.4f", r.chromaticity_[1]).c_str(),
                     ColourText("%.0f K", r.cct_).c_str(), 100 * r.clipped_share_, r.uniformity_);
      if (record.phase.Find("mean_grey")->uncertainties.empty()) continue;
      const auto plus = [&](const char* figure, const char* format, double unit = 1) {
        const std::vector<Uncertainty>& known = record.phase.Find(figure)->uncertainties;
        return i < known.size() ? Format(format, unit * known[i].expanded) : std::string("-");
      };
      text += Format("%6s \u00b1 %4s %6s %7s  %7s %7s %8s %7s %% %8s\n", "", "", plus("mean_grey", "%.1f").c_str(),
                     plus("luminance", "%.4f").c_str(), plus("chromaticity_x", "%.4f").c_str(),
                     plus("chromaticity_y", "%.4f").c_str(), plus("cct", "%.0f K").c_str(),
                     plus("clipped_share", "%.1f", 100).c_str(), plus("uniformity", "%.3f").c_str());
    }
    const Reading& count = *record.phase.Find("area_count");
    text += Format("areas of dots  %.0f%s\n", count.value(), LimitText(count).c_str()) + AreaLines(areas, "pixels");
    for (const Extreme& extreme : Extremes()) {
      const Reading& reading = *record.phase.Find(extreme.name);
      if (!reading.limit.given()) continue;
      const std::string value = std::isnan(reading.value()) ? "none" : Format("%.4g", reading.value());
      text += extreme.name + "  " + value + LimitText(reading) + "\n";
    }
    return text;
  }

  std::optional<Picture> Draw(const Record& record) const override {
    constexpr double kSide = 1280;
    if (record.phase.code != QV_SUCCESS) return std::nullopt;
    const double fit = FitScale(photo_, kSide);  // a small photo is enlarged: a region's words are wide
    const double scale = fit < 1 ? fit : std::clamp(std::floor(kSide / std::max(photo_.cols, photo_.rows)), 1.0, 4.0);
    constexpr double kKey = 34;
    const double width = std::max(640.0, photo_.cols * scale);
    const Heading heading(record, "Lights", width, {"region_count", "area_count"});
    const double top = heading.height() + kKey;
    Picture picture(cvRound(width), cvRound(photo_.rows * scale + top));
    heading.Draw(picture);
    DrawKey(picture, {12, top - 16},
            {{"region", kGood}, {"clipped region, dark dots", kPoor}, {"dark region, bright dots", kDoubtful}});
    const PhotoPlace place = picture.PlacePhoto(photo_, {0, top}, scale);
    Labels labels({0, top, width, photo_.rows * scale});
    std::vector<cv::Rect2d> boxes;
    for (const QVLightRegion& r : regions) {
      const cv::Point2d from = place(cv::Point2d(r.left_, r.top_) - cv::Point2d(0.5, 0.5));
      const cv::Point2d to = from + cv::Point2d(r.width_, r.height_) * scale;
      picture.Line({from, {to.x, from.y}, to, {from.x, to.y}}, ToneOf(r), 2, true);
      boxes.emplace_back(from, to);
    }
    DrawAreas(picture, labels, place, areas, record.phase, TonesOfAreas());
    for (const cv::Rect2d& box : boxes) labels.Keep(box);
    for (std::size_t i = 0; i < regions.size(); ++i) {
      const PlaceWords words = WordsOf(record.phase, i);
      labels.Add(picture, words.Lines(), boxes[i], words.tone(), 13);
    }
    return picture;
  }

  const cv::Mat& photo() const { return photo_; }

  Regions regions;
  Areas areas;

 private:
  static Tone ToneOf(const QVLightRegion& r) {
    return r.clipped_share_ > kClipped ? kPoor : r.mean_grey_ < kDarkGrey ? kDoubtful : kGood;
  }

  // Its colour, and each of its figures that has a limit, as an entry or as the least or largest of all regions.
  PlaceWords WordsOf(const Phase& phase, std::size_t i) const {
    const QVLightRegion& r = regions[i];
    const bool lit = !std::isnan(r.chromaticity_[0]);
    const std::string colour = lit ? Format("x %.3f y %.3f", r.chromaticity_[0], r.chromaticity_[1]) : "no light";
    PlaceWords words(Format("%d: ", r.label_) + colour + (r.cct_ > 0 ? Format(", %.0f K", r.cct_) : ""), ToneOf(r));
    for (const LightFigure& row : LightFigures()) words.AddEntry(phase.Find(row.figure.name), i);
    for (const Extreme& extreme : Extremes()) {
      words.AddExtreme(phase.Find(extreme.name), extreme.most, *phase.Find(extreme.figure->figure.name), i);
    }
    return words;
  }

  // Dark dots are red, bright ones yellow.
  std::vector<Tone> TonesOfAreas() const {
    std::vector<Tone> tones;
    for (const cv::Rect& area : areas.rectangles) {
      const cv::Rect about =
          cv::Rect(area.x - area.width - 3, area.y - area.height - 3, 3 * area.width + 6, 3 * area.height + 6) &
          cv::Rect({}, photo_.size());
      const cv::Scalar inside = cv::mean(photo_(area & cv::Rect({}, photo_.size())));
      const cv::Scalar all = cv::mean(photo_(about));
      tones.push_back(inside[0] + inside[1] + inside[2] < all[0] + all[1] + all[2] ? kPoor : kDoubtful);
    }
    return tones;
  }

  cv::Mat photo_;
};

class Lights : public Measurement {
 public:
  explicit Lights(const LightTest& test) : test_(test) {
    spec_.name = test.name;
    spec_.test = test.test;
    spec_.inputs = {test.input};
    spec_.parameters = {{"regions", Parameter::kRegions, "REGIONS",
                         "Where the lights are: left,top,width,height,label;... in pixels, or a JSON file of them; "
                         "without it the whole photo is one region"},
                        {"threshold",
                         Parameter::kReal,
                         "SHARE",
                         "Departure from the local mean that makes a dot, a share",
                         nullptr,
                         0,
                         1000,
                         {},
                         QV_PROPERTY_DOT_THRESHOLD},
                        {"radius",
                         Parameter::kWhole,
                         "PX",
                         "Half the side of the window of the local mean",
                         nullptr,
                         0,
                         10'000,
                         {},
                         QV_PROPERTY_DOT_RADIUS}};
    for (const Parameter& parameter : AreaParameters()) spec_.parameters.push_back(parameter);
    spec_.figures = Figures();
    spec_.advice = "is it a photo of the lit panel, of 8 bits a channel, with all regions inside?";
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    auto finding = std::make_unique<LightFinding>(SlotPhoto(tester, test_.input.slot));
    if (!Fit(request, finding->photo().size(), record)) return finding;
    const SetRegions regions(tester, request.parameters.value("regions", Json()), test_.list, test_.count);
    const QVResultData* const results = RunNumberedTest(tester, spec_, request, record.phase);
    if (results == nullptr) return finding;
    const QVLightResult& found = results->*test_.result;
    finding->regions.assign(found.regions_, found.regions_ + found.region_count_);
    finding->areas = AreasOf(found.error_count_, found.error_areas_, found.error_pixels_);
    Collect(record.phase, finding->regions, finding->areas);
    const CodecSteps codec = record.inputs.at(0).codec;
    std::vector<LightTrust> trusts;
    for (const QVLightRegion& region : finding->regions) {
      trusts.push_back(TrustInLight(finding->photo(), region, codec));
    }
    TrustLights(record.phase, trusts);
    Look(record, finding->regions, finding->areas);
    return finding;
  }

 private:
  static std::vector<Figure> Figures() {
    std::vector<Figure> figures = {
        {"region_count", kOne, Number::kWhole, nullptr, kLight, "Regions that were measured."}};
    for (const LightFigure& row : LightFigures()) figures.push_back(row.figure);
    for (const Extreme& extreme : Extremes()) {
      Figure figure = extreme.figure->figure;
      figure.name = extreme.name.c_str();
      figure.docstring = extreme.docstring.c_str();
      figure.axis = nullptr;
      figures.push_back(figure);
    }
    for (const Figure& figure : AreaFigures(kLightDots)) figures.push_back(figure);
    return figures;
  }

  // Said before the test refuses them, in plain words.
  static bool Fit(const Request& request, cv::Size photo, Record& record) {
    for (const Json& r : request.parameters.value("regions", Json::array())) {
      const std::int64_t left = r[0];
      const std::int64_t top = r[1];
      if (left >= 0 && top >= 0 && left + r[2].get<std::int64_t>() <= photo.width &&
          top + r[3].get<std::int64_t>() <= photo.height) {
        continue;
      }
      record.phase.code = QV_ERROR_UNUSABLE_INPUT;
      record.Say(Remark::kMiss, "region_outside",
                 Format("%s: region with label %d (left %d, top %d, %d x %d) does not lie inside the photo of %d x %d",
                        record.inputs[0].path.c_str(), r[4].get<int>(), r[0].get<int>(), r[1].get<int>(),
                        r[2].get<int>(), r[3].get<int>(), photo.width, photo.height));
      record.meaning = "a region lies outside";
      record.advice = "are these the regions of photos of that size?";
      return false;
    }
    return true;
  }

  const LightTest& test_;
  Spec spec_;
};

}  // namespace

const Measurement& LightsMeasurement(bool touch_panel) {
  static const Lights led(kLightTests[0]);
  static const Lights panel(kLightTests[1]);
  return touch_panel ? panel : led;
}

}  // namespace qv
