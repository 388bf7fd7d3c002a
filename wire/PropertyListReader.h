// SPDX-License-Identifier: Apache-2.0
// PropertyListReader: reads checked property-list values out of a frame and hands them to a sink, in one pass. Internal
// to wire/.
//
// The sink is a type parameter so that one reader serves whoever makes dictionaries and whoever only looks. It has
//   void begin();                                        a container opens
//   void add(std::string_view key, const ValueView&);    an entry of the open dictionary
//   void add(const ValueView&);                          an item of the open array
//   bool endDictionary(const std::string_view* key);     the open one ends and joins the one around it, under the key
//   bool endArray(const std::string_view* key);          or, when that is null, as an item; false: a key stands twice
// The outermost container is opened and ended by the caller. Recursion is no deeper than kMaxNesting.
#pragma once

#include <bit>
#include <cstdint>
#include <limits>
#include <string_view>

#include "plist/ValueView.h"
#include "wire/CborReader.h"
#include "wire/Operation.h"
#include "wire/Utf8.h"

namespace tarn::wire {

// The value of a 16-bit float, exactly. Infinities and not-a-numbers stay what they are.
float floatFromHalf(std::uint16_t half) noexcept;

// Reads from a reader that it shares with its owner, at whose place it goes on, and stops at the first trouble. Texts,
// data and keys are handed over as views into the frame, after a look at their UTF-8. It allocates nothing by itself
// and takes no step for what a head only promises: each promised item costs a byte of the frame at least. Threads: one
// at a time.
//
// What it takes, and what it makes of it:
//
//   integers, -2^63 to 2^64 - 1            Signed, or Unsigned where Signed can't hold it
//   floats of 16, 32 and 64 bits           Float, Float and Double
//   true, false                            Bool
//   text of UTF-8, its length told         Text
//   bytes, their length told               Data
//   tag 1 over an integer or a float       Date
//   array, its length told                 Array
//   map with text keys, its length told    Dictionary
//
// Everything else is trouble: null, undefined, other simple values, other tags, keys that are no texts.
template <class Sink>
class PropertyListReader {
 public:
  PropertyListReader(CborReader& in, Sink& sink) noexcept : in_(in), sink_(sink) {}

  // What was wrong when a read returned false; a static text, or null when the frame ended early or wasn't CBOR, which
  // makes it unreadable altogether.
  const char* trouble() const noexcept { return trouble_; }

  // The entries or items of a container whose head was read, up to its end; the sink gets each of them. `depth` is its
  // level, 1 for an outermost one. False at the first trouble; what the sink got until then is the caller's to drop.
  // Of the entries, `known` were read before.
  bool readEntries(const CborHead& head, std::size_t depth, std::uint64_t known = 0);
  bool readItems(const CborHead& head, std::size_t depth);
  // The next value, at this level of the container that it is in: an entry under this key, or an item when that is
  // null.
  bool readValue(const std::string_view* key, std::size_t depth);
  // The value whose head was read; not for containers. Texts and data look into the frame.
  bool readScalar(const CborHead& head, plist::ValueView& value);

 private:
  // The text before an entry's value.
  bool readKey(std::string_view& key);
  // A container inside another one, from its begin() to its end in the sink; `key` is null inside an array.
  bool readContainer(const CborHead& head, const std::string_view* key, std::size_t depth);
  // One kind of head each, by its major type.
  bool readNegative(const CborHead& head, plist::ValueView& value);
  bool readString(const CborHead& head, plist::ValueView& value);
  bool readSimple(const CborHead& head, plist::ValueView& value);
  bool readDate(const CborHead& head, plist::ValueView& value);
  // Whether a container of this head may stand at this level: its length is told, and it isn't too deep.
  bool mayHold(const CborHead& head, std::size_t depth);
  // Keeps what is wrong, for the caller to return.
  bool fail(const char* trouble) noexcept {
    trouble_ = trouble;
    return false;
  }
  static bool isContainer(const CborHead& head) noexcept {
    return head.major == Major::Array || head.major == Major::Map;
  }

  CborReader& in_;
  Sink& sink_;
  const char* trouble_ = nullptr;
};

// Lengths that are left open are refused, so that a container's values are counted before the first is read.
template <class Sink>
bool PropertyListReader<Sink>::mayHold(const CborHead& head, std::size_t depth) {
  if (head.open()) return fail("a container of indefinite length");
  return depth <= kMaxNesting || fail("nested too deep");
}

// Entry after entry: a key, then a value. A count of 2^64 - 1 ends with the frame, at the first key that isn't there.
template <class Sink>
bool PropertyListReader<Sink>::readEntries(const CborHead& head, std::size_t depth, std::uint64_t known) {
  if (!mayHold(head, depth)) return false;
  for (std::uint64_t i = known; i < head.argument; ++i) {
    std::string_view key;
    if (!readKey(key) || !readValue(&key, depth)) return false;
  }
  return true;
}

// The same without keys.
template <class Sink>
bool PropertyListReader<Sink>::readItems(const CborHead& head, std::size_t depth) {
  if (!mayHold(head, depth)) return false;
  for (std::uint64_t i = 0; i < head.argument; ++i) {
    if (!readValue(nullptr, depth)) return false;
  }
  return true;
}

// A container goes through readContainer(), which gives it to the sink when it has ended.
template <class Sink>
inline bool PropertyListReader<Sink>::readValue(const std::string_view* key, std::size_t depth) {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (isContainer(head)) [[unlikely]] {
    return readContainer(head, key, depth + 1);
  }
  plist::ValueView value;
  if (!readScalar(head, value)) return false;
  key != nullptr ? sink_.add(*key, value) : sink_.add(value);
  return true;
}

// Opens the container in the sink, fills it and ends it there. The reader calls itself here: once a level, and
// mayHold() ends that at kMaxNesting. A key that stands twice shows at the end, when the sink looks for the list of
// keys.
template <class Sink>
bool PropertyListReader<Sink>::readContainer(const CborHead& head, const std::string_view* key, std::size_t depth) {
  sink_.begin();
  if (head.major == Major::Array) return readItems(head, depth) && sink_.endArray(key);
  return readEntries(head, depth) && (sink_.endDictionary(key) || fail("a key given twice"));
}

// Any text is a key, an empty one included; that it stands there once is the sink's to find out.
template <class Sink>
bool PropertyListReader<Sink>::readKey(std::string_view& key) {
  CborHead head;
  if (!in_.readHead(head)) return false;
  if (head.major != Major::Text) [[unlikely]] {
    return fail("a key that is no text");
  }
  if (head.open()) [[unlikely]] {
    return fail("a text of indefinite length");
  }
  return in_.readBytes(head.argument, key) && (isUtf8(key) || fail("a key that is not UTF-8"));
}

// By major type. Containers have operations of their own, so one is trouble here: an error's text that is an array,
// say.
template <class Sink>
bool PropertyListReader<Sink>::readScalar(const CborHead& head, plist::ValueView& value) {
  switch (head.major) {
    case Major::Unsigned:
      // One integer has one kind, whoever sent it: unsigned only where signed can't hold it.
      value = head.argument <= static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())
                  ? plist::ValueView(static_cast<std::int64_t>(head.argument))
                  : plist::ValueView(head.argument);
      return true;
    case Major::Negative:
      return readNegative(head, value);
    case Major::Bytes:
    case Major::Text:
      return readString(head, value);
    case Major::Tag:
      return readDate(head, value);
    case Major::Simple:
      return readSimple(head, value);
    default:
      return fail("a container where none can be");
  }
}

// The value is -1 - argument. Of those CBOR can say down to -2^64; a property list holds them down to -2^63.
template <class Sink>
bool PropertyListReader<Sink>::readNegative(const CborHead& head, plist::ValueView& value) {
  if (head.argument > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max())) {
    return fail("an integer below -2^63");
  }
  value = plist::ValueView(-1 - static_cast<std::int64_t>(head.argument));
  return true;
}

// Text and data differ in the look at the text's characters alone, which takes eight at a time while they are ASCII.
template <class Sink>
bool PropertyListReader<Sink>::readString(const CborHead& head, plist::ValueView& value) {
  if (head.open()) [[unlikely]] {
    return fail(head.major == Major::Text ? "a text of indefinite length" : "data of indefinite length");
  }
  std::string_view bytes;
  if (!in_.readBytes(head.argument, bytes)) return false;
  if (head.major == Major::Bytes) {
    value = plist::ValueView(plist::DataView{bytes});
    return true;
  }
  value = plist::ValueView(bytes);
  return isUtf8(bytes) || fail("a text that is not UTF-8");
}

// By information: 20 and 21 are the bools, 25 to 27 the floats, whose bits are the argument. A float of any value is
// taken, those that are no numbers included.
template <class Sink>
bool PropertyListReader<Sink>::readSimple(const CborHead& head, plist::ValueView& value) {
  switch (head.info) {
    case 20:
    case 21:
      value = plist::ValueView(head.info == 21);
      return true;
    case 22:
      return fail("a null");
    case 23:
      return fail("an undefined value");
    case 25:
      value = plist::ValueView(floatFromHalf(static_cast<std::uint16_t>(head.argument)));
      return true;
    case 26:
      value = plist::ValueView(std::bit_cast<float>(static_cast<std::uint32_t>(head.argument)));
      return true;
    case 27:
      value = plist::ValueView(std::bit_cast<double>(head.argument));
      return true;
    default:
      return fail("a simple value other than true and false");
  }
}

// Seconds since 1970 UTC, in any kind of number; a date holds them as a double, so an integer beyond 2^53 loses digits.
template <class Sink>
bool PropertyListReader<Sink>::readDate(const CborHead& head, plist::ValueView& value) {
  if (head.argument != 1) return fail("a tag other than that of a date");
  CborHead number;
  if (!in_.readHead(number)) return false;
  const bool integer = number.major == Major::Unsigned || number.major == Major::Negative;
  const bool floating = number.major == Major::Simple && number.info >= 25 && number.info <= kInfoEightBytes;
  if (!integer && !floating) return fail("a date that is no number");
  plist::ValueView seconds;
  if (!readScalar(number, seconds)) return false;
  value = plist::ValueView(plist::Date{seconds.asDouble()});
  return true;
}

}  // namespace tarn::wire
