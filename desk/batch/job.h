#ifndef QVTESTER_DESK_BATCH_JOB_H_
#define QVTESTER_DESK_BATCH_JOB_H_

#include <map>
#include <optional>
#include <string>
#include <vector>

namespace qv {

/// What a batch measures at once: one unit by the plan.
struct Job {
  std::string unit;
  std::vector<std::string> inputs;             // of a plan's only step, in place of its own; empty: the plan's
  std::map<std::string, std::string> columns;  // free ones, which go into the run
  std::string station, operator_name, lot;     // where the manifest gives them
};

/// The K-th of N machines, from 1.
struct Shard {
  unsigned index = 1, count = 1;
};

/// "2/5"; throws Failure (wrong usage).
Shard ParseShard(const std::string& text);

/// Whether the job falls to the shard: by a hash of unit and inputs, the same on every machine.
bool FallsTo(const Shard& shard, const Job& job);
/// The jobs that fall to it.
std::vector<Job> ShareOf(const Shard& shard, std::vector<Job> jobs);

/// A job for every picture file of a folder (not of its subfolders; none whose name starts with a dot, which is still
/// being written), in the order of their names; the unit is the file's name without its ending.
std::vector<Job> JobsOfPhotos(const std::string& folder);

/// A job for every subfolder, whose name is the unit's.
std::vector<Job> JobsOfUnits(const std::string& folder);

/// A job a row of a CSV file (with a head) or a JSONL file. Columns: "path" (further inputs as "path2", "path3"),
/// "unit", "station", "operator", "lot"; all others are free. Paths are seen from the manifest's folder. Throws Failure
/// (wrong usage) that names the line.
std::vector<Job> JobsOfManifest(const std::string& text, const std::string& name, const std::string& folder);

/// Rows of a CSV text (RFC 4180: quotes, doubled quotes, line breaks in them); throws Failure (wrong usage) where a
/// quote stays open.
std::vector<std::vector<std::string>> ParseCsv(const std::string& text, const std::string& name);

/// Whether a file is taken for a picture, by its name's ending.
bool IsPictureName(const std::string& path);

/// Photos as they arrive in a folder: closed after writing, or renamed into it.
class FolderWatch {
 public:
  explicit FolderWatch(const std::string& folder);  // throws Failure
  ~FolderWatch();
  FolderWatch(const FolderWatch&) = delete;
  FolderWatch& operator=(const FolderWatch&) = delete;

  int descriptor() const { return inotify_; }  // to poll for reading
  /// Leaves the others to other machines.
  void Take(const Shard& shard) { shard_ = shard; }
  /// What arrived since the last call; waits for nothing.
  std::vector<Job> Arrived();

 private:
  int inotify_;
  std::string folder_;
  Shard shard_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BATCH_JOB_H_
