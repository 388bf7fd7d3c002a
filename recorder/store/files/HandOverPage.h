// SPDX-License-Identifier: Apache-2.0
// HandOverPage: how many events were handed over and committed, in a small mapped file beside the recorder's, which
// outlives the process however it ends. The next run reads from it how many were lost.
//
// Counting is a store to memory. When the file can't be made or mapped, nothing is kept. A file that is cut meanwhile
// is mapped again by the next keep(). Threads: one at a time.
//
//   the page:  handed over: 8 bytes, stored with every event
//              two places for what a commit left, written by turns, each with a sequence number and its own checksum
//
// A kill between two stores leaves a page that is at most one event off; a kill within a commit's store leaves the
// place of the commit before. A machine that stops may lose the page, which isn't synchronised.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>

#include "plist/Result.h"

namespace tarn::recorder {

// What one run left, or leaves.
struct HandOverCounts {
  std::uint64_t handedOver = 0;
  std::uint64_t committed = 0;
  std::uint64_t failed = 0;
  std::int64_t lastId = 0;  // of the last committed event
};

class HandOverPage {
 public:
  HandOverPage() = default;
  ~HandOverPage() { unmap(); }
  HandOverPage(const HandOverPage&) = delete;
  HandOverPage& operator=(const HandOverPage&) = delete;

  // Maps the file, which is made with mode 0640 when there is none. The value is what the run before left in it;
  // nothing in a new file or one without a whole entry. An error names the file, and then nothing is kept. May be
  // called again, which maps it anew.
  [[nodiscard]] Result<std::optional<HandOverCounts>> open(const std::filesystem::path& file);
  // One more was handed over: their number by now. A store; safe in a file that was cut.
  void handOver(std::uint64_t handedOver) noexcept;
  // What a commit left, all counts together.
  void keep(const HandOverCounts& counts) noexcept;
  // Whether the mapping lost its file: what is kept then is lost with the process.
  bool isTorn() const noexcept;

 private:
  // What lies in the file.
  struct Page;

  void unmap() noexcept;

  // Null while nothing is kept.
  Page* page_ = nullptr;
  // MappedGuard's count when the file was mapped.
  std::uint64_t tornBefore_ = 0;
};

}  // namespace tarn::recorder
