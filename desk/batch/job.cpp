#include "desk/batch/job.h"

#include <fcntl.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <filesystem>
#include <sstream>

#include "desk/base/digest.h"
#include "desk/base/failure.h"
#include "desk/base/files.h"
#include "desk/base/json.h"
#include "desk/base/text.h"

namespace qv {

namespace {

namespace fs = std::filesystem;

constexpr std::array<const char*, 20> kPictureEndings = {".jpg", ".jpeg", ".jpe",  ".jp2", ".png", ".bmp", ".dib",
                                                         ".tif", ".tiff", ".webp", ".pbm", ".pgm", ".ppm", ".pnm",
                                                         ".pam", ".pfm",  ".sr",   ".ras", ".hdr", ".exr"};

Job JobOfPhoto(const fs::path& path) {
  Job job;
  job.unit = path.stem().string();
  job.inputs = {path.string()};
  return job;
}

// Copying programs write names that start with a dot, and rename them when they are done.
bool IsPhoto(const std::string& name) { return IsPictureName(name) && name[0] != '.'; }

std::vector<fs::path> Entries(const std::string& folder) {
  std::error_code error;
  std::vector<fs::path> entries;
  for (const fs::directory_entry& entry : fs::directory_iterator(folder, error)) entries.push_back(entry.path());
  if (error) throw Failure(kWrongUsage, Printable(folder) + ": can't be read (" + error.message() + ")");
  std::sort(entries.begin(), entries.end());
  return entries;
}

std::string PlacedIn(const std::string& folder, const std::string& path) { return (fs::path(folder) / path).string(); }

// Which input a column holds: 0 for "path", 1 for "path2"; -1 for another column.
int InputOf(const std::string& column) {
  if (column == "path") return 0;
  const bool numbered = column.size() == 5 && column.compare(0, 4, "path") == 0 && column[4] >= '2' && column[4] <= '9';
  return numbered ? column[4] - '1' : -1;
}

// A row of a manifest, as names and values.
Job JobOfRow(const std::vector<std::pair<std::string, std::string>>& row, const std::string& folder,
             const std::string& where) {
  Job job;
  for (const auto& [column, value] : row) {
    if (const int input = InputOf(column); input >= 0) {
      if (value.empty()) continue;
      job.inputs.resize(std::max(job.inputs.size(), static_cast<std::size_t>(input) + 1));
      job.inputs[static_cast<std::size_t>(input)] = PlacedIn(folder, value);
    } else if (column == "unit") {
      job.unit = value;
    } else if (column == "station") {
      job.station = value;
    } else if (column == "operator") {
      job.operator_name = value;
    } else if (column == "lot") {
      job.lot = value;
    } else {
      job.columns[column] = value;
    }
  }
  if (std::find(job.inputs.begin(), job.inputs.end(), "") != job.inputs.end()) {
    throw Failure(kWrongUsage, where + ": a path is missing between others");
  }
  if (job.unit.empty() && !job.inputs.empty()) job.unit = fs::path(job.inputs[0]).stem().string();
  if (job.unit.empty()) throw Failure(kWrongUsage, where + ": holds neither a unit nor a path");
  return job;
}

std::vector<Job> JobsOfCsv(const std::string& text, const std::string& name, const std::string& folder) {
  const std::vector<std::vector<std::string>> rows = ParseCsv(text, name);
  std::vector<Job> jobs;
  for (std::size_t i = 1; i < rows.size(); ++i) {
    const std::string where = Format("%s: row %zu", name.c_str(), i);
    if (rows[i].size() != rows[0].size()) {
      throw Failure(kWrongUsage,
                    Format("%s: %zu values for %zu columns", where.c_str(), rows[i].size(), rows[0].size()));
    }
    std::vector<std::pair<std::string, std::string>> row;
    for (std::size_t k = 0; k < rows[0].size(); ++k) row.emplace_back(rows[0][k], rows[i][k]);
    jobs.push_back(JobOfRow(row, folder, where));
  }
  return jobs;
}

std::vector<Job> JobsOfJsonl(const std::string& text, const std::string& name, const std::string& folder) {
  std::vector<Job> jobs;
  std::istringstream lines(text);
  int number = 0;
  for (std::string line; std::getline(lines, line);) {
    ++number;
    if (line.find_first_not_of(" \t\r") == std::string::npos) continue;
    const std::string where = Format("%s: row %d", name.c_str(), number);
    const Json json = ParseJson(line, name, number);
    std::vector<std::pair<std::string, std::string>> row;
    for (const auto& [column, value] : JsonView(json, where).Members()) {
      const bool text_value = value.value().is_string();
      row.emplace_back(column, text_value ? value.Text() : value.value().dump());
    }
    jobs.push_back(JobOfRow(row, folder, where));
  }
  return jobs;
}

}  // namespace

Shard ParseShard(const std::string& text) {
  Shard shard;
  const char* const end = text.data() + text.size();
  const auto [slash, no_index] = std::from_chars(text.data(), end, shard.index);
  const bool parted = no_index == std::errc() && slash != end && *slash == '/';
  const auto [rest, no_count] = std::from_chars(parted ? slash + 1 : end, end, shard.count);
  if (!parted || no_count != std::errc() || rest != end || shard.index < 1 || shard.index > shard.count) {
    throw Failure(kWrongUsage, "--shard " + Printable(text) + ": takes K/N, with K from 1 to N");
  }
  return shard;
}

bool FallsTo(const Shard& shard, const Job& job) {
  std::string name = job.unit;
  for (const std::string& input : job.inputs) name += '\0' + fs::path(input).filename().string();
  return std::stoul(HexDigest(name, "SHA256").substr(0, 8), nullptr, 16) % shard.count == shard.index - 1;
}

std::vector<Job> ShareOf(const Shard& shard, std::vector<Job> jobs) {
  jobs.erase(std::remove_if(jobs.begin(), jobs.end(), [&](const Job& job) { return !FallsTo(shard, job); }),
             jobs.end());
  return jobs;
}

bool IsPictureName(const std::string& path) {
  const std::string ending = LowerExtension(path);
  return std::find(kPictureEndings.begin(), kPictureEndings.end(), ending) != kPictureEndings.end();
}

std::vector<Job> JobsOfPhotos(const std::string& folder) {
  std::vector<Job> jobs;
  for (const fs::path& path : Entries(folder)) {
    if (IsPhoto(path.filename().string()) && !fs::is_directory(path)) jobs.push_back(JobOfPhoto(path));
  }
  return jobs;
}

std::vector<Job> JobsOfUnits(const std::string& folder) {
  std::vector<Job> jobs;
  for (const fs::path& path : Entries(folder)) {
    if (!fs::is_directory(path)) continue;
    jobs.emplace_back().unit = path.filename().string();
  }
  return jobs;
}

std::vector<std::vector<std::string>> ParseCsv(const std::string& text, const std::string& name) {
  std::vector<std::vector<std::string>> rows;
  std::vector<std::string> row;
  std::string value;
  bool quoted = false;
  const auto end_row = [&] {
    row.push_back(std::move(value));
    value.clear();
    if (row.size() > 1 || !row[0].empty()) rows.push_back(std::move(row));  // blank lines are none
    row.clear();
  };
  const std::size_t start = text.compare(0, 3, "\xef\xbb\xbf") == 0 ? 3 : 0;  // spreadsheets put a mark in front
  for (std::size_t i = start; i < text.size(); ++i) {
    const char c = text[i];
    if (quoted) {
      if (c != '"') {
        value += c;
      } else if (i + 1 < text.size() && text[i + 1] == '"') {
        value += text[++i];
      } else {
        quoted = false;
      }
    } else if (c == '"' && value.empty()) {
      quoted = true;
    } else if (c == ',') {
      row.push_back(std::move(value));
      value.clear();
    } else if (c == '\n') {
      end_row();
    } else if (c != '\r') {
      value += c;
    }
  }
  if (quoted) throw Failure(kWrongUsage, name + ": a quote stays open up to the end");
  end_row();
  return rows;
}

std::vector<Job> JobsOfManifest(const std::string& text, const std::string& name, const std::string& folder) {
  const std::size_t first = text.find_first_not_of(" \t\r\n");
  if (first == std::string::npos) throw Failure(kWrongUsage, name + ": is empty");
  return text[first] == '{' ? JobsOfJsonl(text, name, folder) : JobsOfCsv(text, name, folder);
}

FolderWatch::FolderWatch(const std::string& folder)
    : inotify_(inotify_init1(IN_NONBLOCK | IN_CLOEXEC)), folder_(folder) {
  if (inotify_ >= 0 && inotify_add_watch(inotify_, folder.c_str(), IN_CLOSE_WRITE | IN_MOVED_TO | IN_ONLYDIR) >= 0)
    return;
  const std::string why = std::strerror(errno);
  if (inotify_ >= 0) close(inotify_);
  throw Failure(kWrongUsage, Printable(folder) + ": can't be watched (" + why + ")");
}

FolderWatch::~FolderWatch() { close(inotify_); }

std::vector<Job> FolderWatch::Arrived() {
  std::vector<Job> jobs;
  alignas(inotify_event) std::array<char, 65536> buffer;
  for (;;) {
    const ssize_t got = read(inotify_, buffer.data(), buffer.size());
    if (got <= 0) return ShareOf(shard_, std::move(jobs));
    for (ssize_t at = 0; at < got;) {
      inotify_event event;
      std::memcpy(&event, buffer.data() + at, sizeof event);
      const std::string name = event.len > 0 ? buffer.data() + at + sizeof event : "";
      if ((event.mask & IN_Q_OVERFLOW) != 0) return ShareOf(shard_, JobsOfPhotos(folder_));  // too many to be told
      if (IsPhoto(name)) jobs.push_back(JobOfPhoto(fs::path(folder_) / name));
      at += static_cast<ssize_t>(sizeof event + event.len);
    }
  }
}

}  // namespace qv
