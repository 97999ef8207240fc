#ifndef QVTESTER_PLATFORM_PROPERTIES_H_
#define QVTESTER_PLATFORM_PROPERTIES_H_

#include <algorithm>
#include <cstddef>
#include <cstring>

// System properties, by which other processes on the device read a few results.

namespace platform {

/// Bytes that a value takes at most, its terminating zero included.
inline constexpr int kPropertyValueMax = 92;

/// Puts a default, none where it is null, cut to what a value takes, in the place of a value. Answers its length.
inline int DefaultTo(char* value, const char* default_value) {
  const std::size_t all = default_value == nullptr ? 0 : std::strlen(default_value);
  const std::size_t length = std::min<std::size_t>(all, kPropertyValueMax - 1);
  if (length > 0) std::memcpy(value, default_value, length);
  value[length] = '\0';
  return static_cast<int>(length);
}

/// Copies the value of a key into `value` (room for kPropertyValueMax bytes) and answers its length; the default where
/// the key is missing or its value empty.
int property_get(const char* key, char* value, const char* default_value);

/// Sets a key; below 0 when the value is too long or the store can't be written. The former value then stays.
int property_set(const char* key, const char* value);

}  // namespace platform

#endif  // QVTESTER_PLATFORM_PROPERTIES_H_
