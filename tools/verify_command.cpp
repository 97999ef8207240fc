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

// Files as named; of a folder, those that hold records.
std::vector<std::pair<fs::path, Json>> ReadRecords(const std::vector<std::string>& paths) {
  std::vector<std::pair<fs::path, Json>> records;
  for (const std::string& path : paths) {
    const bool whole_folder = fs::is_directory(path);
    std::vector<fs::path> files;
    if (whole_folder) {
      for (const fs::directory_entry& entry : fs::directory_iterator(path)) {
        if (entry.path().extension() == ".json") files.push_back(entry.path());
      }
      std::sort(files.begin(), files.end());
    } else {
      files.emplace_back(path);
    }
    for (const fs::path& file : files) {
      Json json = Json::parse(ReadWholeFile(file, kWrongUsage), nullptr, false);
      const bool is_record = json.is_object() && json.value("schema", Json()) == kRecordSchema;
      if (!is_record && !whole_folder) throw Failure(kWrongUsage, file.string() + ": not a record");
      if (is_record) records.emplace_back(file, std::move(json));
    }
  }
  if (records.empty()) throw Failure(kWrongUsage, "no record there to verify");
  return records;
}

}  // namespace

CommandBody DeclareVerify(Options& command) {
  auto paths = std::make_shared<std::vector<std::string>>();
  command.Arguments(
      "RECORD", *paths,
      "Records of golden photos, as --json wrote them, or folders of them; a photo is looked for where the "
      "record says and beside the record, by its content",
      "PATH", true);
  return [paths] {
    int numbers = 0;
    int moved = 0;
    int failed = 0;
    const auto records = ReadRecords(*paths);
    for (const auto& [path, record] : records) {
      try {
        const Verification check = Verify(record, path.parent_path());
        numbers += check.numbers;
        moved += static_cast<int>(check.moved.size());
        std::cout << Format("%s  %s, %d numbers\n", path.c_str(), check.moved.empty() ? "as stored" : "MOVED",
                            check.numbers);
        for (const std::string& sentence : check.moved) std::cout << "  " << sentence << '\n';
      } catch (const Failure& e) {
        ++failed;
        std::cerr << path.string() << ": " << e.what() << '\n';
      }
    }
    std::cout << Format("%zu records, %d numbers: %d moved, %d records could not be verified\n", records.size(),
                        numbers, moved, failed);
    return static_cast<int>(failed > 0 ? kExitCouldNotMeasure : moved > 0 ? kExitLimitBroken : kExitWithinLimits);
  };
}

}  // namespace qv
