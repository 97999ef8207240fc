#ifndef QVTESTER_DESK_BATCH_PLAN_H_
#define QVTESTER_DESK_BATCH_PLAN_H_

#include <string>
#include <vector>

#include "desk/base/json.h"
#include "desk/measure/limits.h"
#include "desk/measure/record.h"
#include "desk/measure/request.h"

namespace qv {

/// One measurement of a plan. Texts of its request may hold {unit}, and name files seen from the plan's folder.
struct PlanStep {
  std::string name;
  Request request;
  Limits limits;  // its own, or those of the plan's that are of its figures; may be empty
};

/// What is measured of each unit, in this order (docs/plans.md).
struct Plan {
  std::string name, revision;
  std::string folder;       // from which inputs are seen; empty: the current one
  std::string unit_folder;  // from which those with {unit} in their names are seen; empty: the same
  bool stop_on_error = false;
  std::vector<PlanStep> steps;
};

/// Reads a plan with its limits; throws Failure (wrong usage) that says where and what is wrong: what is no plan, an
/// unknown key, measurement, parameter or property, a step's name given twice, a limit that no step can measure.
Plan ReadPlan(const std::string& path);

/// A plan of one step that measures nothing but this; the step's name is empty.
Plan PlanOf(const Request& request, const Limits& limits);

/// The step's request for a unit: {unit} filled in, files seen from the plan's folder. Throws Failure (wrong usage)
/// where the unit's name would lead out of the folder that the plan names.
Request RequestFor(const Plan& plan, const PlanStep& step, const std::string& unit);

/// A plan to start from, as a file's content.
std::string NewPlan();

/// What a plan would do, for people.
std::string Describe(const Plan& plan);

/// Measures a step of a unit on a tester of its own, so that nothing carries over. `request` is RequestFor's, or one
/// with other inputs.
Record MeasureStep(const PlanStep& step, const Request& request, const std::string& unit, const std::string& station);

}  // namespace qv

#endif  // QVTESTER_DESK_BATCH_PLAN_H_
