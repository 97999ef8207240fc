#ifndef QVTESTER_DESK_BASE_TEXT_H_
#define QVTESTER_DESK_BASE_TEXT_H_

#include <string>

namespace qv {

/// printf into a string.
std::string Format(const char* format, ...) __attribute__((format(printf, 1, 2)));

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_TEXT_H_
