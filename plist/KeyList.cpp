// SPDX-License-Identifier: Apache-2.0
#include "plist/KeyList.h"

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <new>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "plist/Allocation.h"
#include "plist/KeyListBody.h"
#include "plist/KeyText.h"
#include "plist/ThreadSafety.h"

namespace tarn::plist {

namespace {

using detail::KeyListBody;

constexpr std::size_t kLinearLimit = 16;  // up to here looking at every key is quicker than an index

struct Table {
  Mutex mutex;
  std::unordered_multimap<std::uint64_t, KeyListBody*> lists TARN_GUARDED_BY(mutex);
};

Table& table() {
  static Table* const instance = new Table;  // never destroyed: dictionaries of static storage outlive everything
  return *instance;
}

std::size_t indexSlots(std::size_t count) {
  std::size_t slots = 1;
  while (slots < 2 * count) {
    slots *= 2;
  }
  return slots;
}

void buildIndex(KeyListBody& body) {
  if (body.count <= kLinearLimit) return;
  const std::size_t slots = indexSlots(body.count);
  body.index = std::make_unique<std::uint32_t[]>(slots);
  body.indexMask = slots - 1;
  for (std::uint32_t i = 0; i < body.count; ++i) {
    std::size_t slot = body.keys()[i].hash() & body.indexMask;
    while (body.index[slot] != 0) {
      slot = (slot + 1) & body.indexMask;
    }
    body.index[slot] = i + 1;
  }
}

template <class Matches>
std::size_t findIndexed(const KeyListBody& body, std::uint64_t hash, const Matches& matches) {
  std::size_t slot = hash & body.indexMask;
  while (body.index[slot] != 0) {
    const std::size_t position = body.index[slot] - 1;
    if (matches(body.keys()[position])) return position;
    slot = (slot + 1) & body.indexMask;
  }
  return KeyList::npos;
}

// The list that `body` was extended to by this key before, with one more reference; null when it was not. The caller
// holds `body`, which holds that list.
KeyListBody* extendedBefore(const KeyListBody& body, const Key& key) noexcept {
  KeyListBody* const extended = body.extended.load(std::memory_order_acquire);
  if (extended == nullptr || !(extended->keys()[body.count] == key)) return nullptr;
  detail::retainKeyList(extended);
  return extended;
}

// The caller holds both.
void rememberExtended(KeyListBody& body, KeyListBody* extended) noexcept {
  KeyListBody* none = nullptr;
  if (body.extended.compare_exchange_strong(none, extended, std::memory_order_release, std::memory_order_relaxed)) {
    detail::retainKeyList(extended);
  }
}

void destroyBody(KeyListBody* body) noexcept {
  std::destroy_n(body->keys(), body->count);
  body->~KeyListBody();
  std::free(body);
}

struct DestroyBody {
  void operator()(KeyListBody* body) const noexcept { destroyBody(body); }
};
using OwnBody = std::unique_ptr<KeyListBody, DestroyBody>;

OwnBody makeBody(std::span<const Key> head, const Key* last, std::uint64_t hash) {
  const std::size_t count = head.size() + (last != nullptr ? 1 : 0);
  void* memory = detail::allocate(sizeof(KeyListBody) + count * sizeof(Key));
  OwnBody body(::new (memory) KeyListBody{});
  body->references = 1;
  body->count = static_cast<std::uint32_t>(count);
  body->hash = hash;
  Key* to = std::uninitialized_copy(head.begin(), head.end(), body->keys());
  if (last != nullptr) {
    ::new (static_cast<void*>(to)) Key(*last);
  }
  const std::span<const Key> all(body->keys(), count);
  body->hasBlanks = std::any_of(all.begin(), all.end(), [](const Key& key) { return key.hasBlank(); });
  buildIndex(*body);
  return body;
}

// The list of this hash that matches, with one more reference; null when there is none.
template <class Matches>
KeyListBody* findList(Table& all, std::uint64_t hash, const Matches& matches) TARN_REQUIRES(all.mutex) {
  const auto [begin, end] = all.lists.equal_range(hash);
  for (auto found = begin; found != end; ++found) {
    if (matches(*found->second)) {
      found->second->references.fetch_add(1, std::memory_order_relaxed);
      return found->second;
    }
  }
  return nullptr;
}

// The list of `head` and, unless null, `last` after it, found or made, with one more reference.
KeyListBody* internList(std::span<const Key> head, const Key* last, std::uint64_t hash) {
  const std::size_t count = head.size() + (last != nullptr ? 1 : 0);
  Table& all = table();
  const MutexLock lock(all.mutex);
  KeyListBody* const found = findList(all, hash, [&](const KeyListBody& body) {
    return body.count == count && std::equal(head.begin(), head.end(), body.keys()) &&
           (last == nullptr || body.keys()[count - 1] == *last);
  });
  if (found != nullptr) return found;
  OwnBody made = makeBody(head, last, hash);
  all.lists.emplace(hash, made.get());
  return made.release();
}

std::uint64_t hashOfKeys(std::span<const Key> keys) {
  std::uint64_t hash = 0;
  for (const Key& key : keys) {
    hash = KeyList::combineHash(hash, key.hash());
  }
  return hash;
}

bool hasRepeats(std::span<const Key> keys) {
  if (keys.size() <= kLinearLimit) {
    for (std::size_t i = 1; i < keys.size(); ++i) {
      if (std::find(keys.begin(), keys.begin() + static_cast<std::ptrdiff_t>(i), keys[i]) !=
          keys.begin() + static_cast<std::ptrdiff_t>(i)) {
        return true;
      }
    }
    return false;
  }
  std::unordered_set<std::string_view> seen;
  seen.reserve(keys.size());
  return !std::all_of(keys.begin(), keys.end(), [&](const Key& key) { return seen.insert(key.text()).second; });
}

}  // namespace

namespace detail {

void releaseKeyList(KeyListBody* body) noexcept {
  while (body != nullptr && releaseUnlessLast(body->references)) {
    Table& all = table();
    {
      const MutexLock lock(all.mutex);
      if (body->references.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
      const auto [begin, end] = all.lists.equal_range(body->hash);
      all.lists.erase(std::find_if(begin, end, [&](const auto& entry) { return entry.second == body; }));
    }
    KeyListBody* const extended = body->extended.load(std::memory_order_acquire);
    destroyBody(body);
    body = extended;  // its reference goes with the list that held it
  }
}

}  // namespace detail

KeyList::KeyList(const KeyList& other) noexcept : body_(other.body_) {
  detail::retainKeyList(body_);
}

KeyList& KeyList::operator=(KeyList other) noexcept {
  std::swap(body_, other.body_);
  return *this;
}

KeyList::~KeyList() {
  detail::releaseKeyList(body_);
}

std::optional<KeyList> KeyList::make(std::span<const std::string_view> texts) {
  std::vector<Key> keys;
  keys.reserve(texts.size());
  for (const std::string_view text : texts) {
    keys.emplace_back(text);
  }
  return make(keys);
}

std::optional<KeyList> KeyList::make(std::span<const Key> keys) {
  if (keys.empty()) return KeyList();
  if (hasRepeats(keys)) return std::nullopt;
  return KeyList(internList(keys, nullptr, hashOfKeys(keys)));
}

std::optional<KeyList> KeyList::make(std::span<const Key* const> keys) {
  std::uint64_t hash = 0;
  for (const Key* key : keys) {
    hash = combineHash(hash, key->hash());
  }
  // Nearly always it is there. A list that is there repeats nothing, and is found without counting its keys once more.
  const auto matches = [&](const detail::KeyListBody& body) {
    return body.count == keys.size() && std::equal(keys.begin(), keys.end(), body.keys(),
                                                   [](const Key* key, const Key& other) { return *key == other; });
  };
  Table& all = table();
  {
    const MutexLock lock(all.mutex);
    if (detail::KeyListBody* const found = findList(all, hash, matches)) return KeyList(found);
  }
  std::vector<Key> held;
  held.reserve(keys.size());
  std::transform(keys.begin(), keys.end(), std::back_inserter(held), [](const Key* key) { return *key; });
  return make(std::span<const Key>(held));
}

std::size_t KeyList::size() const noexcept {
  return body_ == nullptr ? 0 : body_->count;
}

const Key& KeyList::operator[](std::size_t index) const noexcept {
  return body_->keys()[index];
}

std::size_t KeyList::indexOf(const Key& key) const noexcept {
  return detail::indexInKeyList(body_, key);
}

std::size_t KeyList::indexOf(std::string_view text) const noexcept {
  return detail::indexInKeyList(body_, text);
}

bool KeyList::hasBlanks() const noexcept {
  return body_ != nullptr && body_->hasBlanks;
}

bool KeyList::hasPrefix(const KeyListBody& body, std::string_view prefix) noexcept {
  if (prefix.empty()) return body.count != 0;
  const auto starts = [prefix](const Key& key) {
    const std::string_view text = key.text_->text();
    // The first character alone rules out most keys.
    return !text.empty() && text.front() == prefix.front() && text.starts_with(prefix);
  };
  return std::any_of(body.keys(), body.keys() + body.count, starts);
}

bool KeyList::equals(std::span<const std::string_view> texts) const noexcept {
  return size() == texts.size() && std::equal(texts.begin(), texts.end(), body_ == nullptr ? nullptr : body_->keys(),
                                              [](std::string_view text, const Key& key) { return text == key.text(); });
}

std::uint64_t KeyList::hash() const noexcept {
  return body_ == nullptr ? 0 : body_->hash;
}

std::uint64_t KeyList::combineHash(std::uint64_t hash, std::uint64_t keyHash) noexcept {
  hash = (hash ^ keyHash) * 0x9E3779B97F4A7C15U;
  return hash ^ (hash >> 29U);
}

KeyList KeyList::appending(const Key& key) const {
  return KeyList(detail::extendKeyList(body_, key));
}

KeyList KeyList::removing(std::size_t index) const {
  std::vector<Key> keys(body_->keys(), body_->keys() + body_->count);
  keys.erase(keys.begin() + static_cast<std::ptrdiff_t>(index));
  return keys.empty() ? KeyList() : KeyList(internList(keys, nullptr, hashOfKeys(keys)));
}

namespace detail {

KeyListBody* extendKeyList(KeyListBody* body, const Key& key) {
  if (body == nullptr) return internList({}, &key, KeyList::combineHash(0, key.hash()));
  if (KeyListBody* const known = extendedBefore(*body, key)) return known;
  KeyListBody* const made = internList({body->keys(), body->count}, &key, KeyList::combineHash(body->hash, key.hash()));
  rememberExtended(*body, made);
  return made;
}

std::size_t indexInKeyList(const KeyListBody* body, const Key& key) noexcept {
  if (body == nullptr) return KeyList::npos;
  if (body->index) {
    return findIndexed(*body, key.hash(), [&](const Key& other) { return other == key; });
  }
  const Key* const end = body->keys() + body->count;
  const Key* const found = std::find(body->keys(), end, key);
  return found == end ? KeyList::npos : static_cast<std::size_t>(found - body->keys());
}

std::size_t indexInKeyList(const KeyListBody* body, std::string_view text) noexcept {
  if (body == nullptr) return KeyList::npos;
  const auto matches = [&](const Key& other) { return other.text() == text; };
  if (body->index) return findIndexed(*body, Key::hashOf(text), matches);
  const Key* const end = body->keys() + body->count;
  const Key* const found = std::find_if(body->keys(), end, matches);
  return found == end ? KeyList::npos : static_cast<std::size_t>(found - body->keys());
}

}  // namespace detail

}  // namespace tarn::plist
