#ifndef QVTESTER_UNIT_TESTS_SENTENCE_H_
#define QVTESTER_UNIT_TESTS_SENTENCE_H_

#include <functional>
#include <string>

#include "desk/base/failure.h"

namespace qv {

/// What the failure of a call says.
inline std::string Sentence(const std::function<void()>& call) {
  try {
    call();
  } catch (const Failure& failure) {
    return failure.what();
  }
  return "no failure";
}

}  // namespace qv

#endif  // QVTESTER_UNIT_TESTS_SENTENCE_H_
