// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionTags: what the intake adds to messages of one kind, shape and application, formed once: the tag
// and the name of the application.
//
// Which problem: nearly every message gets both, and nearly always the same as the one before it. How: what was formed
// is kept, by the payload's keys, the kind and the application, in one of a fixed number of places for the whole
// process. Another one that falls into the same place drops what was there. Long key lists aren't kept, so that nobody
// can fill the places with huge ones.
//
// Part of the process's state; sessions share it. Threads: the server queue.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

#include "plist/PackedBuilder.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

class TarnReportingSessionTags {
 public:
  using Draft = plist::PackedBuilder::Draft;

  // What is known of payloads of one shape, kind and application.
  struct Known {
    plist::KeyList keys;
    plist::Key application{std::string_view()};
    TarnReportingSessionMessage::Kind kind = 0;
    // The tag and the application; for no payload where it has one of the two keys.
    plist::PackedBuilder::Addition added;
    std::size_t stamp = plist::KeyList::npos;  // its place among the keys
  };

  TarnReportingSessionTags();
  TarnReportingSessionTags(const TarnReportingSessionTags&) = delete;
  TarnReportingSessionTags& operator=(const TarnReportingSessionTags&) = delete;
  ~TarnReportingSessionTags();

  // Adds both entries where the payload has neither; whether it did. Without the memory for it nothing has changed.
  bool addTo(plist::Dictionary& payload, AudioEventCategory category, AudioEventType type,
             const plist::Key& application);
  // Null when such a payload needs more than the two entries: it has one of them, a blank in a key, or no time stamp.
  // Holds until the next call.
  const Known* find(const Draft& draft, AudioEventCategory category, AudioEventType type,
                    const plist::Key& application);

 private:
  static constexpr std::size_t kPlaces = 256;
  static constexpr std::size_t kMostKeys = 64;

  Known& placeOf(std::uint64_t keysHash, TarnReportingSessionMessage::Kind kind,
                 const plist::Key& application) noexcept;
  // Forms it anew in its place.
  static void learn(Known& known, const plist::KeyList& keys, AudioEventCategory category, AudioEventType type,
                    const plist::Key& application);

  const std::unique_ptr<Known[]> places_;
};

}  // namespace tarn
