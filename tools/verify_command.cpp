#include <algorithm>
#include <filesystem>
#include <iostream>
#include <memory>

#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"
#include "desk/measure/record.h"
#include "desk/measure/verify.h"
#include "tools/commands.h"
#include "tools/program.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

struct StoredRecord {  // NOLINT(bugprone-exception-escape): moving Json does not throw
  fs::path file;
  Json record;
  std::string unreadable;  // why
};

bool IsRecord(const Json& json) { return json.is_object() && json.value("schema", Json()) == kRecordSchema; }

// The JSON files of a folder and of those in it, by their names; links to folders are not followed.
std::vector<fs::path> FilesBelow(const std::string& folder) {
  std::vector<fs::path> files;
  std::error_code failed;
  for (fs::recursive_directory_iterator i(folder, failed), end; !failed && i != end; i.increment(failed)) {
    std::error_code ignored;
    if (i->path().extension() == ".json" && !i->is_directory(ignored)) files.push_back(i->path());
  }
  if (failed) throw Failure(kWrongUsage, folder + ": " + failed.message());
  std::sort(files.begin(), files.end());
  return files;
}

// Files as named; of a folder, those that hold records, or what can't be read, which may have been one.
std::vector<StoredRecord> ReadRecords(const std::vector<std::string>& paths) {
  std::vector<StoredRecord> records;
  for (const std::string& path : paths) {
    if (!fs::is_directory(path)) {
      records.push_back({path, ReadJson(path), ""});
      if (!IsRecord(records.back().record)) throw Failure(kWrongUsage, path + ": not a record");
      continue;
    }
    for (const fs::path& file : FilesBelow(path)) {
      try {
        StoredRecord found = {file, ReadJson(file), ""};
        if (IsRecord(found.record)) records.push_back(std::move(found));
      } catch (const Failure& e) {
        records.push_back({file, {}, e.what()});
      }
    }
  }
  if (records.empty()) throw Failure(kWrongUsage, "no record there to verify");
  return records;
}

struct Counts {
  int numbers = 0, moved = 0, failed = 0;
};

void VerifyOne(const StoredRecord& candidate, Counts& counts) {
  if (!candidate.unreadable.empty()) {
    ++counts.failed;
    std::cerr << candidate.unreadable << '\n';
    return;
  }
  const std::string name = Printable(candidate.file.string());
  try {
    const Verification check = Verify(candidate.record, candidate.file.parent_path());
    counts.numbers += check.numbers;
    counts.moved += static_cast<int>(check.moved.size());
    std::cout << name << (check.moved.empty() ? "  as stored, " : "  MOVED, ")
              << Count(static_cast<std::size_t>(check.numbers), "number") << '\n';
    for (const std::vector<std::string>& sentences : {check.moved, check.notes}) {
      for (const std::string& sentence : sentences) std::cout << "  " << Printable(sentence) << '\n';
    }
  } catch (const Failure& e) {
    ++counts.failed;
    std::cerr << name << ": " << Printable(e.what()) << '\n';
  }
}

}  // namespace

CommandBody DeclareVerify(Options& command) {
  auto paths = std::make_shared<std::vector<std::string>>();
  command.Arguments("RECORD", *paths,
                    "Records of golden photos, as --json wrote them, or folders that hold them at any depth; a photo "
                    "is looked for where the record says and beside the record, by its content",
                    "PATH", true);
  return [paths] {
    Counts counts;
    const auto records = ReadRecords(*paths);
    for (const StoredRecord& candidate : records) VerifyOne(candidate, counts);
    std::cout << Format("%s, %s: %d moved, %s could not be verified\n", Count(records.size(), "record").c_str(),
                        Count(static_cast<std::size_t>(counts.numbers), "number").c_str(), counts.moved,
                        Count(static_cast<std::size_t>(counts.failed), "record").c_str());
    return static_cast<int>(counts.failed > 0  ? kExitCouldNotMeasure
                            : counts.moved > 0 ? kExitLimitBroken
                                               : kExitWithinLimits);
  };
}

}  // namespace qv
