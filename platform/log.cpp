#include "qvtester/log.h"

#include <android/log.h>

#include <cctype>
#include <cstdarg>
#include <cstdio>

void QVDEBUGP(const char* format, ...) {
  constexpr int kLimit = 4093;  // leaves room for CR, LF and the terminating zero
  char line[kLimit + 3] = {};

  va_list arguments;
  va_start(arguments, format);
  int length = std::vsnprintf(line, kLimit + 1, format, arguments);
  va_end(arguments);
  if (length < 0 || length > kLimit) length = kLimit;

  while (length > 0 && std::isspace(static_cast<unsigned char>(line[length - 1])) != 0) line[--length] = '\0';
  line[length] = '\r';
  line[length + 1] = '\n';
  line[length + 2] = '\0';
  __android_log_print(ANDROID_LOG_DEBUG, "QVTEST", "[OKAPI] %s", line);
}
