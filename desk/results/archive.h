#ifndef QVTESTER_DESK_RESULTS_ARCHIVE_H_
#define QVTESTER_DESK_RESULTS_ARCHIVE_H_

#include <istream>
#include <string>

#include "desk/base/files.h"
#include "desk/results/store.h"

namespace qv {

/// One run a line, with its record, filing and pictures (docs/run.schema.json).
void ExportLines(Store& store, const Selection& selection, bool with_pictures, const Sink& sink);

/// A table for spreadsheets: a line a run, a column for each figure. Not finite is "nan", "inf", "-inf"; not measured
/// is empty.
void ExportTable(Store& store, const Selection& selection, const Sink& sink);

/// A line of ExportLines, or a record as it stands; throws Failure (wrong usage) naming the file and, unless 0, the
/// line's number.
StoredRun ParseRun(const std::string& text, const std::string& file, long number = 0);

struct Imported {
  std::size_t read = 0, added = 0;
};
/// Reads lines until their end. A line that is wrong ends it with a Failure naming the line; those before it are
/// stored.
Imported ImportLines(std::istream& lines, const std::string& where, Store& store);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_ARCHIVE_H_
