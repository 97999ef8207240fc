#ifndef QVTESTER_LOG_H_
#define QVTESTER_LOG_H_

#include "qvtester/indices.h"

/// Writes one line to the Android log, priority debug, tag "QVTEST", as "[OKAPI] <text>\r\n".
/// The text is formatted as by printf, cut to 4093 characters and stripped of white space at its end.
QV_API void QVDEBUGP(const char* format, ...) __attribute__((format(printf, 1, 2)));

#endif  // QVTESTER_LOG_H_
