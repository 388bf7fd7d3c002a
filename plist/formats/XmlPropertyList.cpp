// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/XmlPropertyList.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdint>
#include <deque>
#include <limits>
#include <vector>

#include "plist/PackedBuilder.h"
#include "plist/formats/Base64.h"
#include "plist/formats/XmlScanner.h"

namespace tarn::plist {

namespace {

using detail::XmlScanner;

std::string_view trimmed(std::string_view text) {
  while (!text.empty() && detail::isXmlBlank(text.front())) {
    text.remove_prefix(1);
  }
  while (!text.empty() && detail::isXmlBlank(text.back())) {
    text.remove_suffix(1);
  }
  return text;
}

// The whole text as a number; nothing when it isn't one or the type can't hold it.
template <class Number, class... Base>
std::optional<Number> wholeNumber(std::string_view text, Base... base) {
  Number number{};
  const auto [stopped, error] = std::from_chars(text.data(), text.data() + text.size(), number, base...);
  return error == std::errc() && stopped == text.data() + text.size() ? std::optional(number) : std::nullopt;
}

bool takePrefix(std::string_view& text, std::string_view prefix) {
  if (!text.starts_with(prefix)) return false;
  text.remove_prefix(prefix.size());
  return true;
}

// An absent value when the text is no integer from -2^63 to 2^64-1.
Value integerValue(std::string_view text) {
  text = trimmed(text);
  const bool isNegative = takePrefix(text, "-");
  if (!isNegative) {
    takePrefix(text, "+");
  }
  const int base = takePrefix(text, "0x") || takePrefix(text, "0X") ? 16 : 10;
  const auto magnitude = wholeNumber<std::uint64_t>(text, base);
  constexpr auto kMost = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  if (!magnitude || (isNegative && *magnitude > kMost + 1)) return {};
  if (isNegative) return Value(static_cast<std::int64_t>(~*magnitude + 1));
  return *magnitude <= kMost ? Value(static_cast<std::int64_t>(*magnitude)) : Value(*magnitude);
}

Value realValue(std::string_view text) {
  text = trimmed(text);
  if (takePrefix(text, "+") && text.starts_with('-')) return {};
  const auto number = wholeNumber<double>(text);
  return number ? Value(*number) : Value();
}

// The digits at this place as a number.
std::optional<unsigned> digitsAt(std::string_view text, std::size_t at, std::size_t count) {
  const std::string_view digits = text.substr(at, count);
  if (!std::all_of(digits.begin(), digits.end(), [](char digit) { return digit >= '0' && digit <= '9'; })) return {};
  return wholeNumber<unsigned>(digits);
}

// 2026-11-20T10:00:00Z
Value dateValue(std::string_view text) {
  using namespace std::chrono;
  text = trimmed(text);
  constexpr std::string_view kPattern = "0000-00-00T00:00:00Z";
  if (text.size() != kPattern.size()) return {};
  for (std::size_t at = 0; at < kPattern.size(); ++at) {
    if (kPattern[at] != '0' && text[at] != kPattern[at]) return {};
  }
  const auto years = digitsAt(text, 0, 4);
  const auto months = digitsAt(text, 5, 2);
  const auto days = digitsAt(text, 8, 2);
  const auto hour = digitsAt(text, 11, 2);
  const auto minute = digitsAt(text, 14, 2);
  const auto second = digitsAt(text, 17, 2);
  if (!years || !months || !days || !hour || !minute || !second) return {};
  const year_month_day date{year(static_cast<int>(*years)), month(*months), day(*days)};
  if (*years == 0 || !date.ok() || *hour > 23 || *minute > 59 || *second > 59) return {};
  const auto midnight = sys_days(date).time_since_epoch();
  const seconds since = midnight + hours(*hour) + minutes(*minute) + seconds(*second);
  return Date{static_cast<double>(since.count())};
}

Value dataValue(std::string text) {
  std::erase_if(text, detail::isXmlBlank);
  const auto bytes = decodeBase64(text);
  return bytes ? Value(DataView{*bytes}) : Value();
}

// Takes the document's elements and builds the values; open containers lie on a stack, so nesting costs no stack of
// ours.
class XmlReader {
 public:
  explicit XmlReader(std::string_view text) : in_(text) {}

  PropertyListReading read() {
    if (!readDocument()) return {{}, PropertyListFault{PropertyListFault::Place::Line, in_.line(), in_.fault()}};
    return {std::move(value_), {}};
  }

 private:
  struct Level {
    bool isDictionary;
    bool hasKey;  // the next element is the value of the key that was read last
    std::size_t keysBegin;
  };

  bool readDocument() {
    XmlScanner::Tag tag;
    if (!in_.skipProlog() || !in_.readStartTag(tag)) return false;
    const bool isWrapped = tag.name == "plist";
    if (isWrapped) {
      if (tag.isEmpty) return in_.fail("a property list without a value");
      if (!in_.skipMisc()) return false;
      if (in_.atEndTag()) return in_.fail("a property list without a value");
      if (!in_.readStartTag(tag)) return false;
    }
    if (!readElement(tag)) return false;
    while (!levels_.empty()) {
      if (!readNext()) return false;
    }
    if (!in_.skipMisc() || (isWrapped && !(in_.readEndTag("plist") && in_.skipMisc()))) return false;
    return in_.atEnd() || in_.fail("something behind the end");
  }

  // What stands next in the innermost container: an element or the container's end.
  bool readNext() {
    if (!in_.skipMisc()) return false;
    Level& level = levels_.back();
    if (in_.atEndTag()) return close();
    XmlScanner::Tag tag;
    if (!in_.readStartTag(tag)) return false;
    if (!level.isDictionary || level.hasKey) return readElement(tag);
    if (tag.name != "key") return in_.fail("<key> is wanted here");
    level.hasKey = true;
    keys_.emplace_back();
    return in_.readText(tag, keys_.back()) && spend(keys_.back().size());
  }

  bool readElement(const XmlScanner::Tag& tag) {
    if (++values_ > kMaximumPropertyListValues) return in_.fail("too many values");
    if (tag.name == "dict" || tag.name == "array") return open(tag);
    if (tag.name == "true" || tag.name == "false") {
      if (!in_.readText(tag, text_)) return false;
      return trimmed(text_).empty() ? add(tag.name == "true") : in_.fail("text inside a boolean");
    }
    if (tag.name == "string") return in_.readText(tag, text_) && spend(text_.size()) && add(text_);
    Value (*convert)(std::string_view) = nullptr;
    if (tag.name == "integer") {
      convert = integerValue;
    }
    if (tag.name == "real") {
      convert = realValue;
    }
    if (tag.name == "date") {
      convert = dateValue;
    }
    if (tag.name == "data") {
      convert = [](std::string_view text) { return dataValue(std::string(text)); };
    }
    if (convert == nullptr) return in_.fail("no such element: <" + std::string(tag.name.substr(0, 40)) + ">");
    if (!in_.readText(tag, text_) || !spend(text_.size())) return false;
    const Value value = convert(text_);
    return value.present() ? add(value) : in_.fail("not a value of <" + std::string(tag.name) + ">");
  }

  bool open(const XmlScanner::Tag& tag) {
    if (levels_.size() == kMaximumPropertyListNesting) return in_.fail("nested too deeply");
    levels_.push_back({tag.name == "dict", false, keys_.size()});
    builder_.begin();
    return !tag.isEmpty || finish();
  }
  bool close() {
    const Level& level = levels_.back();
    if (level.hasKey) return in_.fail("a key without a value");
    return in_.readEndTag(level.isDictionary ? "dict" : "array") && finish();
  }
  bool finish() {
    const Level level = levels_.back();
    levels_.pop_back();
    if (!level.isDictionary) return add(builder_.finishArray());
    const auto finished = builder_.finishDictionary(cache_);
    keys_.resize(level.keysBegin);
    return finished ? add(*finished) : in_.fail("a key stands twice in the dictionary that ends here");
  }
  bool add(const ValueView& value) {
    if (levels_.empty()) {
      value_ = value;
    } else if (levels_.back().isDictionary) {
      builder_.add(keys_.back(), value);
      levels_.back().hasKey = false;
    } else {
      builder_.add(value);
    }
    return true;
  }
  bool spend(std::size_t bytes) {
    content_ += bytes;
    return content_ <= kMaximumPropertyListContent || in_.fail("too large");
  }

  XmlScanner in_;
  KeyListCache cache_;
  PackedBuilder builder_;
  std::deque<std::string> keys_;  // of every open dictionary; the builder looks at them, so they mustn't move
  std::vector<Level> levels_;
  std::string text_;
  std::size_t values_ = 0;
  std::size_t content_ = 0;
  Value value_;
};

}  // namespace

PropertyListReading readXmlPropertyList(std::string_view text) {
  if (text.size() > kMaximumPropertyListBytes) {
    return {{}, PropertyListFault{PropertyListFault::Place::Line, 1, "too large"}};
  }
  return XmlReader(text).read();
}

}  // namespace tarn::plist
