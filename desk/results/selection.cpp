#include "desk/results/selection.h"

#include <cstdio>
#include <ctime>

#include "desk/base/failure.h"
#include "desk/base/text.h"

namespace qv {

Condition ParseCondition(const std::string& word) {
  const std::size_t at = word.find_first_of("=!<>");
  const std::size_t end = at == std::string::npos ? at : at + (word.compare(at + 1, 1, "=") == 0 ? 2 : 1);
  const std::string comparison = at == std::string::npos ? "" : word.substr(at, end - at);
  if (at == 0 || comparison.empty() || comparison == "!" || comparison == "==") {
    throw Failure(kWrongUsage,
                  "\"" + word + "\" is no condition: give NAME=VALUE, or one of != < <= > >= in place of =");
  }
  return {word.substr(0, at), comparison, word.substr(end)};
}

std::int64_t ParseTime(const std::string& text) {
  std::tm time = {};
  int used[3] = {};
  std::sscanf(text.c_str(), "%4d-%2d-%2d%n", &time.tm_year, &time.tm_mon, &time.tm_mday, &used[0]);  // NOLINT
  const std::string clock = used[0] > 0 ? text.substr(static_cast<std::size_t>(used[0])) : "";
  std::sscanf(clock.c_str(), "%*1[T ]%2d:%2d%n:%2d%n", &time.tm_hour, &time.tm_min, &used[1], &time.tm_sec,  // NOLINT
              &used[2]);
  const auto rest = clock.substr(static_cast<std::size_t>(used[2] > 0 ? used[2] : used[1]));
  const bool valid = used[0] > 0 && (rest.empty() || rest == "Z") && time.tm_mon >= 1 && time.tm_mon <= 12 &&
                     time.tm_mday >= 1 && time.tm_mday <= 31 && time.tm_hour <= 24 && time.tm_min <= 59;
  if (!valid) {
    throw Failure(kWrongUsage, "\"" + text + "\" is no time: give 2026-11-21, or 2026-11-21T08:30 (UTC)");
  }
  time.tm_year -= 1900;
  time.tm_mon -= 1;
  return std::int64_t{1000} * timegm(&time);
}

std::string TimeText(std::int64_t millis) {
  const std::time_t seconds = millis / 1000;
  std::tm time = {};
  gmtime_r(&seconds, &time);
  return Format("%04d-%02d-%02dT%02d:%02d:%02dZ", time.tm_year + 1900, time.tm_mon + 1, time.tm_mday, time.tm_hour,
                time.tm_min, time.tm_sec);
}

}  // namespace qv
