// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/rows/EventGroup.h"

#include "recorder/store/files/RowHash.h"

namespace tarn::recorder {

namespace {

constexpr std::size_t kHashBytes = sizeof(std::uint64_t);

void append(std::string& bytes, std::uint64_t value) {
  for (std::size_t i = 0; i < kHashBytes; ++i) {
    bytes.push_back(static_cast<char>(value >> (8 * i) & 0xFFU));
  }
}

std::uint64_t valueAt(std::string_view bytes, std::size_t at) noexcept {
  std::uint64_t value = 0;
  for (std::size_t i = kHashBytes; i-- > 0;) {
    value = value << 8U | static_cast<unsigned char>(bytes[at + i]);
  }
  return value;
}

}  // namespace

std::uint64_t hashOf(std::int64_t id, const StoredEvent& event) noexcept {
  RowHash hash;
  hash.add(static_cast<std::uint64_t>(id));
  hash.add(event.time);
  hash.add(event.backend);
  hash.add(event.name);
  hash.add(event.payload);
  hash.add(event.detail);
  if (event.session != 0) {
    hash.add(static_cast<std::uint64_t>(event.session));
  }
  return hash.value();
}

void EventGroup::begin(std::int64_t first, double seconds) {
  first_ = first;
  seconds_ = seconds;
  bytes_.clear();
}

void EventGroup::add(std::uint64_t hash) {
  append(bytes_, hash);
}

std::string EventGroup::hashes() const {
  std::string all = bytes_;
  append(all, ownHash());
  return all;
}

bool EventGroup::read(std::int64_t first, double seconds, std::string_view hashes) {
  begin(first, seconds);
  if (hashes.size() < 2 * kHashBytes || hashes.size() % kHashBytes != 0) return false;
  const std::string_view events = hashes.substr(0, hashes.size() - kHashBytes);
  bytes_.assign(events);
  if (size() <= kMostEvents && ownHash() == valueAt(hashes, events.size())) return true;
  bytes_.clear();
  return false;
}

std::int64_t EventGroup::size() const noexcept {
  return static_cast<std::int64_t>(bytes_.size() / kHashBytes);
}

std::uint64_t EventGroup::hash(std::int64_t id) const noexcept {
  return valueAt(bytes_, static_cast<std::size_t>(id - first_) * kHashBytes);
}

std::uint64_t EventGroup::ownHash() const noexcept {
  RowHash hash;
  hash.add(static_cast<std::uint64_t>(first_));
  hash.add(seconds_);
  hash.add(std::string_view(bytes_));
  return hash.value();
}

}  // namespace tarn::recorder
