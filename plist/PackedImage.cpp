// SPDX-License-Identifier: Apache-2.0
#include "plist/PackedImage.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <utility>

#include "plist/Packed.h"

namespace tarn::plist {

namespace {

constexpr std::uint32_t kHoldsContainers = std::numeric_limits<std::uint32_t>::max();

}  // namespace

void PackedImageWriter::write(const Dictionary& dictionary) {
  if (dictionary.empty()) {
    writeNumber(std::uint32_t{0});
    return;
  }
  const detail::Body& body = *dictionary.body_;
  writeKeys(dictionary.keys());
  if (body.holdsContainers == 0) {
    writeNumber(std::uint32_t{body.bytes});
    bytes_.append(reinterpret_cast<const char*>(body.data()), body.bytes);
    return;
  }
  writeNumber(kHoldsContainers);
  for (const std::byte* at = body.data(); at != body.end(); at += Packed::sizeAt(at)) {
    writeValue(at);
  }
}

void PackedImageWriter::writeValue(const std::byte* at) {
  if (!Packed::isContainer(at)) {
    bytes_.append(reinterpret_cast<const char*>(at), Packed::sizeAt(at));
    return;
  }
  writeNumber(*at);
  const ValueView value = Packed::read(at);
  if (value.kind() == Kind::Dictionary) {
    write(value.dictionary());
    return;
  }
  const Array array = value.array();
  writeNumber(static_cast<std::uint32_t>(array.size()));
  if (array.empty()) return;
  for (const std::byte* item = array.body_->data(); item != array.body_->end(); item += Packed::sizeAt(item)) {
    writeValue(item);
  }
}

void PackedImageWriter::writeKeys(const KeyList& keys) {
  Known& known = known_[keys.hash() % kSlots];
  if (known.number != 0 && known.keys == keys) {
    writeNumber(known.number);
    return;
  }
  known = {keys, ++lists_};
  writeNumber(known.number);
  writeNumber(static_cast<std::uint32_t>(keys.size()));
  for (std::size_t index = 0; index < keys.size(); ++index) {
    const std::string_view text = keys[index].text();
    writeNumber(static_cast<std::uint32_t>(text.size()));
    bytes_ += text;
  }
}

bool PackedImageReader::read(Dictionary& dictionary) {
  dictionary.clear();
  KeyList keys;
  if (!readKeys(keys)) return false;
  if (keys.empty()) return true;
  std::uint32_t bytes = 0;
  if (!readNumber(bytes)) return false;
  if (bytes != kHoldsContainers) return readFlat(keys, bytes, dictionary);
  builder_.begin();
  if (!readValues(keys.size())) return false;
  dictionary = builder_.finishDictionary(keys);
  return true;
}

// Values that hold no references are taken over as they stand.
bool PackedImageReader::readFlat(const KeyList& keys, std::size_t size, Dictionary& dictionary) {
  if (left_.size() < size) return false;
  detail::Body* body = detail::makeBody(size);
  std::memcpy(body->data(), left_.data(), size);
  KeyList list = keys;
  body->keys = std::exchange(list.body_, nullptr);
  dictionary = Dictionary(body);
  left_.remove_prefix(size);
  return true;
}

bool PackedImageReader::readValues(std::size_t count) {
  for (std::size_t value = 0; value < count; ++value) {
    if (!readValue()) return false;
  }
  return true;
}

bool PackedImageReader::readValue() {
  constexpr std::size_t kLongestHead = 5;
  if (left_.empty() || static_cast<Tag>(left_.front()) > Tag::Dictionary) return false;
  const auto tag = static_cast<Tag>(left_.front());
  if (tag == Tag::Dictionary) {
    left_.remove_prefix(1);
    Dictionary dictionary;
    if (!read(dictionary)) return false;
    builder_.add(dictionary);
    return true;
  }
  if (tag == Tag::Array) {
    left_.remove_prefix(1);
    std::uint32_t count = 0;
    if (!readNumber(count)) return false;
    builder_.begin();
    if (!readValues(count)) return false;
    builder_.add(builder_.finishArray());
    return true;
  }
  // Lengths stand in the head, which a copy makes safe to look at.
  std::byte head[kLongestHead] = {};
  std::memcpy(head, left_.data(), std::min(left_.size(), kLongestHead));
  const std::size_t size = Packed::sizeAt(head);
  if (left_.size() < size) return false;
  builder_.add(Packed::read(reinterpret_cast<const std::byte*>(left_.data())));
  left_.remove_prefix(size);
  return true;
}

bool PackedImageReader::readKeys(KeyList& keys) {
  std::uint32_t number = 0;
  if (!readNumber(number)) return false;
  if (number == 0) return true;
  if (number > lists_.size() + 1) return false;
  if (number == lists_.size() + 1 && !readList()) return false;
  keys = lists_[number - 1];
  return true;
}

bool PackedImageReader::readList() {
  std::uint32_t count = 0;
  if (!readNumber(count) || count == 0) return false;
  std::vector<std::string_view> texts;
  for (std::uint32_t index = 0; index < count; ++index) {
    std::uint32_t length = 0;
    if (!readNumber(length) || left_.size() < length) return false;
    texts.push_back(left_.substr(0, length));
    left_.remove_prefix(length);
  }
  std::optional<KeyList> list = KeyList::make(texts);
  if (!list) return false;
  lists_.push_back(std::move(*list));
  return true;
}

}  // namespace tarn::plist
