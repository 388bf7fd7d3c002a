// SPDX-License-Identifier: Apache-2.0
// RecentPayloads: the payloads of the last events, to find the one that a mirror's payload repeats.
//
// A mirror gets a message's payload without its stamp, or as it is; it comes on a queue of its own, so other messages
// stand in between. Each payload has one place, by the hash of its text without the stamp; a later one takes it over.
// What is found is compared to the byte. Owner: the event table. Threads: one at a time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tarn::recorder {

class RecentPayloads {
 public:
  // The event that has the payload, and what is to be cut out of it: the characters before, times 65536, and how many;
  // 0: nothing.
  struct Found {
    std::int64_t id;
    std::int64_t cut;
  };

  // Remembers a payload up to 4096 bytes; the room for 2048 of them is taken with the first one.
  void add(std::int64_t id, std::string_view payload);
  std::optional<Found> find(std::string_view payload);
  // Keeps the room.
  void clear() noexcept;

 private:
  // Which bytes of a payload are its stamp, with the comma that goes with it.
  struct Stamp {
    std::size_t at = 0;
    std::size_t size = 0;  // 0: there is none
  };
  struct Remembered {
    std::int64_t id = 0;
    Stamp stamp;
    std::string text;
  };

  static Stamp stampOf(std::string_view payload) noexcept;
  std::size_t slotOf(std::string_view payload, const Stamp& stamp);

  std::vector<Remembered> slots_;
  std::string rest_;  // of a payload without its stamp; kept for its room
};

}  // namespace tarn::recorder
