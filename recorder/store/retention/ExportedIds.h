// SPDX-License-Identifier: Apache-2.0
// ExportedIds: up to which id events have left the device, as whoever carries them away says.
//
//   a file with that id in decimal and a line's end, replaced as a whole whenever it has grown
//
// What was carried away is somewhere else too, and what wasn't is here alone; so the first goes first. A file that
// isn't there, or says nothing, tells that nobody carries anything away. An id that is too small costs an event that is
// somewhere else its turn, no more.
//
// Owner: the retention. Threads: the writer's.
#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <utility>

namespace tarn::recorder {

class ExportedIds {
 public:
  // Empty: nobody carries anything away.
  void setFile(std::filesystem::path file) noexcept { file_ = std::move(file); }
  // The greatest id that has left, read anew; nothing where nobody says. Waits for nobody, whatever stands there.
  std::optional<std::int64_t> read() const;

 private:
  std::filesystem::path file_;
};

}  // namespace tarn::recorder
