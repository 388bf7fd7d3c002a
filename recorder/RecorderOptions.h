// SPDX-License-Identifier: Apache-2.0
// RecorderOptions: where the recorder writes and every bound that it keeps, with what happens at each. Plain data, read
// once when the recorder is made; the configuration sets the retention, the rest are constants but for tests.
#pragma once

#include <atomic>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "recorder/store/files/FileKinds.h"

namespace tarn::recorder {

// What is kept of a message that repeats an earlier one.
enum class Redundant {
  Count,  // how many there were in a period
  Mark,   // that, and a row each with the event of the message that it repeats
};

struct RecorderOptions {
  // The database; its log, the log's index, the counts and files set aside lie beside it under names that begin with
  // its own.
  std::filesystem::path file;

  // Retention: beyond the size the oldest messages of the user with most go first, and summaries last. A megabyte is
  // 2^20 bytes; at least one is kept. The size is that of the database with its log, of files set aside, and of the
  // files of these kinds; see StateUsage.
  std::int64_t maxMegabytes = 256;
  std::vector<FileKind> files;
  FileMaxAges fileMaxAges;
  // What else counts as part of that size: bytes that others keep for a while; null: none.
  std::shared_ptr<const std::atomic<std::int64_t>> others;
  // How old messages get, and what was made of them; that is no less.
  double maxAgeDays = 30;
  double summaryMaxAgeDays = 120;
  // A file that says up to which id events have left the device: these go before the others. Nothing: none leaves.
  std::optional<std::string> exported;
  // How often an idle recorder looks for events that have grown too old. Ages are days, so a minute is soon enough; a
  // busy one looks with each commit.
  std::chrono::milliseconds maintenanceInterval{60'000};

  Redundant redundant = Redundant::Count;

  // Commits: a group is written this long after its first event at the latest, earlier when nothing new has come for
  // the quiet time or when the group is large. While many come (the last group had busyGroupEvents), company is worth
  // more time.
  std::chrono::milliseconds groupTime{4};
  std::chrono::milliseconds quietTime{1};
  std::chrono::milliseconds busyGroupTime{20};
  std::size_t busyGroupEvents = 512;
  // A group of this size is written at once.
  std::size_t groupEvents = 4096;
  std::size_t groupBytes = std::size_t{4} << 20;

  // Waiting events: from the high marks on isFull() is true, from three quarters of them on isCrowded(), until both low
  // marks are reached.
  std::size_t highWaterEvents = 16'384;
  std::size_t lowWaterEvents = 8'192;
  std::size_t highWaterBytes = std::size_t{16} << 20;
  std::size_t lowWaterBytes = std::size_t{8} << 20;

  // The high mark is lower while disk or processor are slow: as many events as are committed in this time, at the pace
  // that is measured, but so many at the least. What a crash may cost is 200 ms; the rest is for a pace that changes.
  std::chrono::milliseconds commitWindow{120};
  std::size_t fewestWaiting = 256;

  // From this age of the oldest waiting event on isFull() is true too: no pace tells that a commit will stall.
  std::chrono::milliseconds oldestWaiting{100};

  // How often a piece of the file is compared with its checksums, and for how long: half of a hundredth of the time.
  // After the last piece nothing is compared for the rest.
  std::chrono::milliseconds verifyInterval{1000};
  std::chrono::milliseconds verifyTime{5};
  std::chrono::milliseconds verifyRest{6 * 3'600'000};

  // A log beyond this is told, once each time, with the readers that hold it up; nothing else is done about it.
  std::int64_t longLogBytes = std::int64_t{64} << 20;

  // What tells this boot of the system from others; the kernel's own name for it when empty.
  std::string boot;
  // Of the service, for the row of its run.
  std::string version;
  // What the machine is, a JSON object, likewise.
  std::string machine;
  // For which session the calling thread works, 0 for none; asked with every event. Null: for none.
  std::int64_t (*sessionOf)() noexcept = nullptr;

  // After a fault the next try comes after the first pause, each further one after twice as long, up to the last: a
  // disk that comes back is found within a second, and one that doesn't costs next to nothing.
  std::chrono::milliseconds firstRetry{250};
  std::chrono::milliseconds lastRetry{1000};
  // How often a shutdown tries a disk that fails before what waits is given up, and the pause between two tries.
  int shutdownTries = 3;
  std::chrono::milliseconds shutdownRetry{100};

  bool operator==(const RecorderOptions&) const = default;
};

}  // namespace tarn::recorder
