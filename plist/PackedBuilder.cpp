#include "plist/PackedBuilder.h"

#include "plist/KeyListBody.h"
#include "plist/Packed.h"

namespace tarn::plist {

std::optional<KeyList> KeyListCache::find(std::uint64_t hash, std::span<const std::string_view> texts) {
  if (texts.size() > kLongestKept) {
    return KeyList::make(texts);
  }
  if (slots_.empty()) {
    slots_.resize(kSlots);
  }
  KeyList& slot = slots_[hash % kSlots];
  if (slot.hash() == hash && slot.equals(texts)) {
    return slot;
  }
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
  levels_.push_back({bytes_.size(), keys_.size(), 0, 0, false});
}

void PackedBuilder::add(std::string_view key, const ValueView& value) {
  keys_.push_back(key);
  levels_.back().hash = KeyList::combineHash(levels_.back().hash, Key::hashOf(key));
  add(value);
}

void PackedBuilder::add(const ValueView& value) {
  const std::size_t at = bytes_.size();
  bytes_.resize(at + Packed::sizeOf(value));
  Packed::write(bytes_.data() + at, value);
  Level& level = levels_.back();
  ++level.count;
  level.holdsContainers = level.holdsContainers || value.kind() == Kind::Array || value.kind() == Kind::Dictionary;
}

// Takes the innermost level's bytes, and the references they hold, into a block.
detail::Body* PackedBuilder::takeBody() {
  const Level& level = levels_.back();
  const std::size_t size = bytes_.size() - level.bytesBegin;
  detail::Body* body = detail::makeBody(size);
  body->holdsContainers = level.holdsContainers ? 1 : 0;
  std::memcpy(body->data(), bytes_.data() + level.bytesBegin, size);
  bytes_.resize(level.bytesBegin);
  return body;
}

void PackedBuilder::dropLevel() noexcept {
  const Level& level = levels_.back();
  if (level.holdsContainers) {
    detail::releaseContainers(bytes_.data() + level.bytesBegin, bytes_.data() + bytes_.size());
  }
  bytes_.resize(level.bytesBegin);
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

void PackedBuilder::reset() noexcept {
  while (!levels_.empty()) {
    dropLevel();
  }
}

}  // namespace tarn::plist
