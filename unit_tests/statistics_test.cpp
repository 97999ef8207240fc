#include "desk/results/statistics.h"

#include <gmock/gmock.h>

#include <cmath>
#include <limits>

#include "desk/base/failure.h"

namespace qv {
namespace {

// The published example of AIAG's manual: 10 parts, operators A, B, C, 3 trials; rows are an operator's trial.
constexpr double kManual[9][10] = {{0.29, -0.56, 1.34, 0.47, -0.80, 0.02, 0.59, -0.31, 2.26, -1.36},
                                   {0.41, -0.68, 1.17, 0.50, -0.92, -0.11, 0.75, -0.20, 1.99, -1.25},
                                   {0.64, -0.58, 1.27, 0.64, -0.84, -0.21, 0.66, -0.17, 2.01, -1.31},
                                   {0.08, -0.47, 1.19, 0.01, -0.56, -0.20, 0.47, -0.63, 1.80, -1.68},
                                   {0.25, -1.22, 0.94, 1.03, -1.20, 0.22, 0.55, 0.08, 2.12, -1.62},
                                   {0.07, -0.68, 1.34, 0.20, -1.28, 0.06, 0.83, -0.34, 2.19, -1.50},
                                   {0.04, -1.38, 0.88, 0.14, -1.46, -0.29, 0.02, -0.46, 1.77, -1.49},
                                   {-0.11, -1.13, 1.09, 0.20, -1.07, -0.67, 0.01, -0.56, 1.45, -1.77},
                                   {-0.15, -0.96, 0.67, 0.11, -1.45, -0.49, 0.21, -0.49, 1.87, -2.16}};

// 5 parts x 3 operators x 2 trials in which an operator sees odd parts differently.
constexpr double kCrossed[30] = {0.452, 0.485, 0.613, 0.542, 0.71,  0.702, 0.804, 0.856, 0.739, 0.863,
                                 0.763, 0.743, 1.264, 1.313, 1.408, 1.385, 1.452, 1.468, 1.661, 1.61,
                                 1.571, 1.553, 1.59,  1.517, 2.076, 2.063, 2.258, 2.251, 2.296, 2.243};

std::vector<GaugeReading> Manual() {
  std::vector<GaugeReading> readings;
  for (int row = 0; row < 9; ++row) {
    for (int part = 0; part < 10; ++part) {
      readings.push_back({std::to_string(part), std::string(1, static_cast<char>('A' + row / 3)), kManual[row][part]});
    }
  }
  return readings;
}

std::vector<GaugeReading> Crossed() {
  std::vector<GaugeReading> readings;
  for (int i = 0; i < 30; ++i) readings.push_back({std::to_string(i / 6), std::to_string(i / 2 % 3), kCrossed[i]});
  return readings;
}

struct Row {
  double mean_square, f, p;
  int degrees;
};

// Of R 4.2's summary(aov(value ~ part * operator)), to the digits that it prints.
void ExpectRow(const Row& expected, const VarianceRow& row) {
  EXPECT_EQ(expected.degrees, row.degrees);
  EXPECT_NEAR(expected.mean_square, row.mean_square, 1e-11 * (1 + expected.mean_square));
  if (expected.f == 0) return;
  EXPECT_NEAR(expected.f, row.f, 1e-5 * expected.f);
  EXPECT_NEAR(expected.p, row.p, 1e-4 * expected.p);
}

TEST(Gauge, HasTheMeanSquaresThatRHas) {
  const GaugeStudy manual = StudyGauge(Manual(), {});
  ExpectRow({9.81799271605, 0, 0, 9}, manual.part);
  ExpectRow({1.58363111111, 0, 0, 2}, manual.operators_row);
  ExpectRow({0.01994345679, 0.43372, 0.97411, 18}, manual.interaction);
  ExpectRow({0.04598222222, 0, 0, 60}, manual.repeatability);
  const GaugeStudy crossed = StudyGauge(Crossed(), {});
  EXPECT_FALSE(crossed.pooled);
  ExpectRow({2.491363033333, 0, 0, 4}, crossed.part);
  ExpectRow({0.020990033333, 0, 0, 2}, crossed.operators_row);
  ExpectRow({0.013555033333, 10.38939, 6.9904e-05, 8}, crossed.interaction);
  ExpectRow({0.0013047, 0, 0, 15}, crossed.repeatability);
}

TEST(Gauge, MeetsTheManualsPublishedExample) {
  const GaugeStudy study = StudyGauge(Manual(), Bounds{-3.0, 3.0, {}, {}});
  EXPECT_TRUE(study.pooled);
  const double printed = 5e-7;  // six digits behind the point
  EXPECT_NEAR(0.199933, study.equipment.deviation, printed);
  EXPECT_NEAR(0.226838, study.appraiser.deviation, printed);
  EXPECT_NEAR(0.302373, study.gauge.deviation, 2e-6);  // it adds variances that were rounded before
  EXPECT_NEAR(1.042327, study.part_to_part.deviation, printed);
  EXPECT_NEAR(18.4, study.equipment.percent_of_total, 0.05);
  EXPECT_NEAR(20.9, study.appraiser.percent_of_total, 0.05);
  EXPECT_NEAR(27.9, study.gauge.percent_of_total, 0.05);
  EXPECT_NEAR(96.0, study.part_to_part.percent_of_total, 0.05);
  EXPECT_EQ(4, study.distinct_categories);
  EXPECT_NEAR(30.2, study.percent_of_tolerance, 0.05);
}

// The manual pools what has a p above 0.25, and counts 1.41 times the ratio of the deviations, cut.
TEST(Gauge, PoolsAndCountsAsTheManualDoes) {
  int between = 0;
  int cut = 0;
  for (int k = 1; k <= 600; ++k) {
    std::vector<GaugeReading> readings = Crossed();
    for (std::size_t i = 0; i < readings.size(); ++i) {
      const double part = std::stod(readings[i].part);
      const double who = std::stod(readings[i].operator_name);
      readings[i].value =
          0.011 * k * part + 0.3 * who + 0.005 * k * std::sin(3 * part + 5 * who) + (i % 2 == 0 ? 0.5 : -0.5);
    }
    const GaugeStudy study = StudyGauge(readings, {});
    EXPECT_EQ(study.interaction.p > 0.25, study.pooled) << study.interaction.p;
    const double ratio = study.part_to_part.deviation / study.gauge.deviation;
    EXPECT_EQ(std::max(1.0, std::floor(1.41 * ratio)), study.distinct_categories) << ratio;
    between += study.interaction.p > 0.05 && study.interaction.p < 0.25 ? 1 : 0;
    cut += std::floor(1.41 * ratio) < std::floor(1.4142 * ratio) ? 1 : 0;
  }
  EXPECT_GT(between, 0);
  EXPECT_GT(cut, 0);
}

TEST(Gauge, RefusesWhatIsNotCrossedAndBalanced) {
  std::vector<GaugeReading> missing = Manual();
  missing.pop_back();
  std::vector<GaugeReading> nan = Manual();
  nan[5].value = std::numeric_limits<double>::quiet_NaN();
  std::vector<GaugeReading> moved = Manual();
  moved[0].operator_name = "B";
  for (const auto& readings : {missing, nan, moved, {}}) EXPECT_THROW(StudyGauge(readings, {}), Failure);
}

// Expected values: R 4.2, mean, sd, qchisq and qnorm of the manual's 90 readings with limits of -3 and 3.
TEST(Capabilities, HaveTheBoundsThatRGives) {
  Moments moments;
  for (const GaugeReading& reading : Manual()) moments.Add(reading.value);
  moments.Add(std::numeric_limits<double>::quiet_NaN());
  EXPECT_EQ(90, moments.count());
  EXPECT_EQ(1, moments.not_finite());
  EXPECT_NEAR(0.00144444444444444, moments.mean(), 1e-14);
  EXPECT_NEAR(1.03123746010610584, moments.deviation(), 1e-14);
  const Capability both = CapabilityOf(moments, Bounds{-3.0, 3.0, {}, {}});
  EXPECT_NEAR(0.969708761255733, both.cp->value, 1e-12);
  EXPECT_NEAR(0.827392485041105, both.cp->low, 1e-12);
  EXPECT_NEAR(1.111780309645573, both.cp->high, 1e-12);
  EXPECT_NEAR(0.969241864444758, both.cpk->value, 1e-12);
  EXPECT_NEAR(0.811075523114480, both.cpk->low, 1e-12);
  EXPECT_NEAR(1.127408205775036, both.cpk->high, 1e-12);
  EXPECT_FALSE(CapabilityOf(moments, Bounds{-3.0, {}, {}, {}}).cp);
  EXPECT_FALSE(CapabilityOf(Moments(), Bounds{-3.0, 3.0, {}, {}}).cpk);
  const Bounds proposed = ProposeBounds(moments, 1.33, {});
  EXPECT_NEAR(1.33, CapabilityOf(moments, proposed).cpk->value, 1e-12);
}

TEST(Effects, CountWhatIsWithinAndWhatUncertaintyHides) {
  // Half a million true values from N(0, 1), read with an error of N(0, 0.3): what a limit of 1 accepts and rejects
  // wrongly is counted, and compared with what is expected from the readings alone.
  std::uint64_t state = 1;
  const auto uniform = [&] {
    state = state * 6364136223846793005ULL + 1442695040888963407ULL;
    return (static_cast<double>(state >> 11) + 0.5) / 9007199254740992.0;
  };
  const auto normal = [&] {
    const double radius = std::sqrt(-2 * std::log(uniform()));
    return radius * std::cos(2 * 3.14159265358979323846 * uniform());
  };
  const int count = 500000;
  std::vector<UncertainValue> readings;
  double accepts = 0;
  double rejects = 0;
  for (int i = 0; i < count; ++i) {
    const double truth = normal();
    const double reading = truth + 0.3 * normal();
    readings.push_back({reading, 0.3});
    if (reading <= 1 && truth > 1) accepts += 1.0 / count;
    if (reading > 1 && truth <= 1) rejects += 1.0 / count;
  }
  const LimitsEffect effect = EffectOf(readings, Bounds{{}, 1.0, {}, {}});
  EXPECT_NEAR(accepts, *effect.false_accepts, 0.0006);  // three standard errors of the count
  EXPECT_NEAR(rejects, *effect.false_rejects, 0.0008);
  EXPECT_FALSE(EffectOf({{1, 0}, {2, 0}}, Bounds{0.0, {}, {}, {}}).false_accepts);
  const double nan = std::numeric_limits<double>::quiet_NaN();
  EXPECT_EQ(0.5, EffectOf({{nan, 0}, {2, 0}}, Bounds{0.0, {}, {}, {}}).yield);
}

TEST(Labels, TellEscapesAndFalseRejectsAtEachLimit) {
  const LabelStudy study = StudyLabels({3, 4, 5, 5}, {1, 2, 4});
  EXPECT_TRUE(study.low_is_bad);
  EXPECT_DOUBLE_EQ(10.5 / 12, study.area);  // of 12 pairs, 10 rightly ordered and one a tie
  std::vector<std::vector<double>> trials;
  for (const LimitTrial& trial : study.trials) {
    trials.push_back({trial.limit, static_cast<double>(trial.escapes), static_cast<double>(trial.false_rejects)});
  }
  EXPECT_EQ((std::vector<std::vector<double>>{{1, 3, 0}, {2, 2, 0}, {3, 1, 0}, {4, 1, 1}, {5, 0, 2}}), trials);
  const LabelStudy mirrored = StudyLabels({-3, -4, -5, -5}, {-1, -2, -4});
  EXPECT_FALSE(mirrored.low_is_bad);
  EXPECT_DOUBLE_EQ(study.area, mirrored.area);
  EXPECT_EQ(2, mirrored.trials.front().false_rejects);
  EXPECT_THROW(StudyLabels({1}, {}), Failure);
}

}  // namespace
}  // namespace qv
