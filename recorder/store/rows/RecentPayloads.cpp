// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/rows/RecentPayloads.h"

#include <algorithm>

#include "recorder/store/files/RowHash.h"

namespace tarn::recorder {

namespace {

constexpr std::size_t kSlots = 2048;
constexpr std::size_t kLongest = 4096;
constexpr std::string_view kStampKey = "\"tarnreporting_timestamp\":";

// Of UTF-8 that is known to be whole.
std::int64_t charactersOf(std::string_view text) noexcept {
  return std::count_if(text.begin(), text.end(),
                       [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80U; });
}

}  // namespace

// Where the key's text stands elsewhere too, nothing that is found compares as equal.
RecentPayloads::Stamp RecentPayloads::stampOf(std::string_view payload) noexcept {
  const std::size_t key = payload.find(kStampKey);
  if (key == std::string_view::npos || key == 0) return {};
  const std::size_t end = payload.find_first_not_of("+-.0123456789eE", key + kStampKey.size());
  if (end == std::string_view::npos) return {};
  if (payload[end] == ',') return {key, end + 1 - key};
  return payload[key - 1] == ',' ? Stamp{key - 1, end - key + 1} : Stamp{key, end - key};
}

// Of what is left without the stamp, so that both hash alike.
std::size_t RecentPayloads::slotOf(std::string_view payload, const Stamp& stamp) {
  rest_.assign(payload.substr(0, stamp.at)).append(payload.substr(stamp.at + stamp.size));
  RowHash hash;
  hash.add(std::string_view(rest_));
  return static_cast<std::size_t>(hash.value()) % kSlots;
}

void RecentPayloads::add(std::int64_t id, std::string_view payload) {
  if (payload.size() > kLongest) return;
  if (slots_.empty()) {
    slots_.resize(kSlots);
  }
  const Stamp stamp = stampOf(payload);
  Remembered& slot = slots_[slotOf(payload, stamp)];
  slot.id = 0;
  slot.text.assign(payload);
  slot.stamp = stamp;
  slot.id = id;
}

std::optional<RecentPayloads::Found> RecentPayloads::find(std::string_view payload) {
  if (slots_.empty() || payload.size() > kLongest) return std::nullopt;
  const Remembered& slot = slots_[slotOf(payload, stampOf(payload))];
  const std::string_view text = slot.text;
  if (slot.id == 0) return std::nullopt;
  if (text == payload) return Found{slot.id, 0};
  const auto& [at, size] = slot.stamp;
  const bool isCut = size != 0 && text.size() == payload.size() + size && text.substr(0, at) == payload.substr(0, at) &&
                     text.substr(at + size) == payload.substr(at);
  if (!isCut) return std::nullopt;
  // A cut is never 0: it takes at least the key.
  return Found{slot.id, charactersOf(text.substr(0, at)) << 16U | static_cast<std::int64_t>(size)};
}

void RecentPayloads::clear() noexcept {
  for (Remembered& slot : slots_) {
    slot.id = 0;
  }
}

}  // namespace tarn::recorder
