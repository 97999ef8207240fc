#ifndef QVTESTER_DESK_MEASURE_VERIFY_H_
#define QVTESTER_DESK_MEASURE_VERIFY_H_

#include <string>
#include <vector>

#include "desk/base/json.h"
#include "desk/measure/request.h"

namespace qv {

/// What measuring a record's request again has shown.
struct Verification {
  int numbers = 0;                 // that were compared
  std::vector<std::string> moved;  // a sentence each
  std::vector<std::string> notes;  // what may be the reason
};

/// The request by which a record can be measured again. Files are looked for seen from the record's folder, as named,
/// and beside the record, by their content. Records of versions that stored none are read where what they do store
/// tells all that matters. Throws Failure (could not measure) with the reason where it does not.
Request RequestOfRecord(const Json& record, const std::string& folder);

/// Measures it, judges it by the record's limits, and compares every number and outcome. Writes nothing. Throws Failure
/// (could not measure) as above, and where a file that was measured is gone.
Verification Verify(const Json& record, const std::string& folder);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_VERIFY_H_
