#ifndef QVTESTER_PLATFORM_PREVIEW_FOLDER_H_
#define QVTESTER_PLATFORM_PREVIEW_FOLDER_H_

#include <string>

namespace platform {

/// Where preview frames are saved: the device's /data/ozrlog; a host may move it (qvtester/host_properties.h).
std::string PreviewFolder();

}  // namespace platform

#endif  // QVTESTER_PLATFORM_PREVIEW_FOLDER_H_
