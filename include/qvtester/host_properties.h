#ifndef QVTESTER_HOST_PROPERTIES_H_
#define QVTESTER_HOST_PROPERTIES_H_

#include "qvtester/indices.h"

// Linux hosts only: where the system properties and the preview frames of a device go. The store is one file a key, its
// name the key, its content the bare value, so that `cat` reads it. Both calls answer 1, or -97 for an empty path.

/// Keeps properties in this directory, made when first written to (its parent must exist), with access for this user
/// alone; a directory of somebody else's, or a link to one, is refused on each use. Null: back to
/// /dev/shm/qvtester-<uid>/properties.
QV_API int SetHostPropertyStore(const char* directory);

/// Saves preview frames in this directory, which must exist. Null: back to /data/ozrlog.
QV_API int SetHostPreviewFolder(const char* directory);

#endif  // QVTESTER_HOST_PROPERTIES_H_
