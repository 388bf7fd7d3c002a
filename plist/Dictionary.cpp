// SPDX-License-Identifier: Apache-2.0
#include "plist/Dictionary.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <vector>

#include "plist/KeyListBody.h"
#include "plist/Packed.h"

namespace tarn::plist {

namespace detail {

void releaseDictionaryBody(Body* body) noexcept {
  if (body == nullptr || body->references.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
  if (body->holdsContainers != 0) {
    releaseContainers(body->data(), body->end());
  }
  releaseKeyList(body->keys);
  freeBody(body);
}

}  // namespace detail

namespace {

using detail::Body;

const std::byte* itemAt(const Body& body, std::size_t index) noexcept {
  const std::byte* at = body.data();
  for (; index > 0; --index) {
    at += Packed::sizeAt(at);
  }
  return at;
}

bool isContainer(const ValueView& value) noexcept {
  return value.kind() == Kind::Array || value.kind() == Kind::Dictionary;
}

std::size_t storageBytesBehind(const ValueView& value) noexcept {
  switch (value.kind()) {
    case Kind::Dictionary:
      return value.dictionary().storageBytes();
    case Kind::Array:
      return value.array().storageBytes();
    default:
      return 0;
  }
}

// The list with these keys after its own. One or two are what bursts of settings bring, over and over: such a list
// remembers how it was extended.
KeyList keysWith(KeyList list, std::span<const Key* const> added) {
  constexpr std::size_t kFew = 2;
  if (added.size() <= kFew) {
    for (const Key* key : added) {
      list = list.appending(*key);
    }
    return list;
  }
  std::vector<const Key*> all;
  all.reserve(list.size() + added.size());
  for (std::size_t i = 0; i < list.size(); ++i) {
    all.push_back(&list[i]);
  }
  all.insert(all.end(), added.begin(), added.end());
  return *KeyList::make(std::span<const Key* const>(all));
}

// A packed container, which is counted already and on its way into a block; without arriving there it is released.
class HeldContainer {
 public:
  explicit HeldContainer(std::span<const std::byte> packed) noexcept : packed_(packed) {}
  HeldContainer(const HeldContainer&) = delete;
  HeldContainer& operator=(const HeldContainer&) = delete;
  ~HeldContainer() { detail::releaseContainers(packed_.data(), packed_.data() + packed_.size()); }
  void handOver() noexcept { packed_ = {}; }

 private:
  std::span<const std::byte> packed_;
};

// A block of these values, copied as they are packed, without a key list.
Body* bodyOfPacked(std::span<const std::byte* const> values, bool holdsContainers) {
  std::size_t bytes = 0;
  for (const std::byte* at : values) {
    bytes += Packed::sizeAt(at);
  }
  Body* body = detail::makeBody(bytes);
  std::byte* to = body->data();
  for (const std::byte* at : values) {
    const std::size_t size = Packed::sizeAt(at);
    std::memcpy(to, at, size);
    to += size;
  }
  if (holdsContainers) {
    body->holdsContainers = 1;
    detail::retainContainers(body->data(), body->end());
  }
  return body;
}

}  // namespace

Dictionary::Dictionary(std::initializer_list<Member> members) : body_(nullptr) {
  for (const Member& member : members) {
    set(Key(member.key), member.value);
  }
}

Dictionary Dictionary::fromEntries(std::span<const Entry> entries) {
  std::vector<const Key*> keys;
  keys.reserve(entries.size());
  std::size_t bytes = 0;
  bool containers = false;
  for (const Entry& entry : entries) {
    keys.push_back(&entry.key);
    bytes += Packed::sizeOf(entry.value);
    containers = containers || isContainer(entry.value);
  }
  std::optional<KeyList> list = KeyList::make(std::span<const Key* const>(keys));
  if (!list || list->empty()) return {};
  Body* body = detail::makeBody(bytes);
  body->holdsContainers = containers ? 1 : 0;
  body->keys = std::exchange(list->body_, nullptr);
  std::byte* to = body->data();
  for (const Entry& entry : entries) {
    to = Packed::write(to, entry.value);
  }
  return Dictionary(body);
}

Dictionary::Dictionary(const Dictionary& other) noexcept : body_(other.body_) {
  detail::retainBody(body_);
}

Dictionary& Dictionary::operator=(Dictionary other) noexcept {
  std::swap(body_, other.body_);
  return *this;
}

Dictionary::~Dictionary() {
  detail::releaseDictionaryBody(body_);
}

std::size_t Dictionary::size() const noexcept {
  return body_ == nullptr ? 0 : body_->keys->count;
}

KeyList Dictionary::keys() const noexcept {
  if (body_ == nullptr) return {};
  detail::retainKeyList(body_->keys);
  return KeyList(body_->keys);
}

bool Dictionary::hasKeyWithBlank() const noexcept {
  return body_ != nullptr && body_->keys->hasBlanks;
}

bool Dictionary::hasKeyWithPrefix(std::string_view prefix) const noexcept {
  return body_ != nullptr && KeyList::hasPrefix(*body_->keys, prefix);
}

ValueView Dictionary::get(const Key& key) const noexcept {
  const std::size_t index = body_ == nullptr ? KeyList::npos : detail::indexInKeyList(body_->keys, key);
  return index == KeyList::npos ? ValueView() : Packed::read(itemAt(*body_, index));
}

ValueView Dictionary::get(std::string_view key) const noexcept {
  const std::size_t index = body_ == nullptr ? KeyList::npos : detail::indexInKeyList(body_->keys, key);
  return index == KeyList::npos ? ValueView() : Packed::read(itemAt(*body_, index));
}

bool Dictionary::contains(const Key& key) const noexcept {
  return body_ != nullptr && detail::indexInKeyList(body_->keys, key) != KeyList::npos;
}

bool Dictionary::contains(std::string_view key) const noexcept {
  return body_ != nullptr && detail::indexInKeyList(body_->keys, key) != KeyList::npos;
}

void Dictionary::pick(std::span<const Pick> picks, std::span<ValueView> slots) const noexcept {
  if (picks.empty()) return;
  const std::byte* at = body_->data();
  for (const Pick& pick : picks) {
    for (std::size_t left = pick.skipped; left > 0; --left) {
      at += Packed::sizeAt(at);
    }
    slots[pick.slot] = Packed::read(at);
    at += Packed::sizeAt(at);
  }
}

// Replaces `removed` bytes at `offset` by the packed value. A block that is shared is copied; a container that goes is
// released, one that comes is held already.
static Body* splice(Body* body, std::size_t offset, std::size_t removed, std::span<const std::byte> packed) {
  const std::size_t tail = body->bytes - offset - removed;
  const std::size_t bytes = offset + packed.size() + tail;
  if (detail::isShared(body)) {
    Body* copy = detail::makeBody(bytes);
    copy->holdsContainers = body->holdsContainers;
    copy->keys = body->keys;
    detail::retainKeyList(copy->keys);
    std::memcpy(copy->data(), body->data(), offset);
    std::memcpy(copy->data() + offset + packed.size(), body->data() + offset + removed, tail);
    if (body->holdsContainers != 0) {
      detail::retainContainers(copy->data(), copy->data() + offset);
      detail::retainContainers(copy->data() + offset + packed.size(), copy->end());
    }
    if (!packed.empty()) {
      std::memcpy(copy->data() + offset, packed.data(), packed.size());
    }
    detail::releaseDictionaryBody(body);
    return copy;
  }
  // The room first, or a block that can't get it would hold what was released.
  if (bytes > body->bytes) {
    body = detail::growBody(body, bytes);
  }
  if (body->holdsContainers != 0) {
    detail::releaseContainers(body->data() + offset, body->data() + offset + removed);
  }
  std::memmove(body->data() + offset + packed.size(), body->data() + offset + removed, tail);
  if (bytes < body->bytes) {
    body = detail::shrinkBody(body, bytes);
  }
  if (!packed.empty()) {
    std::memcpy(body->data() + offset, packed.data(), packed.size());
  }
  return body;
}

void Dictionary::set(const Key& key, const ValueView& value) {
  const std::size_t size = Packed::sizeOf(value);
  if (size == 0) return;
  // The value is packed before the block is touched, because it may look into that block.
  std::array<std::byte, 128> small;
  std::vector<std::byte> large(size > small.size() ? size : 0);
  std::byte* const packed = large.empty() ? small.data() : large.data();
  Packed::write(packed, value);
  const bool container = isContainer(value);
  HeldContainer held(container ? std::span<const std::byte>(packed, size) : std::span<const std::byte>());

  if (body_ == nullptr) {
    KeyList list = KeyList().appending(key);
    body_ = detail::makeBody(size);
    body_->keys = std::exchange(list.body_, nullptr);
    std::memcpy(body_->data(), packed, size);
  } else if (const std::size_t index = detail::indexInKeyList(body_->keys, key); index != KeyList::npos) {
    const std::byte* const at = itemAt(*body_, index);
    body_ = splice(body_, static_cast<std::size_t>(at - body_->data()), Packed::sizeAt(at), {packed, size});
  } else {
    KeyList list = keys().appending(key);
    body_ = splice(body_, body_->bytes, 0, {packed, size});
    std::swap(body_->keys, list.body_);
  }
  if (container) {
    body_->holdsContainers = 1;
  }
  held.handOver();
}

bool Dictionary::remove(const Key& key) {
  const std::size_t index = body_ == nullptr ? KeyList::npos : detail::indexInKeyList(body_->keys, key);
  if (index == KeyList::npos) return false;
  if (size() == 1) {
    clear();
    return true;
  }
  KeyList list = keys().removing(index);
  const std::byte* const at = itemAt(*body_, index);
  body_ = splice(body_, static_cast<std::size_t>(at - body_->data()), Packed::sizeAt(at), {});
  std::swap(body_->keys, list.body_);
  return true;
}

void Dictionary::merge(const Dictionary& other) {
  if (other.body_ == nullptr || body_ == other.body_) return;
  if (body_ == nullptr) {
    *this = other;
    return;
  }
  if (body_->keys == other.body_->keys) {
    *this = other;  // a value for every key
    return;
  }
  std::vector<const std::byte*> theirs;
  theirs.reserve(other.size());
  for (const std::byte* at = other.body_->data(); at != other.body_->end(); at += Packed::sizeAt(at)) {
    theirs.push_back(at);
  }
  std::vector<const std::byte*> values;
  values.reserve(size() + other.size());
  const Key* key = body_->keys->keys();
  for (const std::byte* at = body_->data(); at != body_->end(); at += Packed::sizeAt(at)) {
    const std::size_t index = detail::indexInKeyList(other.body_->keys, *key++);
    values.push_back(index == KeyList::npos ? at : theirs[index]);
  }
  std::vector<const Key*> added;
  for (std::size_t i = 0; i < theirs.size(); ++i) {
    const Key& each = other.body_->keys->keys()[i];
    if (detail::indexInKeyList(body_->keys, each) == KeyList::npos) {
      values.push_back(theirs[i]);
      added.push_back(&each);
    }
  }
  KeyList list = keysWith(keys(), added);
  Body* const merged = bodyOfPacked(values, (body_->holdsContainers | other.body_->holdsContainers) != 0);
  merged->keys = std::exchange(list.body_, nullptr);
  *this = Dictionary(merged);
}

Dictionary::Iterator Dictionary::begin() const noexcept {
  Iterator iterator;
  if (body_ != nullptr) {
    iterator.at_ = body_->data();
    iterator.key_ = body_->keys->keys();
  }
  return iterator;
}

Dictionary::Iterator Dictionary::end() const noexcept {
  Iterator iterator;
  iterator.at_ = body_ == nullptr ? nullptr : body_->end();
  return iterator;
}

Dictionary::Entry Dictionary::Iterator::operator*() const noexcept {
  return {*key_, Packed::read(at_)};
}

Dictionary::Iterator& Dictionary::Iterator::operator++() noexcept {
  at_ += Packed::sizeAt(at_);
  ++key_;
  return *this;
}

bool Dictionary::sharesKeysWith(const Dictionary& other) const noexcept {
  const auto listOf = [](const Body* body) { return body == nullptr ? nullptr : body->keys; };
  return listOf(body_) == listOf(other.body_);
}

bool Dictionary::hasKeys(const KeyList& keys) const noexcept {
  return (body_ == nullptr ? nullptr : body_->keys) == keys.body_;
}

std::uint64_t Dictionary::keysHash() const noexcept {
  return body_ == nullptr ? 0 : body_->keys->hash;
}

std::size_t Dictionary::storageBytes() const noexcept {
  if (body_ == nullptr) return 0;
  std::size_t bytes = sizeof(Body) + body_->bytes;
  if (body_->holdsContainers != 0) {
    for (const Entry& entry : *this) {
      bytes += storageBytesBehind(entry.value);
    }
  }
  return bytes;
}

std::size_t Array::storageBytes() const noexcept {
  if (body_ == nullptr) return 0;
  std::size_t bytes = sizeof(Body) + body_->bytes;
  if (body_->holdsContainers != 0) {
    for (const ValueView& item : *this) {
      bytes += storageBytesBehind(item);
    }
  }
  return bytes;
}

}  // namespace tarn::plist
