#include <algorithm>
#include <boost/math/distributions/fisher_f.hpp>
#include <cmath>
#include <limits>
#include <map>

#include "desk/base/failure.h"
#include "desk/base/text.h"
#include "desk/results/statistics.h"

namespace qv {

namespace {

constexpr double kPoolAbove = 0.25;  // the interaction's p from which on the manual pools it

// Readings in a table: [part][operator][trial].
using Table = std::vector<std::vector<std::vector<double>>>;

using Places = std::map<std::string, std::size_t>;

void CheckBalance(const Table& table, const Places& parts, const Places& operators) {
  using Cell = std::pair<std::size_t, std::string>;
  Cell least;
  Cell most;
  for (const auto& [part, row] : parts) {
    for (const auto& [who, column] : operators) {
      const std::size_t times = table[row][column].size();
      const std::string words = who + " measured part " + part + " " + Count(times, "time");
      if (least.second.empty() || times < least.first) least = {times, words};
      if (times > most.first) most = {times, words};
    }
  }
  if (least.first == most.first && least.first >= 2) return;
  throw Failure(kWrongUsage,
                "a gauge study needs each part measured equally often, at least twice, by each operator; " +
                    least.second + (least.first < most.first ? ", " + most.second : ""));
}

Table Arrange(const std::vector<GaugeReading>& readings) {
  Places parts;
  Places operators;
  for (const GaugeReading& reading : readings) {
    if (!std::isfinite(reading.value)) {
      throw Failure(kWrongUsage, "part " + reading.part + " has a value that is not finite: no gauge study of it");
    }
    parts.emplace(reading.part, parts.size());
    operators.emplace(reading.operator_name, operators.size());
  }
  if (parts.size() < 2 || operators.size() < 2) {
    throw Failure(kWrongUsage, Format("a gauge study needs at least 2 parts and 2 operators; there are %zu and %zu",
                                      parts.size(), operators.size()));
  }
  Table table(parts.size(), std::vector<std::vector<double>>(operators.size()));
  for (const GaugeReading& reading : readings) {
    table[parts[reading.part]][operators[reading.operator_name]].push_back(reading.value);
  }
  CheckBalance(table, parts, operators);
  return table;
}

double MeanOf(const std::vector<double>& values) {
  double sum = 0;
  for (const double value : values) sum += value;
  return sum / static_cast<double>(values.size());
}

double SquaresAbout(const std::vector<double>& values, double centre) {
  double sum = 0;
  for (const double value : values) sum += (value - centre) * (value - centre);
  return sum;
}

// Sums of squares and mean squares of the crossed design.
void Analyse(const Table& table, GaugeStudy& study) {
  const std::size_t operators = table[0].size();
  std::vector<double> part_means;
  std::vector<double> operator_means(operators, 0);
  std::vector<double> cell_means;
  for (const auto& part : table) {
    double sum = 0;
    for (std::size_t o = 0; o < operators; ++o) {
      const double mean = MeanOf(part[o]);
      cell_means.push_back(mean);
      sum += mean;
      operator_means[o] += mean / static_cast<double>(table.size());
      study.repeatability.sum_of_squares += SquaresAbout(part[o], mean);
    }
    part_means.push_back(sum / static_cast<double>(operators));
  }
  const double grand = MeanOf(cell_means);
  const int p = study.parts;
  const int o = study.operators;
  const int n = study.trials;
  study.part.sum_of_squares = o * n * SquaresAbout(part_means, grand);
  study.operators_row.sum_of_squares = p * n * SquaresAbout(operator_means, grand);
  study.interaction.sum_of_squares = std::max(
      0.0, n * SquaresAbout(cell_means, grand) - study.part.sum_of_squares - study.operators_row.sum_of_squares);
  study.part.degrees = p - 1;
  study.operators_row.degrees = o - 1;
  study.interaction.degrees = (p - 1) * (o - 1);
  study.repeatability.degrees = p * o * (n - 1);
  study.total.degrees = p * o * n - 1;
  for (VarianceRow* row : {&study.part, &study.operators_row, &study.interaction, &study.repeatability}) {
    row->mean_square = row->sum_of_squares / row->degrees;
    study.total.sum_of_squares += row->sum_of_squares;
  }
}

void Test(VarianceRow& row, double against, int degrees) {
  row.f = row.mean_square / against;
  row.p = std::isfinite(row.f) ? cdf(complement(boost::math::fisher_f(row.degrees, degrees), row.f))
                               : std::numeric_limits<double>::quiet_NaN();
}

GaugeComponent Component(const char* name, double variance, double total) {
  const double held = std::max(0.0, variance);
  return {name, std::sqrt(held), 100 * std::sqrt(held / total), 100 * held / total};
}

}  // namespace

GaugeStudy StudyGauge(const std::vector<GaugeReading>& readings, const Bounds& bounds) {
  const Table table = Arrange(readings);
  GaugeStudy study;
  study.parts = static_cast<int>(table.size());
  study.operators = static_cast<int>(table[0].size());
  study.trials = static_cast<int>(table[0][0].size());
  Analyse(table, study);

  Test(study.interaction, study.repeatability.mean_square, study.repeatability.degrees);
  study.pooled = !(study.interaction.p <= kPoolAbove);
  const int error_degrees =
      study.pooled ? study.repeatability.degrees + study.interaction.degrees : study.interaction.degrees;
  const double pooled_square = (study.repeatability.sum_of_squares + study.interaction.sum_of_squares) /
                               (study.repeatability.degrees + study.interaction.degrees);
  const double against = study.pooled ? pooled_square : study.interaction.mean_square;
  Test(study.part, against, error_degrees);
  Test(study.operators_row, against, error_degrees);

  // Expected mean squares, solved for the components.
  const double equipment = study.pooled ? pooled_square : study.repeatability.mean_square;
  const double crossed = study.pooled ? 0 : std::max(0.0, (study.interaction.mean_square - equipment) / study.trials);
  const double appraiser = std::max(0.0, (study.operators_row.mean_square - against) / (study.parts * study.trials));
  const double part = std::max(0.0, (study.part.mean_square - against) / (study.operators * study.trials));
  const double gauge = equipment + appraiser + crossed;
  const double total = gauge + part;
  study.equipment = Component("repeatability", equipment, total);
  study.appraiser = Component("reproducibility", appraiser, total);
  study.interaction_part = Component("interaction", crossed, total);
  study.gauge = Component("gauge R&R", gauge, total);
  study.part_to_part = Component("part to part", part, total);
  study.all = Component("total", total, total);
  const double ratio = 1.41 * study.part_to_part.deviation / study.gauge.deviation;
  study.distinct_categories = ratio < 1e9 ? std::max(1, static_cast<int>(ratio)) : 0;
  study.percent_of_tolerance = bounds.min && bounds.max ? 100 * 6 * study.gauge.deviation / (*bounds.max - *bounds.min)
                                                        : std::numeric_limits<double>::quiet_NaN();
  return study;
}

}  // namespace qv
