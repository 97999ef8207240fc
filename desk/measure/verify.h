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
};

/// The request by which a record can be measured again. Files are looked for seen from the record's folder, as named,
/// and beside the record, by their content. Records of versions that stored none are read where what they do store
/// tells all that matters. Throws Failure (could not measure) with the reason where it does not.
Request RequestOfRecord(const Json& record, const std::string& folder);

/// Measures it and compares every number. Writes nothing. Throws Failure (could not measure) as above.
Verification Verify(const Json& record, const std::string& folder);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_VERIFY_H_
