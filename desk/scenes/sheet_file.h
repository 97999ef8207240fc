#ifndef QVTESTER_DESK_SCENES_SHEET_FILE_H_
#define QVTESTER_DESK_SCENES_SHEET_FILE_H_

#include <string>

#include "desk/scenes/chart_sheet.h"

namespace qv {

/// A kind of file that sheets are written to.
struct SheetFormat {
  const char* extension;
  std::string (*encode)(const ChartSheet& sheet, int dpi);  // the file's content; dpi only of pictures
};

/// By the path's extension; throws Failure (wrong usage) for another.
const SheetFormat& SheetFormatOf(const std::string& path);

}  // namespace qv

#endif  // QVTESTER_DESK_SCENES_SHEET_FILE_H_
