#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>

#include "desk/base/files.h"
#include "desk/base/text.h"
#include "desk/results/archive.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

struct ImportOptions {
  std::vector<std::string> files;
  std::string store;
  WaitOption wait;
};

Imported ImportFile(const std::string& path, Store& store) {
  if (path == "-") return ImportLines(std::cin, "standard input", store);
  if (LowerExtension(path) == ".json") {  // a record as a command wrote it
    return {1, store.Put(ParseRun(ReadWholeFile(path, kWrongUsage), Printable(path)))};
  }
  std::ifstream lines(path);
  if (!lines || lines.peek() == EOF) throw Failure(kWrongUsage, Printable(path) + ": can't be read, or holds no run");
  return ImportLines(lines, Printable(path), store);
}

int Import(const ImportOptions& options) {
  const std::string file = options.store.find("://") == std::string::npos ? options.store : "";
  for (const std::string& path : options.files) {
    if (path == "-") continue;
    if (!std::filesystem::is_regular_file(path))
      throw Failure(kWrongUsage, Printable(path) + ": no such file, or none of lines");
    CheckOutputs({{"the archive", path}}, {{"the store", file}});
  }
  Store store(options.store, Store::Use::kWrite, options.wait.patience());
  Imported all;
  for (const std::string& path : options.files) {
    const Imported one = ImportFile(path, store);
    all.read += one.read;
    all.added += one.added;
  }
  std::cout << Count(all.read, "run") << " read, " << all.added << " new\n";
  return kExitWithinLimits;
}

}  // namespace

CommandBody DeclareImport(Options& command) {
  auto options = std::make_shared<ImportOptions>();
  command.Arguments("ARCHIVE", options->files, "Archives (.jsonl) or records (.json); - is standard input", "FILE",
                    true);
  command.Text("-o,--output", options->store, "The store: a file, or postgresql://user@host/database", "STORE", true);
  options->wait.DeclareOn(command);
  return [options] { return Import(*options); };
}

}  // namespace qv
