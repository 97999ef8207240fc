#ifndef QVTESTER_UNIT_TESTS_AGREEMENT_TEST_H_
#define QVTESTER_UNIT_TESTS_AGREEMENT_TEST_H_

#include <gtest/gtest.h>

#include "unit_tests/log_lines.h"
#include "unit_tests/plain/agreement.h"

/// So many cases agree, and between these shares of what could be found was found.
inline void ExpectAgreement(plain::Agreement (*compare)(Draws& any), int rounds, double least = 0, double most = 1e9) {
  const LogLines log;
  SeededDraws any(1);
  double found = 0;
  double of = 0;
  for (int round = 0; round < rounds; ++round) {
    const plain::Agreement seen = compare(any);
    ASSERT_TRUE(seen.same) << "round " << round;
    found += static_cast<double>(seen.found);
    of += static_cast<double>(seen.of);
  }
  EXPECT_GE(found, least * of);
  EXPECT_LE(found, most * of);
}

#endif  // QVTESTER_UNIT_TESTS_AGREEMENT_TEST_H_
