#ifndef QVTESTER_UNIT_TESTS_FAILING_NEW_H_
#define QVTESTER_UNIT_TESTS_FAILING_NEW_H_

/// How often `new` still succeeds in this program, then throws; below 0, always.
extern int new_left;

#endif  // QVTESTER_UNIT_TESTS_FAILING_NEW_H_
