// StateUsage: what the files beside the recorder's database take of the cap that holds for all of them.
//
//   cap = database + its log + index and counts + files set aside + the kinds of files that others write
//
// Each kind but the database has a share and an age. Files beyond the age go. Beyond the share files set aside go, the
// last one first: the first tells how the trouble began; of the others the oldest go. What is left of the cap is the
// database's. Nothing but regular files is looked at or removed, and no link is followed. Owner: the event writer.
// Threads: the writer's.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <string>
#include <utility>
#include <vector>

namespace tarn::recorder {

// Files that others write without end: those of a folder whose names end so, and which no kind before them takes.
struct FileKind {
  std::filesystem::path folder;
  std::string ending;
  double maxAgeDays;

  bool operator==(const FileKind&) const = default;
};

class StateUsage {
 public:
  // The age in seconds of a file that was last written at a time of the wall clock.
  using AgeOf = std::function<double(double wall)>;

  StateUsage(std::filesystem::path file, std::vector<FileKind> kinds, double asideMaxAgeDays, std::int64_t cap)
      : file_(std::move(file)), kinds_(std::move(kinds)), asideMaxAgeDays_(asideMaxAgeDays), cap_(cap) {}

  // Looks at all of it and removes what is too old or beyond the shares; what was removed, each with the reason.
  std::vector<std::string> tidy(const AgeOf& ageOf);
  // What the database may take beside a log of this size.
  std::int64_t databaseBytes(std::int64_t logBytes) const noexcept;

 private:
  struct Found {
    std::filesystem::path path;
    std::int64_t bytes = 0;
    std::int64_t changed = 0;  // nanoseconds of the wall clock
  };

  static std::vector<Found> filesOf(const std::filesystem::path& folder, const std::string& prefix);
  std::vector<Found> filesOf(std::size_t kind) const;
  static void removeAged(std::vector<Found>& files, double maxAgeDays, const AgeOf& ageOf,
                         std::vector<std::string>& removed);
  static std::int64_t keepWithin(const std::vector<Found>& files, std::int64_t share,
                                 std::vector<std::string>& removed);

  const std::filesystem::path file_;
  const std::vector<FileKind> kinds_;
  const double asideMaxAgeDays_;
  const std::int64_t cap_;
  std::int64_t beside_ = 0;  // of all but the database and its log
};

// Which other processes keep the log's index of this database locked for reading: "1234 (name)" each.
std::vector<std::string> readersOf(const std::filesystem::path& database);

}  // namespace tarn::recorder
