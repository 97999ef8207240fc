#ifndef QVTESTER_DESK_MEASURE_REGIONS_H_
#define QVTESTER_DESK_MEASURE_REGIONS_H_

#include "desk/base/json.h"
#include "qvtester/tester.h"

namespace qv {

/// Regions as [left, top, width, height, label] each: such a list, the words "l,t,w,h,label;..." (the label may be left
/// out, and is then the region's number), or the name of a JSON file that holds the list, or that has it as "regions",
/// as the truth of a simulated photo does. Throws Failure (wrong usage) for anything else.
Json CheckedRegions(const Json& value);

/// A tester's region list is this one while it lives; an empty one is the whole photo.
class SetRegions {
 public:
  SetRegions(QVTester& tester, const Json& regions, QVRegionList QVTester::*list, int QVTester::*count);
  ~SetRegions();
  SetRegions(const SetRegions&) = delete;
  SetRegions& operator=(const SetRegions&) = delete;

 private:
  QVTester& tester_;
  QVRegionList QVTester::*list_;
  int QVTester::*count_;
  QVRegionList former_list_;
  int former_count_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_REGIONS_H_
