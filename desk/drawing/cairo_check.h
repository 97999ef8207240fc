#ifndef QVTESTER_DESK_DRAWING_CAIRO_CHECK_H_
#define QVTESTER_DESK_DRAWING_CAIRO_CHECK_H_

#include <cairo.h>

#include <string>

#include "desk/base/failure.h"

namespace qv {

/// Cairo goes on without a word after an error, and draws nothing from there on. Look here before a drawing is used:
/// throws Failure (internal fault) that names the drawing and what went wrong.
inline void CheckDrawn(cairo_t* cr, const char* drawing) {
  if (const cairo_status_t status = cairo_status(cr); status != CAIRO_STATUS_SUCCESS) {
    throw Failure(kInternalFault, std::string(drawing) + " can't be drawn (" + cairo_status_to_string(status) + ")");
  }
}

}  // namespace qv

#endif  // QVTESTER_DESK_DRAWING_CAIRO_CHECK_H_
