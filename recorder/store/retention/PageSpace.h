// SPDX-License-Identifier: Apache-2.0
// PageSpace: what the database takes of the disk, in pages, and how it takes less.
//
// Owner: the retention; inside its transactions. Threads: the writer's. What fails answers SQLite's code.
#pragma once

#include <cstdint>

#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"

namespace tarn::recorder {

class PageSpace {
 public:
  struct Bytes {
    std::int64_t file = 0;
    std::int64_t used = 0;  // of that, in pages that hold something
  };

  PageSpace() = default;
  PageSpace(const PageSpace&) = delete;
  PageSpace& operator=(const PageSpace&) = delete;

  // Gets ready for a connection, which outlives it until finalize().
  [[nodiscard]] int prepare(Connection& connection);
  void finalize() noexcept;

  [[nodiscard]] int read(Bytes& bytes);
  // Gives free pages of a file that is larger than `maxBytes` back to the file system, 64 at the most. Whether any
  // went: there may be more then.
  [[nodiscard]] int giveBack(std::int64_t maxBytes, bool& gaveAny);

 private:
  Connection* connection_ = nullptr;
  // Prepared once for each connection, as they run with every commit.
  Statement pageCount_;
  Statement freePages_;
  std::int64_t pageBytes_ = 0;
};

}  // namespace tarn::recorder
