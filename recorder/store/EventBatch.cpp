// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/EventBatch.h"

#include <utility>

namespace tarn::recorder {

namespace {

constexpr std::size_t kUsualNameBytes = 64;

}  // namespace

void EventBatch::reserve(std::size_t events) {
  events_.reserve(events);
  names_.reserve(events * kUsualNameBytes);
}

std::size_t EventBatch::add(std::string_view backend, std::string_view name, plist::Dictionary payload,
                            plist::Dictionary detail, double time, platform::SessionNumber session) {
  std::size_t bytes = sizeof(Event) + name.size();
  if (events_.empty() || !events_.back().payload.sharesStorageWith(payload)) {
    bytes += payload.storageBytes();
  }
  if (!detail.empty()) {
    bytes += detail.storageBytes();
  }
  const std::size_t nameAt = names_.size();
  names_.append(name);
  try {
    events_.push_back(Event{backend, time, nameAt, name.size(), bytes, std::move(payload), std::move(detail), session});
  } catch (...) {
    names_.resize(nameAt);
    throw;
  }
  bytes_ += bytes;
  return bytes;
}

std::size_t EventBatch::add(SessionNote note) {
  const std::size_t bytes = sizeof(Event) + sizeof(SessionNote) + note.facts.process.size() +
                            note.facts.application.size() + note.facts.serviceName.size() + note.message.storageBytes();
  notes_.push_back(std::move(note));
  try {
    events_.push_back(Event{{}, 0, 0, 0, bytes, {}, {}, 0, notes_.size() - 1});
  } catch (...) {
    notes_.pop_back();
    throw;
  }
  bytes_ += bytes;
  return bytes;
}

void EventBatch::clear() noexcept {
  events_.clear();
  notes_.clear();
  names_.clear();
  bytes_ = 0;
}

void EventBatch::swap(EventBatch& other) noexcept {
  events_.swap(other.events_);
  names_.swap(other.names_);
  notes_.swap(other.notes_);
  std::swap(bytes_, other.bytes_);
}

}  // namespace tarn::recorder
