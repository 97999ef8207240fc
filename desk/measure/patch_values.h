#ifndef QVTESTER_DESK_MEASURE_PATCH_VALUES_H_
#define QVTESTER_DESK_MEASURE_PATCH_VALUES_H_

#include <map>
#include <opencv2/core.hpp>

#include "desk/base/json.h"

namespace qv {

/// Patches that their chart's maker, or an earlier record, gives: [[number, L*, a*, b*], ...] relative to D65. From
/// such a list, or from a file: a capture record, such a list, or lines of the four numbers (# begins a comment).
/// Throws Failure (wrong usage) for anything else, naming the file.
Json CheckedPatches(const Json& value);

/// By the patch's number.
std::map<int, cv::Vec3d> ReferencePatches(const Json& checked);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_PATCH_VALUES_H_
