// SPDX-License-Identifier: Apache-2.0
// EventOwner: whose an event is, of which sort, and how much of the file it counts for, as retention sees it.
//
// Which problem: an event's texts are shared with others', of other users too, so what it takes on the disk changes
// with every removal. How: an event counts for what it says, each text in full, as a reader of `events` would see it.
// That never changes, needs nobody else's rows, and is the same for everybody. The rows of its session count for
// nobody: a flood of sessions of one small message each leaves less to share.
// Threads: any.
#pragma once

#include <cstdint>
#include <string_view>

#include "recorder/store/rows/EventGroup.h"

namespace tarn::recorder {

// The uid of its session. What came on nobody's behalf, or for a session that nobody knows, is the service's own.
using Owner = std::int64_t;
inline constexpr Owner kServiceItself = -1;

enum class EventSort : std::uint8_t {
  Message,  // tells of one message, and there may be thousands a second
  Summary,  // what was made of the messages: summaries, driver channels, and what was asked of the device
};

// By the three texts of its kind.
EventSort sortOf(std::string_view backend, std::string_view name, std::string_view detail) noexcept;

// Beside its texts: its row, its checksum, its part of the lists.
inline constexpr std::int64_t kBytesBesideTexts = 64;

inline std::int64_t countedBytes(const StoredEvent& event) noexcept {
  return kBytesBesideTexts + static_cast<std::int64_t>(event.backend.size() + event.name.size() + event.detail.size() +
                                                       event.payload.size());
}

}  // namespace tarn::recorder
