// SPDX-License-Identifier: Apache-2.0
// ExportedIds: up to which id events have left the device, as whoever carries them away says.
//
//   a file with that id in decimal and a line's end, replaced as a whole whenever it has grown
//
// Which problem: what was carried away is somewhere else too, and what wasn't is here alone; so the first goes first.
// How: the file is read again now and then. One that isn't there, or says nothing, tells that nobody carries anything
// away. An id too small costs an event that is somewhere else its turn, no more.
//
// Owner: the retention. Threads: the writer's.
#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <optional>

namespace tarn::recorder {

class ExportedIds {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;
  // How old what is known of the file may be.
  static constexpr std::chrono::milliseconds kBetweenLooks{500};

  // Empty: nobody carries anything away.
  void setFile(const std::filesystem::path& file);
  // The greatest id that has left; nothing where nobody says.
  std::optional<std::int64_t> upTo(TimePoint now);

 private:
  std::filesystem::path file_;
  std::optional<std::int64_t> upTo_;
  TimePoint nextLook_{};
};

}  // namespace tarn::recorder
