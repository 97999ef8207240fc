// The device's own properties, by the calls that the NDK has, and its preview folder.

#include <sys/system_properties.h>

#include <algorithm>
#include <cstring>

#include "platform/jpeg.h"
#include "platform/preview_folder.h"
#include "platform/properties.h"

static_assert(platform::kPropertyValueMax == PROP_VALUE_MAX, "callers give room for the device's longest value");

namespace platform {

int property_get(const char* key, char* value, const char* default_value) {
  const int length = std::max(__system_property_get(key, value), 0);
  return length == 0 ? DefaultTo(value, default_value) : length;
}

int property_set(const char* key, const char* value) {
  return std::strlen(value) < kPropertyValueMax ? __system_property_set(key, value) : -1;
}

std::string PreviewFolder() { return "/data/ozrlog"; }

cv::Mat DecodeSoundJpeg(const std::vector<unsigned char>& /*file*/) { return {}; }

}  // namespace platform
