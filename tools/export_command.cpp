#include <iostream>
#include <memory>

#include "desk/base/text.h"
#include "desk/results/archive.h"
#include "tools/commands.h"
#include "tools/program.h"
#include "tools/store_options.h"

namespace qv {

namespace {

struct ExportOptions {
  StoreOptions store;
  std::string output;
  bool no_pictures = false;
};

int Export(const ExportOptions& options) {
  const std::string extension = options.output == "-" ? ".jsonl" : LowerExtension(options.output);
  if (extension != ".jsonl" && extension != ".csv") {
    throw Failure(kWrongUsage,
                  Printable(options.output) + ": name a .jsonl file (an archive) or a .csv file (a table)");
  }
  CheckOutputs({{"the store", options.store.store}}, {{"the archive", options.output}});
  Store store(options.store.store, Store::Use::kRead);
  const Selection selection = options.store.selection();
  const std::int64_t runs = store.Count(selection);
  const auto produce = [&](const Sink& sink) {
    if (extension == ".csv") {
      ExportTable(store, selection, sink);
    } else {
      ExportLines(store, selection, !options.no_pictures, sink);
    }
  };
  if (options.output == "-") {
    produce([](const std::string& part) { std::cout << part; });
  } else {
    WriteWholeFile(options.output, produce);
  }
  std::cerr << Count(static_cast<std::size_t>(runs), "run") << " exported\n";
  return kExitWithinLimits;
}

}  // namespace

CommandBody DeclareExport(Options& command) {
  auto options = std::make_shared<ExportOptions>();
  options->store.DeclareOn(command);
  command.Text("-o,--output", options->output, "A .jsonl archive or a .csv table; - is standard output, as .jsonl",
               "FILE", true);
  command.Flag("--no-pictures", options->no_pictures, "Leave the pictures out of an archive");
  return [options] { return Export(*options); };
}

}  // namespace qv
