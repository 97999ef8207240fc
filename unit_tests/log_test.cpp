#include <android/log.h>
#include <gmock/gmock.h>

#include <algorithm>
#include <cstdarg>
#include <string>

#include "qvtester/log.h"

static std::string last_line;

// Stands in for liblog's, which cuts lines at about a thousand characters before anybody sees them.
extern "C" int __android_log_print(int priority, const char* tag, const char* fmt,
                                   ...) {  // NOLINT(bugprone-reserved-identifier,cert-dcl*): liblog's name
  EXPECT_EQ(ANDROID_LOG_DEBUG, priority);
  EXPECT_STREQ("QVTEST", tag);
  EXPECT_STREQ("[OKAPI] %s", fmt);
  va_list arguments;
  va_start(arguments, fmt);
  last_line = va_arg(arguments, const char*);
  va_end(arguments);
  return 1;
}

namespace {

TEST(LogLine, ItHoldsFourThousandAndNinetyThreeCharactersWithoutWhiteSpaceAtItsEnd) {
  QVDEBUGP("value %d \t\n ", 7);
  EXPECT_EQ("value 7\r\n", last_line);
  QVDEBUGP("%s", " \n ");
  EXPECT_EQ("\r\n", last_line);
  for (const std::size_t length : {4092u, 4093u, 4094u, 9000u}) {
    QVDEBUGP("%s", std::string(length, 'x').c_str());
    EXPECT_EQ(std::string(std::min<std::size_t>(length, 4093), 'x') + "\r\n", last_line);
  }
  QVDEBUGP("%s%s", std::string(4090, 'x').c_str(), " \t\n and more");
  EXPECT_EQ(std::string(4090, 'x') + "\r\n", last_line) << "white space is stripped where the line was cut";
}

}  // namespace
