// The device's own properties and preview folder.

#include <cutils/properties.h>

#include "platform/preview_folder.h"
#include "platform/properties.h"

namespace platform {

int property_get(const char* key, char* value, const char* default_value) {
  return ::property_get(key, value, default_value);
}

int property_set(const char* key, const char* value) { return ::property_set(key, value); }

std::string PreviewFolder() { return "/data/ozrlog"; }

}  // namespace platform
