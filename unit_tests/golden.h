#ifndef QVTESTER_UNIT_TESTS_GOLDEN_H_
#define QVTESTER_UNIT_TESTS_GOLDEN_H_

#include <gtest/gtest.h>

#include <cstdlib>
#include <fstream>
#include <string>

#include "unit_tests/drawing.h"

/// Holds a whole text against the file of this name in unit_tests/golden. QV_WRITE_GOLDEN=1 in the environment writes
/// the file anew, to be read before it is kept.
inline void ExpectGolden(const std::string& name, const std::string& text) {
  const std::string file = QVTESTER_GOLDEN "/" + name + ".txt";
  if (std::getenv("QV_WRITE_GOLDEN") != nullptr) std::ofstream(file) << text;
  EXPECT_EQ(ReadFile(file), text) << file;
}

#endif  // QVTESTER_UNIT_TESTS_GOLDEN_H_
