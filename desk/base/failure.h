#ifndef QVTESTER_DESK_BASE_FAILURE_H_
#define QVTESTER_DESK_BASE_FAILURE_H_

#include <stdexcept>
#include <string>

namespace qv {

/// Whose fault it is: what was asked for, what was handed in, or ours. What that ends a program with is the program's
/// affair.
enum FailureKind { kWrongUsage, kCouldNotMeasure, kInternalFault };

/// Ends what was begun, with a sentence for a person.
class Failure : public std::runtime_error {
 public:
  Failure(FailureKind kind, const std::string& sentence) : std::runtime_error(sentence), kind(kind) {}
  FailureKind kind;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_FAILURE_H_
