// SPDX-License-Identifier: Apache-2.0
// EventBatch: events in the order of their hand-over, as the clients' thread leaves them for the writer.
//
// Which problem: handing an event over must cost next to nothing. Dictionaries come by reference count and the names
// lie one after the other in one text, so once a batch has grown to its usual size an event allocates nothing. Owner:
// the recorder, which swaps two of them. Threads: one at a time.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"
#include "recorder/store/SessionTable.h"

namespace tarn::recorder {

class EventBatch {
 public:
  static constexpr std::size_t kNoNote = static_cast<std::size_t>(-1);

  // One event, its dictionaries shared with whoever handed it over; or a note of what happened to a session.
  struct Event {
    std::string_view backend;  // a text that lives for ever
    double time;               // epoch seconds
    std::size_t nameAt;        // where the name begins in the names
    // Bytes.
    std::size_t nameSize;
    std::size_t bytes;  // what the event is counted for
    plist::Dictionary payload;
    plist::Dictionary detail;
    platform::SessionNumber session;  // on whose behalf it came, 0 for nobody's
    std::size_t note = kNoNote;       // its place among the notes: then nothing else is told but the bytes
    bool isNote() const noexcept { return note != kNoNote; }
  };

  // Takes the memory for so many events beforehand; what isn't used of it is never touched.
  void reserve(std::size_t events);
  // Adds an event; returns the bytes that it is counted for. A payload shared with the event before costs nothing more.
  // Without the memory for it nothing has changed.
  std::size_t add(std::string_view backend, std::string_view name, plist::Dictionary payload, plist::Dictionary detail,
                  double time, platform::SessionNumber session = 0);
  // Adds a note, which comes after the events that are there; the same otherwise.
  std::size_t add(SessionNote note);
  // Lets go of all events and keeps the room.
  void clear() noexcept;
  // Costs nothing; each keeps the other's room.
  void swap(EventBatch& other) noexcept;

  // Events and notes.
  bool empty() const noexcept { return events_.empty(); }
  std::size_t size() const noexcept { return events_.size(); }
  // Of all events, as add() counted them.
  std::size_t bytes() const noexcept { return bytes_; }
  // Valid until the next add(), as is its name.
  const Event& operator[](std::size_t index) const noexcept { return events_[index]; }
  // What a note of this batch says.
  const SessionNote& note(const Event& event) const noexcept { return notes_[event.note]; }
  // Of an event of this batch.
  std::string_view name(const Event& event) const noexcept {
    return std::string_view(names_).substr(event.nameAt, event.nameSize);
  }

 private:
  // Names lie apart, as a text each would be an allocation each.
  std::vector<Event> events_;
  // One after the other, in the events' order.
  std::string names_;
  std::vector<SessionNote> notes_;
  std::size_t bytes_ = 0;
};

}  // namespace tarn::recorder
