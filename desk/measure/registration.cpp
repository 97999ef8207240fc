// A picture brought into the frame of a reference.

#include <algorithm>
#include <cmath>
#include <numeric>
#include <opencv2/imgproc.hpp>

#include "desk/base/text.h"
#include "desk/measure/areas.h"
#include "desk/measure/heading.h"
#include "desk/measure/load.h"
#include "desk/measure/residual_trust.h"
#include "desk/measure/robust_map.h"
#include "desk/measure/run_test.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr Method kSurf = {
    "SURF key points, the affine map of the three best of the good matches",
    "Median error {registration_median} on drawn textures with shift, turn, scale, gain and 3 % noise, more on "
    "photos (3.9 px were seen); {registration_near} are within 10 px, the others are doubted: at most "
    "{doubts_maps} of the maps that pass are off by over 3 px.",
    "Moved by false matches among the three best: repeated texture, noise, blur."};

constexpr Method kRobust = {"SIFT features matched both ways, RANSAC, then the enhanced correlation of both pictures",
                            "Of textured pairs with shift, turn, scale, gain and 3 % noise {robust_within} are right "
                            "to 0.3 px, the median to {robust_median}.",
                            "Moved by depth in the scene and by lens distortion, which no affine map follows."};

constexpr double kMostApart = 3;  // pixels between both maps
constexpr double kAgreePx = 3;
constexpr double kLeastAgreeing = 0.25;  // of the good matches
constexpr double kMostStretch = 1.2;

struct Pose {
  cv::Point2d shift;  // of the reference's middle
  double turn_deg, scale, stretch;
};

// The parts of an affine map: its linear part is a turn after a stretch along some direction (polar decomposition).
Pose Decompose(const cv::Matx23d& m, cv::Size reference) {
  const cv::Vec3d middle((reference.width - 1) / 2.0, (reference.height - 1) / 2.0, 1);
  const cv::Vec2d to = m * middle;
  const cv::Matx22d linear(m(0, 0), m(0, 1), m(1, 0), m(1, 1));
  cv::Vec2d enlargements;
  cv::SVD::compute(linear, enlargements, cv::SVD::NO_UV);
  // Rows run down, so a turn that raises columns with rows is counter-clockwise.
  return {{to[0] - middle[0], to[1] - middle[1]},
          std::atan2(m(0, 1) - m(1, 0), m(0, 0) + m(1, 1)) * 180 / CV_PI,
          std::sqrt(std::fabs(cv::determinant(linear))),
          enlargements[0] / enlargements[1]};
}

// Whether the map explains it.
bool Agrees(const QVTester::Unwarp& found, const cv::DMatch& match) {
  const cv::Point2d from = found.reference_keypoints[match.queryIdx].pt;
  const cv::Point2d to = found.image_keypoints[match.trainIdx].pt;
  const cv::Vec2d at = cv::Matx23d(found.matrix) * cv::Vec3d(from.x, from.y, 1);
  return std::hypot(at[0] - to.x, at[1] - to.y) <= kAgreePx;
}

int CountAgreeing(const QVTester::Unwarp& found) {
  return static_cast<int>(std::count_if(found.good.begin(), found.good.end(),
                                        [&](const cv::DMatch& match) { return Agrees(found, match); }));
}

void AddMatrix(Phase& phase, const char* figure, const cv::Mat& map) {
  const std::vector<double> matrix(map.begin<double>(), map.end<double>());
  std::vector<double> numbers(matrix.size());
  std::iota(numbers.begin(), numbers.end(), 0);
  phase.Add(figure, numbers, matrix);
}

void CollectRobust(Phase& phase, const QVTester::Unwarp& found, const RobustMap& robust) {
  phase.Add("robust_matches", robust.matches);
  phase.Add("robust_agreeing_matches", robust.agreeing);
  if (robust.matrix.empty()) return;
  AddMatrix(phase, "robust_matrix", robust.matrix);
  phase.Add("robust_residual", robust.residual_px);
  phase.Add("robust_correlation", robust.correlation);
  phase.Add("map_distance", MapDistance(found.matrix, robust.matrix, found.reference.size()));
}

void Collect(Phase& phase, const QVTester::Unwarp& found) {
  phase.Add("good_matches", static_cast<double>(found.good.size()));
  phase.Add("agreeing_matches", CountAgreeing(found));
  AddMatrix(phase, "matrix", found.matrix);
  const Pose pose = Decompose(cv::Matx23d(found.matrix), found.reference.size());
  phase.Add("shift_columns", pose.shift.x);
  phase.Add("shift_rows", pose.shift.y);
  phase.Add("turn", pose.turn_deg);
  phase.Add("scale", pose.scale);
  phase.Add("stretch", pose.stretch);
}

// The method trusts its three best matches: what the others say of them tells a false map.
void LookAtFixed(Record& record, const RobustMap& robust) {
  const double good = record.phase.Find("good_matches")->value();
  const double agreeing = record.phase.Find("agreeing_matches")->value();
  const double stretch = record.phase.Find("stretch")->value();
  if (agreeing >= kLeastAgreeing * good && agreeing > 3 && stretch <= kMostStretch) {
    const Reading* apart = record.phase.Find("map_distance");
    if (robust.doubt.empty() && apart != nullptr && apart->value() > kMostApart) {
      record.Say(Doubt::kMapsDiffer,
                 Format("%s: doubtful: the map of all matches lies %.1f px away; --map robust takes that one",
                        record.inputs[1].path.c_str(), apart->value()),
                 "map_distance");
    }
    return;
  }
  const std::string shape = stretch < 1000 ? Format("stretches the picture by %.2f", stretch) : "folds it to a line";
  record.Say(Doubt::kMapNotAgreed,
             Format("%s: doubtful: %.0f of %.0f good matches agree with the map, which %s; one of the "
                    "three matches that make it may be false",
                    record.inputs[1].path.c_str(), agreeing, good, shape.c_str()),
             "agreeing_matches");
}

void LookAtRobust(Record& record, const RobustMap& robust) {
  if (robust.doubt.empty()) return;
  record.Say(Doubt::kRobustMap, Format("%s: doubtful: %s", record.inputs[1].path.c_str(), robust.doubt.c_str()),
             "robust_matches");
}

class RegistrationFinding : public Finding {
 public:
  std::string Report(const Record& record) const override {
    const auto value = [&](const char* figure) { return record.phase.Find(figure)->value(); };
    const auto text = [&](const char* figure, int decimals) {
      return ValueText(*record.phase.Find(figure), decimals) + LimitText(*record.phase.Find(figure));
    };
    const std::vector<double>& m = record.phase.Find("matrix")->values;
    return Format("matches    %.0f good, %.0f agree with the map\n", value("good_matches"), value("agreeing_matches")) +
           "shift      " + text("shift_columns", 2) + " columns, " + text("shift_rows", 2) + " rows\n" + "turn       " +
           text("turn", 3) + " degrees counter-clockwise\n" + "scale      " + text("scale", 4) + ", stretch " +
           text("stretch", 4) + "\n" +
           Format("matrix     %11.6f %11.6f %11.3f\n           %11.6f %11.6f %11.3f\n", m[0], m[1], m[2], m[3], m[4],
                  m[5]) +
           ReportRobust(record);
  }

  // The good matches between both pictures: those that the map explains above those that it does not.
  std::optional<Picture> Draw(const Record& record) const override {
    constexpr double kKey = 28;
    if (record.phase.code != QV_SUCCESS) return std::nullopt;
    const double scale = std::min(FitScale(unwarp.reference, 1000), FitScale(unwarp.image, 1000));
    const double middle = unwarp.reference.cols * scale;
    const double width = std::max(640.0, middle + unwarp.image.cols * scale);
    const int agreeing = CountAgreeing(unwarp);
    const Heading heading(record, "Registration", width,
                          {"shift_columns", "shift_rows", "turn", "scale", "map_distance"});
    const double top = heading.height() + kKey;
    Picture picture(cvRound(width), cvRound(std::max(unwarp.reference.rows, unwarp.image.rows) * scale + top));
    heading.Draw(picture);
    DrawKey(picture, {12, top - 10},
            {{Format("matches within %.0f px of the map: %d, ", kAgreePx, agreeing) +
                  VerdictText(*record.phase.Find("agreeing_matches")),
              kGood},
             {Format("further off: %zu", unwarp.good.size() - agreeing), kPoor}});
    const PhotoPlace left = picture.PlacePhoto(unwarp.reference, {0, top}, scale);
    const PhotoPlace right = picture.PlacePhoto(unwarp.image, {middle, top}, scale);
    for (const bool agrees : {false, true}) {
      for (const cv::DMatch& match : unwarp.good) {
        if (Agrees(unwarp, match) != agrees) continue;
        const cv::Point2d from = left(unwarp.reference_keypoints[match.queryIdx].pt);
        const cv::Point2d to = right(unwarp.image_keypoints[match.trainIdx].pt);
        const Colour colour = OnLabel(agrees ? kGood : kPoor);
        picture.Line({from, to}, colour, 1, false, agrees ? Dash::kSolid : Dash::kDashed);
        for (const cv::Point2d& end : {from, to}) picture.Circle(end, 3, colour, 1);
      }
    }
    return picture;
  }

  cv::Mat Product() const override { return product; }

  cv::Mat product;  // the image in the reference's frame, by the map that was asked for
  QVTester::Unwarp unwarp;

 private:
  static std::string ReportRobust(const Record& record) {
    const Reading* matrix = record.phase.Find("robust_matrix");
    const double matches = record.phase.Find("robust_matches")->value();
    if (matrix == nullptr) return Format("all        %.0f matches, no map\n", matches);
    const std::vector<double>& m = matrix->values;
    return Format("all        %.0f matches, %.0f agree, correlation %.4f, %.3f px from the map above\n", matches,
                  record.phase.Find("robust_agreeing_matches")->value(),
                  record.phase.Find("robust_correlation")->value(), record.phase.Find("map_distance")->value()) +
           Format("matrix     %11.6f %11.6f %11.3f\n           %11.6f %11.6f %11.3f\n", m[0], m[1], m[2], m[3], m[4],
                  m[5]);
  }
};

class Registration : public Measurement {
 public:
  Registration() {
    spec_.name = "registration";
    spec_.routine = "GetUnwarpedImage";
    spec_.inputs = {{"reference", QV_RESOURCE_CHART_STANDARD, "Picture whose frame is taken"},
                    {"image", QV_RESOURCE_CHART_PHOTO, "Picture of the same scene, brought into that frame"}};
    spec_.parameters = {{"map",
                         Parameter::kWord,
                         "MAP",
                         "Map that the picture is brought by, and judged: the test's own of three matches, or that of "
                         "all",
                         "fixed",
                         0,
                         0,
                         {"fixed", "robust"}}};
    spec_.figures = Figures();
  }

  const Spec& spec() const override { return spec_; }

  std::unique_ptr<Finding> Run(QVTester& tester, const Request& request, Record& record) const override {
    auto finding = std::make_unique<RegistrationFinding>();
    const cv::Mat reference = SlotPhoto(tester, QV_RESOURCE_CHART_STANDARD);
    const cv::Mat image = SlotPhoto(tester, QV_RESOURCE_CHART_PHOTO);
    const bool found = RunRoutine(record.phase, spec_.routine,
                                  [&] { return tester.GetUnwarpedImage(reference, image, finding->product); });
    if (!found) return finding;
    finding->unwarp = tester.kept_->unwarp;
    Collect(record.phase, finding->unwarp);
    const RobustMap robust = FindRobustMap(tester, reference, image);
    CollectRobust(record.phase, finding->unwarp, robust);
    TrustMaps(record.phase, reference, image, finding->unwarp.matrix, robust);
    if (request.parameters.at("map") == "fixed") {
      LookAtFixed(record, robust);
      return finding;
    }
    LookAtRobust(record, robust);
    if (robust.matrix.empty()) {
      finding->product.release();
    } else {
      cv::warpAffine(image, finding->product, robust.matrix, reference.size(), cv::INTER_LINEAR | cv::WARP_INVERSE_MAP,
                     cv::BORDER_REPLICATE);
    }
    return finding;
  }

 private:
  static std::vector<Figure> Figures() {
    constexpr auto kWhole = Number::kWhole;
    constexpr auto kReal = Number::kReal;
    return {
        {"good_matches", kOne, kWhole, nullptr, kSurf, "Feature matches within the distance limit; three are needed."},
        {"agreeing_matches", kOne, kWhole, nullptr, kSurf,
         "Good matches that the map explains to within 3 px. The three that make the map always agree: a map that few "
         "others agree with is doubtful."},
        {"matrix", kOne, kReal, &kMatrixAxis, kSurf,
         "a, b, c, d, e, f: column = a x + b y + c and row = d x + e y + f in the image, for column x and row y of the "
         "reference."},
        {"shift_columns", kPixel, kReal, nullptr, kSurf, "How far the reference's middle has moved to the right."},
        {"shift_rows", kPixel, kReal, nullptr, kSurf, "How far the reference's middle has moved down."},
        {"turn", kDegree, kReal, nullptr, kSurf, "Turn of the image against the reference, counter-clockwise."},
        {"scale", kOne, kReal, nullptr, kSurf, "Size of the scene in the image over that in the reference."},
        {"stretch", kOne, kReal, nullptr, kSurf,
         "Largest over smallest enlargement along any direction; 1 when the map keeps shapes."},
        {"robust_matches", kOne, kWhole, nullptr, kRobust, "Feature matches that are unambiguous, both ways."},
        {"robust_agreeing_matches", kOne, kWhole, nullptr, kRobust, "Of these, within 3 px of the map of all matches."},
        {"robust_matrix", kOne, kReal, &kMatrixAxis, kRobust, "The map of all matches, as the matrix above."},
        {"robust_residual", kPixel, kReal, nullptr, kRobust,
         "Root mean square distance of the agreeing matches from their map, before it is refined."},
        {"robust_correlation", kOne, kReal, nullptr, kRobust,
         "Of both pictures by the refined map, up to 1; none where it was not refined."},
        {"map_distance", kPixel, kReal, nullptr, kRobust,
         "Mean distance over the reference between where the two maps put it."},
    };
  }

  Spec spec_;
};

}  // namespace

const Measurement& RegistrationMeasurement() {
  static const Registration registration;
  return registration;
}

}  // namespace qv
