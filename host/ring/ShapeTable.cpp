// SPDX-License-Identifier: Apache-2.0
#include "host/ring/ShapeTable.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <limits>
#include <string_view>
#include <utility>

#include "plist/Dictionary.h"
#include "wire/Utf8.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kStampKey = "tarnreporting_timestamp";
constexpr std::array<std::string_view, 7> kKindNames{"integer", "unsigned", "double", "date",
                                                     "boolean", "text",     "data"};

// Walks over the values of a message, each of which takes a multiple of 8 bytes.
class ValueWords {
 public:
  explicit ValueWords(std::span<const std::byte> bytes) noexcept : at_(bytes.data()), end_(at_ + bytes.size()) {}

  bool atEnd() const noexcept { return at_ == end_; }
  bool take(std::uint64_t& word) noexcept {
    if (left() < sizeof word) return false;
    std::memcpy(&word, at_, sizeof word);
    at_ += sizeof word;
    return true;
  }
  // Of so many bytes, and those that fill them up.
  bool takeBytes(std::uint64_t length, std::string_view& bytes) noexcept {
    if (length > left()) return false;
    const std::size_t padded = (static_cast<std::size_t>(length) + 7) / 8 * 8;
    if (padded > left()) return false;
    bytes = {reinterpret_cast<const char*>(at_), static_cast<std::size_t>(length)};
    at_ += padded;
    return true;
  }

 private:
  std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }

  const std::byte* at_;
  const std::byte* end_;
};

bool addValue(ValueWords& words, ShapeKind kind, plist::PackedBuilder::Draft& payload) {
  std::uint64_t word = 0;
  std::string_view bytes;
  if (!words.take(word)) return false;
  switch (kind) {
    case ShapeKind::Integer:
      payload.addSigned(static_cast<std::int64_t>(word));
      return true;
    case ShapeKind::Unsigned:
      // One integer has one kind: unsigned only where signed can't hold it.
      if (std::in_range<std::int64_t>(word)) {
        payload.addSigned(static_cast<std::int64_t>(word));
      } else {
        payload.addUnsigned(word);
      }
      return true;
    case ShapeKind::Double:
      payload.addDouble(std::bit_cast<double>(word));
      return true;
    case ShapeKind::Date:
      payload.add(plist::Date{std::bit_cast<double>(word)});
      return true;
    case ShapeKind::Boolean:
      payload.add(word == 1);
      return word <= 1;
    case ShapeKind::Text:
      if (!words.takeBytes(word, bytes) || !wire::isUtf8(bytes)) return false;
      payload.addText(bytes);
      return true;
    case ShapeKind::Data:
      if (!words.takeBytes(word, bytes)) return false;
      payload.add(plist::DataView{bytes});
      return true;
  }
  return false;
}

// Bytes that the values of such a content take at most once they are packed, and a time stamp. A text or data takes no
// more than here; all else 8 bytes here.
std::size_t mostPacked(std::size_t contentBytes) {
  constexpr std::size_t kMost = plist::PackedBuilder::Draft::kMostValueBytes;
  return contentBytes / sizeof(std::uint64_t) * kMost + kMost;
}

bool readNumber(const plist::ValueView& value, std::uint64_t most, std::uint64_t& number) {
  if (value.kind() != plist::Kind::Signed || value.signedValue() < 0) return false;
  number = static_cast<std::uint64_t>(value.signedValue());
  return number <= most;
}

bool readReporterIDs(const plist::ValueView& value, wire::ReporterIDs& reporterIDs) {
  if (!value) return true;
  if (value.kind() != plist::Kind::Array) return false;
  reporterIDs.emplace();
  for (const plist::ValueView& item : value.array()) {
    if (item.kind() != plist::Kind::Signed) return false;
    reporterIDs->push_back(item.signedValue());
  }
  return reporterIDs->size() <= TARNRING_MOST_KEYS;
}

bool isKnownMember(std::string_view name) {
  constexpr std::array<std::string_view, 6> kNames{"shape", "category", "type", "reporterIDs", "keys", "kinds"};
  return std::find(kNames.begin(), kNames.end(), name) != kNames.end();
}

Status wrong(std::string text) {
  return Error{0, std::move(text)};
}

}  // namespace

Status ShapeTable::declare(const plist::Dictionary& description) {
  std::uint64_t number = 0;
  if (!readNumber(description["shape"], TARNRING_MOST_SHAPES - 1, number)) return wrong("shape: 0 to 1023 expected");
  for (const auto& entry : description) {
    if (!isKnownMember(entry.key.text())) return wrong("nothing is known by the name " + std::string(entry.key.text()));
  }
  if (number >= shapes_.size()) {
    shapes_.resize(number + 1);
  }
  if (description.size() == 1) {
    shapes_[number].reset();
    return {};
  }
  auto shape = std::make_unique<Shape>();
  if (Status read = readShape(description, *shape); read.failed()) return read;
  shapes_[number] = std::move(shape);
  return {};
}

Status ShapeTable::readShape(const plist::Dictionary& description, Shape& shape) {
  std::uint64_t category = 0;
  std::uint64_t type = 0;
  if (!readNumber(description["category"], std::numeric_limits<std::uint32_t>::max(), category)) {
    return wrong("category: 0 to 4294967295 expected");
  }
  if (!readNumber(description["type"], std::numeric_limits<std::uint16_t>::max(), type)) {
    return wrong("type: 0 to 65535 expected");
  }
  shape.category = static_cast<std::uint32_t>(category);
  shape.type = static_cast<std::uint16_t>(type);
  if (!readReporterIDs(description["reporterIDs"], shape.reporterIDs)) {
    return wrong("reporterIDs: an array of at most 64 signed 64-bit integers expected");
  }
  return readKeys(description, shape);
}

Status ShapeTable::readKeys(const plist::Dictionary& description, Shape& shape) {
  if (description["keys"].kind() != plist::Kind::Array || description["kinds"].kind() != plist::Kind::Array) {
    return wrong("keys and kinds: arrays expected");
  }
  const plist::Array keys = description["keys"].array();
  const plist::Array kinds = description["kinds"].array();
  if (keys.size() != kinds.size() || keys.size() > TARNRING_MOST_KEYS) {
    return wrong("keys and kinds: as many of each expected, at most 64");
  }
  std::vector<std::string_view> names;
  for (const plist::ValueView& key : keys) {
    if (!key.isText() || key.text().size() > TARNRING_MOST_KEY_BYTES) {
      return wrong("keys: texts of at most 255 bytes expected");
    }
    names.push_back(key.text());
  }
  for (const plist::ValueView& kind : kinds) {
    const auto* const found = std::find(kKindNames.begin(), kKindNames.end(), kind.isText() ? kind.text() : "");
    if (found == kKindNames.end()) return wrong("kinds: the name of a kind expected");
    shape.kinds.push_back(static_cast<ShapeKind>(found - kKindNames.begin()));
  }
  shape.addsStamp = std::find(names.begin(), names.end(), kStampKey) == names.end();
  if (shape.addsStamp) {
    names.push_back(kStampKey);
  }
  std::optional<plist::KeyList> list = plist::KeyList::make(names);
  if (!list) return wrong("keys: a key given twice");
  shape.keys = std::move(*list);
  return {};
}

wire::DecodedRequest ShapeTable::Message::request() const {
  wire::DecodedRequest request;
  request.operation = wire::Operation::SendMessage;
  request.dictionary = payload->dictionary();
  request.category = category;
  request.type = type;
  request.reporterIDs = *reporterIDs;
  return request;
}

ShapeTable::Decoded ShapeTable::decode(std::span<const std::byte> content, wire::DecodedRequest& request) {
  Message message;
  const Decoded decoded = decode(content, message);
  if (decoded == Decoded::Ok) {
    request = message.request();
  }
  return decoded;
}

ShapeTable::Decoded ShapeTable::decode(std::span<const std::byte> content, Message& message) {
  tarnring_message head{};
  if (content.size() < sizeof head) return Decoded::BadValues;
  std::memcpy(&head, content.data(), sizeof head);
  if (head.shape >= shapes_.size() || shapes_[head.shape] == nullptr) {
    return head.shape < TARNRING_MOST_SHAPES ? Decoded::UnknownShape : Decoded::BadValues;
  }
  const Shape& shape = *shapes_[head.shape];
  if (head.count != shape.kinds.size()) return Decoded::BadValues;
  ValueWords words(content.subspan(sizeof head));
  draft_.begin(mostPacked(content.size()));
  for (const ShapeKind kind : shape.kinds) {
    if (!addValue(words, kind, draft_)) return Decoded::BadValues;
  }
  if (!words.atEnd()) return Decoded::BadValues;
  if (shape.addsStamp) {
    draft_.addDouble(static_cast<double>(head.stamp) / 1e9);
  }
  draft_.finish(shape.keys);
  message = {&draft_, shape.category, shape.type, &shape.reporterIDs};
  return Decoded::Ok;
}

}  // namespace tarn::linux_host
