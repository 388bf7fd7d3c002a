// HandOverPage: how many events were handed over and committed, in a small mapped file beside the recorder's, which
// outlives the process however it ends. The next run reads from it how many were lost.
//
// Counting is a store to memory. When the file can't be made or mapped, nothing is kept. A file that is cut meanwhile
// is mapped again by the next keep(). Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <optional>

#include "plist/Result.h"

namespace tarn::recorder {

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

  // Maps the file, which is made when there is none. The value is what the run before left in it.
  [[nodiscard]] Result<std::optional<HandOverCounts>> open(const std::filesystem::path& file);
  void handOver(std::uint64_t handedOver) noexcept;
  void keep(const HandOverCounts& counts) noexcept;
  // Whether the mapping lost its file.
  bool isTorn() const noexcept;

 private:
  struct Page;

  void unmap() noexcept;

  Page* page_ = nullptr;
  std::uint64_t tornBefore_ = 0;
};

}  // namespace tarn::recorder
