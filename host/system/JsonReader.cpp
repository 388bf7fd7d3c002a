// SPDX-License-Identifier: Apache-2.0
#include <algorithm>
#include <array>
#include <cstdint>
#include <deque>
#include <iterator>
#include <nlohmann/json.hpp>

#include "host/system/JsonValues.h"
#include "plist/PackedBuilder.h"
#include "plist/formats/Base64.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kMaximumFaultText = 200;

// An iterator that tells how far the parser has read; the parser itself tells that only at a syntax error.
class CountingIterator {
 public:
  using value_type = char;
  using difference_type = std::ptrdiff_t;
  using pointer = const char*;
  using reference = const char&;
  using iterator_category = std::input_iterator_tag;

  CountingIterator(const char* at, std::size_t* count) : at_(at), count_(count) {}
  reference operator*() const { return *at_; }
  CountingIterator& operator++() {
    ++at_;
    ++*count_;
    return *this;
  }
  CountingIterator operator++(int) {
    const CountingIterator before = *this;
    ++*this;
    return before;
  }
  friend bool operator==(const CountingIterator& a, const CountingIterator& b) { return a.at_ == b.at_; }

 private:
  const char* at_;
  std::size_t* count_;
};

// What the parser says, without its own name, number and position; bytes that are no text are left out.
std::string cleanedFault(std::string_view what) {
  constexpr std::string_view kColumn = ", column ";
  std::size_t from = what.find(kColumn);
  if (from != std::string_view::npos) {
    from = what.find(": ", from);
    from = from == std::string_view::npos ? 0 : from + 2;
  } else {
    from = what.find("] ");
    from = from == std::string_view::npos ? 0 : from + 2;
  }
  std::string text(what.substr(from));
  std::erase_if(text,
                [](char c) { return static_cast<unsigned char>(c) < 0x20 || static_cast<unsigned char>(c) > 0x7E; });
  if (text.size() > kMaximumFaultText) {
    text.resize(kMaximumFaultText);
    text += "...";
  }
  return text;
}

// Takes the parser's events and builds the values.
class ValueBuilder final : public nlohmann::json_sax<nlohmann::json> {
 public:
  ValueBuilder(std::string_view text, std::size_t maximumNesting, JsonNull nullMember)
      : text_(text), maximumNesting_(maximumNesting), nullMember_(nullMember) {}

  std::size_t* readCount() { return &read_; }
  JsonReading take() {
    if (reading_.fault) {
      reading_.value = plist::Value();
      reading_.memberLines.clear();
    }
    return std::move(reading_);
  }

  // The parser takes a NUL between values for the end and would pass over what stands after it.
  void refuseNul() {
    if (const std::size_t nul = text_.find('\0'); nul != std::string_view::npos && !reading_.fault) {
      failAt(nul + 1, "a NUL is not allowed here");
    }
  }

  bool null() override {
    if (nullMember_ == JsonNull::Fault || levels_.empty() || !levels_.back().isObject) {
      return fail("null is not allowed here");
    }
    keys_.pop_back();
    if (levels_.size() == 1) {
      reading_.memberLines.pop_back();
    }
    return true;
  }
  bool boolean(bool value) override { return add(value); }
  bool number_integer(std::int64_t value) override { return add(value); }
  bool number_unsigned(std::uint64_t value) override {
    return value <= static_cast<std::uint64_t>(INT64_MAX) ? add(static_cast<std::int64_t>(value)) : add(value);
  }
  bool number_float(double value, const std::string& written) override {
    if (written.find_first_of(".eE") == std::string::npos) return fail("the integer is outside -2^63 to 2^64-1");
    return add(value);
  }
  bool string(std::string& value) override { return add(std::string_view(value)); }
  bool binary(nlohmann::json::binary_t&) override { return fail("binary is not allowed here"); }

  bool start_object(std::size_t) override { return open(true); }
  bool key(std::string& text) override {
    keys_.push_back(text);
    if (levels_.size() == 1) {
      reading_.memberLines.push_back(lineAt(read_));
    }
    return true;
  }
  bool end_object() override {
    std::optional<plist::Dictionary> finished = builder_.finishDictionary(cache_);
    keys_.resize(levels_.back().keysBegin);
    levels_.pop_back();
    if (!finished) return fail("a member stands twice in the object that ends here");
    if (finished->size() == 1) {
      const plist::Dictionary::Entry entry = *finished->begin();
      if (entry.key.text() == "$date") return addDate(entry.value);
      if (entry.key.text() == "$data") return addData(entry.value);
    }
    return add(*finished);
  }
  bool start_array(std::size_t) override { return open(false); }
  bool end_array() override {
    const plist::Array finished = builder_.finishArray();
    levels_.pop_back();
    return add(finished);
  }

  bool parse_error(std::size_t position, const std::string&, const nlohmann::detail::exception& error) override {
    return failAt(position, cleanedFault(error.what()));
  }

 private:
  struct Level {
    std::size_t keysBegin;
    bool isObject;
  };

  bool open(bool isObject) {
    if (levels_.size() == maximumNesting_) {
      return fail("nested deeper than " + std::to_string(maximumNesting_) + " levels");
    }
    levels_.push_back({keys_.size(), isObject});
    builder_.begin();
    return true;
  }
  bool add(const plist::ValueView& value) {
    if (levels_.empty()) {
      reading_.value = value;
    } else if (levels_.back().isObject) {
      builder_.add(keys_.back(), value);
    } else {
      builder_.add(value);
    }
    return true;
  }
  bool addDate(const plist::ValueView& seconds) {
    if (!seconds.isNumber() || seconds.kind() == plist::Kind::Bool) return fail("$date wants a number of seconds");
    return add(plist::Date{seconds.asDouble()});
  }
  bool addData(const plist::ValueView& base64) {
    const std::optional<std::string> bytes = base64.isText() ? plist::decodeBase64(base64.text()) : std::nullopt;
    if (!bytes) return fail("$data wants a base64 text");
    return add(plist::DataView{*bytes});
  }
  bool fail(std::string text) { return failAt(read_, std::move(text)); }
  bool failAt(std::size_t position, std::string text) {
    const std::size_t last = position == 0 ? 0 : std::min(position - 1, text_.size());
    const std::size_t lineEnd = last == 0 ? std::string_view::npos : text_.rfind('\n', last - 1);
    const std::size_t lineBegin = lineEnd == std::string_view::npos ? 0 : lineEnd + 1;
    reading_.fault = JsonFault{lineAt(last), last - lineBegin + 1, std::move(text)};
    return false;
  }
  std::size_t lineAt(std::size_t offset) {
    const auto at = [this](std::size_t n) {
      return text_.begin() + static_cast<std::ptrdiff_t>(std::min(n, text_.size()));
    };
    if (offset < countedTo_) return 1 + static_cast<std::size_t>(std::count(text_.begin(), at(offset), '\n'));
    line_ += static_cast<std::size_t>(std::count(at(countedTo_), at(offset), '\n'));
    countedTo_ = offset;
    return line_;
  }

  const std::string_view text_;
  const std::size_t maximumNesting_;
  const JsonNull nullMember_;
  std::size_t read_ = 0;
  std::size_t line_ = 1;
  std::size_t countedTo_ = 0;
  plist::KeyListCache cache_;
  plist::PackedBuilder builder_;
  std::deque<std::string> keys_;  // of every open object; the builder looks at them, so they mustn't move
  std::vector<Level> levels_;
  JsonReading reading_;
};

}  // namespace

std::string JsonFault::description() const {
  return std::to_string(line) + ":" + std::to_string(column) + ": " + text;
}

JsonReading readJson(std::string_view text, std::size_t maximumNesting, JsonNull nullMember) {
  ValueBuilder builder(text, maximumNesting, nullMember);
  const CountingIterator begin(text.data(), builder.readCount());
  const CountingIterator end(text.data() + text.size(), builder.readCount());
  nlohmann::json::sax_parse(begin, end, &builder);
  builder.refuseNul();
  return builder.take();
}

}  // namespace tarn::linux_host
