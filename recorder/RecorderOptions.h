// RecorderOptions: where the recorder writes and every bound that it keeps, with what happens at each.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>

namespace tarn::recorder {

struct RecorderOptions {
  std::filesystem::path file;

  // Retention: beyond either, the oldest events go first. A megabyte is 2^20 bytes; at least one is kept.
  std::int64_t maxMegabytes = 256;
  double maxAgeDays = 30;
  // How often an idle recorder looks for events that have grown too old.
  std::chrono::milliseconds maintenanceInterval{60'000};

  // Commits: a group is written this long after its first event at the latest, earlier when nothing new has come for
  // the quiet time or when the group is large.
  std::chrono::milliseconds groupTime{100};
  std::chrono::milliseconds quietTime{20};
  std::size_t groupEvents = 4096;
  std::size_t groupBytes = std::size_t{4} << 20;

  // Waiting events: from the high marks on isFull() is true, until both low marks are reached. They are low enough for
  // what waits to be written within the time that a crash may cost.
  std::size_t highWaterEvents = 16'384;
  std::size_t lowWaterEvents = 8'192;
  std::size_t highWaterBytes = std::size_t{16} << 20;
  std::size_t lowWaterBytes = std::size_t{8} << 20;

  // After a fault the next try comes after the first pause, each further one after twice as long, up to the last.
  std::chrono::milliseconds firstRetry{250};
  std::chrono::milliseconds lastRetry{1000};
  // How often a shutdown tries a disk that fails before what waits is given up.
  int shutdownTries = 3;
  std::chrono::milliseconds shutdownRetry{100};

  bool operator==(const RecorderOptions&) const = default;
};

}  // namespace tarn::recorder
