// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/BinaryPropertyList.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "plist/Characters.h"
#include "plist/PackedBuilder.h"

namespace tarn::plist {

namespace {

constexpr std::string_view kMagic = "bplist00";
constexpr std::size_t kTrailerBytes = 32;
constexpr std::size_t kMaximumSize = 8;       // of an offset and of a reference
constexpr double kSecondsTo2001 = 978307200;  // between 1970-01-01 and the format's epoch

enum Mark : unsigned {
  kFalse = 0x08,
  kTrue = 0x09,
  kInteger = 0x10,
  kFloat = 0x22,
  kDouble = 0x23,
  kDate = 0x33,
  kData = 0x40,
  kAsciiText = 0x50,
  kUtf16Text = 0x60,
  kUid = 0x80,
  kArray = 0xA0,
  kDictionary = 0xD0,
};

// Up to 8 bytes as a big-endian number.
std::uint64_t number(std::string_view bytes) {
  std::uint64_t value = 0;
  for (const char byte : bytes) {
    value = (value << 8U) | static_cast<unsigned char>(byte);
  }
  return value;
}

// UTF-16, big-endian; whether it is text.
bool appendUtf16(std::string& out, std::string_view bytes) {
  for (std::size_t at = 0; at < bytes.size(); at += 2) {
    auto character = static_cast<char32_t>(number(bytes.substr(at, 2)));
    if (character >= 0xD800 && character <= 0xDFFF) {
      at += 2;
      if (character >= 0xDC00 || at == bytes.size()) return false;
      const auto low = static_cast<char32_t>(number(bytes.substr(at, 2)));
      if (low < 0xDC00 || low > 0xDFFF) return false;
      character = 0x10000 + ((character - 0xD800) << 10U) + (low - 0xDC00);
    }
    appendCharacter(out, character);
  }
  return true;
}

// Reads by recursion, which the bound on nesting bounds. An object that is named twice is read once and stands in both
// places; it counts at each, so that the bounds hold for what comes out.
class BinaryReader {
 public:
  explicit BinaryReader(std::string_view bytes) : bytes_(bytes), mostContent_(mostContentOf(bytes.size())) {}

  PropertyListReading read() {
    if (!readTrailer() || !readObject(top_)) {
      return {{}, PropertyListFault{PropertyListFault::Place::Byte, at_, fault_}};
    }
    return {std::move(value_), {}};
  }

 private:
  // A container that is being read, with the counts as they were at its begin.
  struct Level {
    std::size_t offset;
    bool isDictionary;
    std::size_t valuesBefore;
    std::uint64_t contentBefore;
    std::size_t height;    // of what was read of it: 1 and that of its highest member
    std::string_view key;  // of the member that is read, in a dictionary
  };
  // A container that was read, with what stands in it.
  struct Finished {
    Value value;
    std::size_t values;
    std::uint64_t content;
    std::size_t height;
  };

  static std::uint64_t mostContentOf(std::size_t bytes) {
    return std::clamp<std::uint64_t>(std::uint64_t{bytes} * kPropertyListContentPerByte,
                                     kPropertyListContentOfSmallFile, kMaximumPropertyListContent);
  }

  bool fail(std::string text) {
    fault_ = std::move(text);
    return false;
  }

  bool readTrailer() {
    if (bytes_.size() > kMaximumPropertyListBytes) return fail("too large");
    if (!bytes_.starts_with(kMagic)) return fail("not of version 00");
    if (bytes_.size() < kMagic.size() + kTrailerBytes) return fail("too short");
    at_ = bytes_.size() - kTrailerBytes;
    const std::string_view trailer = bytes_.substr(at_);
    offsetBytes_ = static_cast<std::size_t>(number(trailer.substr(6, 1)));
    referenceBytes_ = static_cast<std::size_t>(number(trailer.substr(7, 1)));
    const std::uint64_t objects = number(trailer.substr(8, 8));
    top_ = number(trailer.substr(16, 8));
    const std::uint64_t table = number(trailer.substr(24, 8));
    const auto isSize = [](std::size_t size) { return size >= 1 && size <= kMaximumSize; };
    if (!isSize(offsetBytes_) || !isSize(referenceBytes_)) return fail("a trailer with sizes that can't be");
    if (table < kMagic.size() || table > at_ || objects > (at_ - table) / offsetBytes_) {
      return fail("an offset table that lies outside");
    }
    objects_ = objects;
    tableBegin_ = static_cast<std::size_t>(table);
    return true;
  }

  // Moves to the object; at_ stays at its reference when there is none.
  bool goTo(std::uint64_t object) {
    if (object >= objects_) return fail("a reference to an object that isn't there");
    const std::size_t entry = tableBegin_ + static_cast<std::size_t>(object) * offsetBytes_;
    const std::uint64_t offset = number(bytes_.substr(entry, offsetBytes_));
    if (offset < kMagic.size() || offset >= tableBegin_) {
      at_ = entry;
      return fail("an offset that lies outside the objects");
    }
    at_ = static_cast<std::size_t>(offset);
    return true;
  }

  // Takes bytes of the object that is read.
  bool take(std::uint64_t count, std::string_view& taken) {
    if (count > tableBegin_ - at_) return fail("an object that is cut off");
    taken = bytes_.substr(at_, static_cast<std::size_t>(count));
    at_ += taken.size();
    return true;
  }
  bool takeNumber(std::uint64_t size, std::uint64_t& value) {
    std::string_view taken;
    if (!take(size, taken)) return false;
    value = number(taken);
    return true;
  }
  // The count that a mark's lower half tells, or the integer after it.
  bool takeCount(unsigned mark, std::uint64_t& count) {
    count = mark & 0xFU;
    if (count < 0xF) return true;
    std::uint64_t integerMark = 0;
    if (!takeNumber(1, integerMark)) return false;
    if (integerMark < kInteger || integerMark > kInteger + 3) return fail("a count that is no integer");
    return takeNumber(std::uint64_t{1} << (integerMark - kInteger), count);
  }
  bool spend(std::uint64_t bytes) {
    content_ += bytes;
    return content_ <= mostContent_ || fail("too large");
  }
  bool countValues(std::size_t values) {
    values_ += values;
    return values_ <= kMaximumPropertyListValues || fail("too many values");
  }

  bool readObject(std::uint64_t object) {
    std::uint64_t byte = 0;
    if (!countValues(1) || !goTo(object)) return false;
    const std::size_t offset = at_;
    if (!takeNumber(1, byte)) return false;
    const auto mark = static_cast<unsigned>(byte);
    if (mark == kFalse || mark == kTrue) return add(mark == kTrue);
    if (mark == kFloat || mark == kDouble || mark == kDate) return readReal(mark);
    switch (mark & 0xF0U) {
      case kInteger:
        return readInteger(mark);
      case kData:
        return readData(mark);
      case kAsciiText:
      case kUtf16Text: {
        std::string_view text;
        return readText(mark, text) && add(text);
      }
      case kUid:
      case kArray:
      case kDictionary: {
        const auto known = finished_.find(offset);
        if (known != finished_.end()) return addAgain(known->second);
        return (mark & 0xF0U) == kUid ? readUid(offset, mark) : readContainer(offset, mark);
      }
      default:
        return fail("a kind of object that has no place here");
    }
  }

  bool readInteger(unsigned mark) {
    const unsigned power = mark & 0xFU;
    std::uint64_t value = 0;
    std::uint64_t high = 0;
    if (power > 4) return fail("an integer of a size that can't be");
    if (power == 4 && !takeNumber(8, high)) return false;
    if (!takeNumber(std::min(8U, 1U << power), value)) return false;
    const auto signedValue = static_cast<std::int64_t>(value);
    if (power == 3 || (high == 0 && signedValue >= 0) || (high == UINT64_MAX && signedValue < 0)) {
      return add(signedValue);
    }
    return high == 0 ? add(value) : fail("an integer beyond 64 bits");
  }

  bool readReal(unsigned mark) {
    std::uint64_t bits = 0;
    if (!takeNumber(mark == kFloat ? 4 : 8, bits)) return false;
    if (mark == kFloat) return add(std::bit_cast<float>(static_cast<std::uint32_t>(bits)));
    const auto value = std::bit_cast<double>(bits);
    if (mark == kDouble) return add(value);
    return std::isfinite(value) ? add(Date{value + kSecondsTo2001}) : fail("a date that is not finite");
  }

  bool readData(unsigned mark) {
    std::uint64_t count = 0;
    std::string_view bytes;
    return takeCount(mark, count) && take(count, bytes) && spend(count) && add(DataView{bytes});
  }

  // `text` stays: it lies in the file, or in decoded_.
  bool readText(unsigned mark, std::string_view& text) {
    const bool isUtf16 = (mark & 0xF0U) == kUtf16Text;
    const std::size_t place = at_;
    std::uint64_t count = 0;
    if (!takeCount(mark, count)) return false;
    if (count > bytes_.size()) return fail("an object that is cut off");
    if (!take(isUtf16 ? 2 * count : count, text) || !spend(text.size())) return false;
    if (isUtf16) return decodeUtf16(place, text);
    const auto isAscii = [](char byte) { return static_cast<unsigned char>(byte) < 0x80; };
    return std::all_of(text.begin(), text.end(), isAscii) || fail("a text that is not ASCII");
  }

  // Puts in place of a text's units what they mean, which is worked out once for each object.
  bool decodeUtf16(std::size_t place, std::string_view& text) {
    const auto [known, isNew] = decoded_.try_emplace(place);
    if (isNew && !appendUtf16(known->second, text)) return fail("a text that is not UTF-16");
    text = known->second;
    return true;
  }

  bool readUid(std::size_t offset, unsigned mark) {
    const std::uint64_t size = (mark & 0xFU) + 1;
    std::uint64_t value = 0;
    if (size > 8) return fail("a UID beyond 64 bits");
    if (!takeNumber(size, value)) return false;
    return add(finished_.emplace(offset, Finished{Value(Dictionary{{"CF$UID", value}}), 0, 0, 0}).first->second.value);
  }

  bool readContainer(std::size_t offset, unsigned mark) {
    if (levels_.size() == kMaximumPropertyListNesting) return fail("nested too deeply");
    if (std::any_of(levels_.begin(), levels_.end(), [&](const Level& level) { return level.offset == offset; })) {
      return fail("an object inside itself");
    }
    const bool isDictionary = (mark & 0xF0U) == kDictionary;
    std::uint64_t count = 0;
    std::string_view keys;
    std::string_view values;
    if (!takeCount(mark, count)) return false;
    if (count > bytes_.size() / referenceBytes_) return fail("an object that is cut off");
    if ((isDictionary && !take(count * referenceBytes_, keys)) || !take(count * referenceBytes_, values)) return false;
    levels_.push_back({offset, isDictionary, values_, content_, 1, {}});
    builder_.begin();
    for (std::size_t at = 0; at < values.size(); at += referenceBytes_) {
      if (isDictionary && !readKey(number(keys.substr(at, referenceBytes_)))) return false;
      if (!readObject(number(values.substr(at, referenceBytes_)))) return false;
    }
    return finishContainer();
  }

  bool finishContainer() {
    const Level level = levels_.back();
    levels_.pop_back();
    Finished made{{}, values_ - level.valuesBefore, content_ - level.contentBefore, level.height};
    if (level.isDictionary) {
      const auto finished = builder_.finishDictionary(cache_);
      if (!finished) return fail("a key stands twice in a dictionary");
      made.value = *finished;
    } else {
      made.value = builder_.finishArray();
    }
    return addContainer(finished_.emplace(level.offset, std::move(made)).first->second);
  }

  // One that stands in another place, too.
  bool addAgain(const Finished& known) {
    if (levels_.size() + known.height > kMaximumPropertyListNesting) return fail("nested too deeply");
    return countValues(known.values) && spend(known.content) && addContainer(known);
  }
  bool addContainer(const Finished& made) {
    if (!levels_.empty()) {
      levels_.back().height = std::max(levels_.back().height, made.height + 1);
    }
    return add(made.value);
  }

  bool readKey(std::uint64_t object) {
    std::uint64_t byte = 0;
    if (!goTo(object) || !takeNumber(1, byte)) return false;
    const auto mark = static_cast<unsigned>(byte);
    if ((mark & 0xF0U) != kAsciiText && (mark & 0xF0U) != kUtf16Text) return fail("a key that is no text");
    return readText(mark, levels_.back().key);
  }

  bool add(const ValueView& value) {
    if (levels_.empty()) {
      value_ = value;
    } else if (levels_.back().isDictionary) {
      builder_.add(levels_.back().key, value);
    } else {
      builder_.add(value);
    }
    return true;
  }

  const std::string_view bytes_;
  const std::uint64_t mostContent_;
  std::size_t at_ = 0;
  std::size_t offsetBytes_ = 0;
  std::size_t referenceBytes_ = 0;
  std::uint64_t objects_ = 0;
  std::uint64_t top_ = 0;
  std::size_t tableBegin_ = 0;
  KeyListCache cache_;
  PackedBuilder builder_;
  std::vector<Level> levels_;
  std::unordered_map<std::size_t, Finished> finished_;    // by offset
  std::unordered_map<std::size_t, std::string> decoded_;  // by offset, after the mark; a node's text doesn't move
  std::size_t values_ = 0;
  std::uint64_t content_ = 0;
  std::string fault_;
  Value value_;
};

}  // namespace

PropertyListReading readBinaryPropertyList(std::string_view bytes) {
  return BinaryReader(bytes).read();
}

}  // namespace tarn::plist
