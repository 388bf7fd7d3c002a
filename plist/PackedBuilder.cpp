// SPDX-License-Identifier: Apache-2.0
#include "plist/PackedBuilder.h"

#include <algorithm>
#include <cstring>

#include "plist/KeyListBody.h"
#include "plist/Packed.h"

namespace tarn::plist {

namespace {

// Beyond that, entries are set one by one.
constexpr std::size_t kBytesInOneStep = 128;

// Packed bytes of the entries when they can be added to a block of these keys in one step; 0 when they can't.
std::size_t sizeInOneStep(const detail::KeyListBody* keys, std::span<const Dictionary::Entry> entries) noexcept {
  if (keys == nullptr) return 0;
  std::size_t bytes = 0;
  for (const Dictionary::Entry& entry : entries) {
    const std::size_t size = Packed::sizeOf(entry.value);
    const bool isContainer = entry.value.kind() == Kind::Array || entry.value.kind() == Kind::Dictionary;
    if (size == 0 || isContainer || detail::indexInKeyList(keys, entry.key) != KeyList::npos) return 0;
    bytes += size;
  }
  return bytes <= kBytesInOneStep ? bytes : 0;
}

// A block of its own with the same entries, and room for so many bytes, of which those at the end aren't written.
detail::Body* copyOf(const detail::Body& body, std::size_t bytes) {
  detail::Body* const copy = detail::makeBody(bytes);
  copy->keys = body.keys;
  detail::retainKeyList(copy->keys);
  std::memcpy(copy->data(), body.data(), body.bytes);
  if (body.holdsContainers != 0) {
    copy->holdsContainers = 1;
    detail::retainContainers(copy->data(), copy->data() + body.bytes);
  }
  return copy;
}

}  // namespace

std::optional<KeyList> KeyListCache::find(std::uint64_t hash, std::span<const std::string_view> texts) {
  if (texts.size() > kLongestKept) return KeyList::make(texts);
  if (slots_.empty()) {
    slots_.resize(kSlots);
  }
  KeyList& slot = slots_[hash % kSlots];
  if (slot.hash() == hash && slot.equals(texts)) return slot;
  std::optional<KeyList> made = KeyList::make(texts);
  if (made) {
    slot = *made;
  }
  return made;
}

PackedBuilder::~PackedBuilder() {
  reset();
}

void PackedBuilder::begin() {
  levels_.push_back({used_, keys_.size(), 0, 0, false});
}

void PackedBuilder::add(std::string_view key, const ValueView& value) {
  keys_.push_back(key);
  levels_.back().hash = KeyList::combineHash(levels_.back().hash, Key::hashOf(key));
  add(value);
}

void PackedBuilder::add(const ValueView& value) {
  const std::size_t size = Packed::sizeOf(value);
  if (bytes_.size() - used_ < size) [[unlikely]] {
    bytes_.resize(std::max(2 * bytes_.size(), used_ + size));
  }
  Packed::write(bytes_.data() + used_, value);
  used_ += size;
  Level& level = levels_.back();
  ++level.count;
  level.holdsContainers = level.holdsContainers || value.kind() == Kind::Array || value.kind() == Kind::Dictionary;
}

void PackedBuilder::nameValues(const KeyList& keys, std::size_t count) {
  std::uint64_t& hash = levels_.back().hash;
  for (std::size_t i = 0; i < count; ++i) {
    keys_.push_back(keys[i].text());
    hash = KeyList::combineHash(hash, keys[i].hash());
  }
}

// Takes the innermost level's bytes, and the references they hold, into a block.
detail::Body* PackedBuilder::takeBody() {
  const Level& level = levels_.back();
  const std::size_t size = used_ - level.bytesBegin;
  detail::Body* body = detail::makeBody(size);
  body->holdsContainers = level.holdsContainers ? 1 : 0;
  std::memcpy(body->data(), bytes_.data() + level.bytesBegin, size);
  used_ = level.bytesBegin;
  return body;
}

void PackedBuilder::dropLevel() noexcept {
  const Level& level = levels_.back();
  if (level.holdsContainers) {
    detail::releaseContainers(bytes_.data() + level.bytesBegin, bytes_.data() + used_);
  }
  used_ = level.bytesBegin;
  keys_.resize(level.keysBegin);
  levels_.pop_back();
}

std::optional<Dictionary> PackedBuilder::finishDictionary(KeyListCache& cache) {
  const Level& level = levels_.back();
  if (level.count == 0) {
    dropLevel();
    return Dictionary();
  }
  std::optional<KeyList> list = cache.find(level.hash, std::span(keys_).subspan(level.keysBegin));
  if (!list) {
    dropLevel();
    return std::nullopt;
  }
  detail::Body* body = takeBody();
  body->keys = std::exchange(list->body_, nullptr);
  keys_.resize(level.keysBegin);
  levels_.pop_back();
  return Dictionary(body);
}

Dictionary PackedBuilder::finishDictionary(const KeyList& keys) {
  if (keys.empty()) {
    dropLevel();
    return {};
  }
  KeyList list = keys;
  detail::Body* body = takeBody();
  body->keys = std::exchange(list.body_, nullptr);
  levels_.pop_back();
  return Dictionary(body);
}

Array PackedBuilder::finishArray() {
  if (levels_.back().count == 0) {
    dropLevel();
    return {};
  }
  detail::Body* body = takeBody();
  body->count = levels_.back().count;
  levels_.pop_back();
  return Array(body);
}

void PackedBuilder::Draft::begin(std::size_t mostBytes) {
  if (bytes_.size() < mostBytes) {
    bytes_.resize(std::max(2 * bytes_.size(), mostBytes));
  }
  used_ = 0;
  keys_ = nullptr;
}

void PackedBuilder::Draft::add(const ValueView& value) noexcept {
  wrote(Packed::write(next(), value));
}

void PackedBuilder::Draft::addSigned(std::int64_t value) noexcept {
  wrote(Packed::writeSigned(next(), value));
}

void PackedBuilder::Draft::addUnsigned(std::uint64_t value) noexcept {
  wrote(Packed::writeUnsigned(next(), value));
}

void PackedBuilder::Draft::addDouble(double value) noexcept {
  wrote(Packed::writeDouble(next(), value));
}

void PackedBuilder::Draft::addText(std::string_view text) noexcept {
  wrote(Packed::writeText(next(), text));
}

ValueView PackedBuilder::Draft::at(std::size_t index) const noexcept {
  const std::byte* at = bytes_.data();
  if (index + 1 == keys_->size()) return Packed::read(at + last_);
  for (; index > 0; --index) {
    at += Packed::sizeAt(at);
  }
  return Packed::read(at);
}

Dictionary PackedBuilder::Draft::dictionary() const {
  if (keys_->empty()) return {};
  KeyList list = *keys_;
  detail::Body* const body = detail::makeBody(used_);
  std::memcpy(body->data(), bytes_.data(), used_);
  body->keys = std::exchange(list.body_, nullptr);
  return Dictionary(body);
}

PackedBuilder::Addition::Addition(const KeyList& keys, std::span<const Dictionary::Entry> entries) : before_(keys) {
  const std::size_t bytes = sizeInOneStep(keys.body_, entries);
  if (bytes == 0) return;
  packed_.resize(bytes);
  std::byte* to = packed_.data();
  KeyList list = keys;
  for (const Dictionary::Entry& entry : entries) {
    to = Packed::write(to, entry.value);
    list = list.appending(entry.key);
  }
  after_ = std::move(list);
}

void PackedBuilder::Addition::addTo(Dictionary& dictionary) const {
  detail::Body*& body = dictionary.body_;
  const std::size_t before = body->bytes;
  if (detail::isShared(body)) {
    Dictionary copy(copyOf(*body, before + packed_.size()));
    std::swap(body, copy.body_);
  } else {
    body = detail::growBody(body, before + packed_.size());
  }
  std::memcpy(body->data() + before, packed_.data(), packed_.size());
  detail::retainKeyList(after_.body_);
  detail::releaseKeyList(std::exchange(body->keys, after_.body_));
}

Dictionary PackedBuilder::Addition::addedTo(const Draft& draft) const {
  detail::Body* const body = detail::makeBody(draft.used_ + packed_.size());
  std::memcpy(body->data(), draft.bytes_.data(), draft.used_);
  std::memcpy(body->data() + draft.used_, packed_.data(), packed_.size());
  detail::retainKeyList(after_.body_);
  body->keys = after_.body_;
  return Dictionary(body);
}

void PackedBuilder::reset() noexcept {
  while (!levels_.empty()) {
    dropLevel();
  }
}

}  // namespace tarn::plist
