// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/Json.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <utility>
#include <vector>

#include "plist/CalendarDate.h"
#include "plist/Characters.h"
#include "plist/Dictionary.h"
#include "plist/EscapedText.h"
#include "plist/formats/Base64.h"

namespace tarn::plist {

namespace {

enum class Policy {
  Compact,       // on one line without a blank; what JSON can't hold takes another form
  SortedPretty,  // indented, members by their keys; what JSON can't hold is refused with its place
  RoundTrip,     // what JSON can't hold takes a form that tells what it is; what would not read back equal is refused
};

bool isUtf8(std::string_view text) {
  while (!text.empty()) {
    const auto character = takeCharacter(text);
    if (!character || (*character >= 0xD800 && *character <= 0xDFFF)) return false;
  }
  return true;
}

// Never without point or exponent, so that it reads back as what it is; one that is not finite as a text.
template <class Floating>
void appendFloating(std::string& out, Floating number) {
  const std::string_view quote = std::isfinite(number) ? "" : "\"";
  out += quote;
  const std::size_t before = out.size();
  appendNumber(out, number);
  if (std::isfinite(number) && out.find_first_of(".e", before) == std::string::npos) {
    out += ".0";
  }
  out += quote;
}

// In the fewest characters that read back the same; for files that were written so from the beginning.
void appendShortestDouble(std::string& out, double number) {
  std::array<char, 32> digits{};
  const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), number).ptr;
  const std::string_view written(digits.data(), static_cast<std::size_t>(end - digits.data()));
  out += written;
  if (written.find_first_of(".e") == std::string_view::npos) {
    out += ".0";
  }
}

void appendJsonDate(std::string& out, Date date) {
  const auto calendar = calendarDate(date.epochSeconds);
  if (!calendar) return appendFloating(out, date.epochSeconds);
  out += '"';
  appendDateAndTime(out, *calendar, 'T');
  if (calendar->microsecond != 0) {
    std::string decimals = std::to_string(1000000 + calendar->microsecond);
    decimals.front() = '.';
    decimals.erase(decimals.find_last_not_of('0') + 1);
    out += decimals;
  }
  out += "Z\"";
}

// Writes values; every operation says whether the value could be written.
template <Policy kPolicy>
class Writer {
 public:
  // Lines after the first begin at `level` and below it.
  Writer(std::string& out, JsonLayout layout, std::size_t level = 0) : out_(out), layout_(layout), level_(level) {}

  bool write(const ValueView& value) {
    switch (value.kind()) {
      case Kind::None:
        return writeAbsent();
      case Kind::Bool:
        out_ += value.boolValue() ? "true" : "false";
        return true;
      case Kind::Signed:
        appendNumber(out_, value.signedValue());
        return true;
      case Kind::Unsigned:
        appendNumber(out_, value.unsignedValue());
        return true;
      case Kind::Float:
        return writeNumber(value.floatValue());
      case Kind::Double:
        return writeNumber(value.doubleValue());
      case Kind::Date:
        return writeDate(value.dateValue());
      case Kind::Text:
        return writeText(value.text());
      case Kind::Data:
        return writeData(value.data());
      case Kind::Array:
        return writeArray(value.array());
      case Kind::Dictionary:
        return writeDictionary(value.dictionary());
    }
    return false;
  }

  // After a failure: what can't be written, and where.
  std::string complaint() const {
    std::string text = "JSON can't hold ";
    text += misfit_;
    for (auto step = place_.rbegin(); step != place_.rend(); ++step) {
      text += step == place_.rbegin() ? " at " : "";
      text += *step;
    }
    return text;
  }

 private:
  bool refuse(std::string_view misfit) {
    misfit_ = misfit;
    return false;
  }

  bool writeAbsent() {
    if constexpr (kPolicy != Policy::Compact) return refuse("an absent value");
    out_ += "null";
    return true;
  }

  template <class Floating>
  bool writeNumber(Floating number) {
    if constexpr (kPolicy != Policy::Compact) {
      if (!std::isfinite(number)) return refuse("a number that is not finite");
    }
    if constexpr (kPolicy == Policy::RoundTrip) {
      appendShortestDouble(out_, static_cast<double>(number));
    } else {
      appendFloating(out_, number);
    }
    return true;
  }

  bool writeDate(Date date) {
    if constexpr (kPolicy == Policy::Compact) {
      appendJsonDate(out_, date);
      return true;
    } else if constexpr (kPolicy == Policy::RoundTrip) {
      return writeForm("$date", [&] { return writeNumber(date.epochSeconds); });
    } else {
      return refuse("a date");
    }
  }

  bool writeData(std::string_view bytes) {
    const auto base64 = [&] {
      out_ += '"';
      appendBase64(out_, bytes);
      out_ += '"';
      return true;
    };
    if constexpr (kPolicy == Policy::Compact) {
      return base64();
    } else if constexpr (kPolicy == Policy::RoundTrip) {
      return writeForm("$data", base64);
    } else {
      return refuse("data");
    }
  }

  bool writeText(std::string_view text) {
    if constexpr (kPolicy == Policy::RoundTrip) {
      if (!isUtf8(text)) return refuse("a text that is not UTF-8");
    }
    appendJsonText(out_, text);
    return true;
  }

  template <class Write>
  bool writeForm(std::string_view name, Write writeContent) {
    if (level_ == kMaximumJsonNesting) return refuse("such a depth");
    out_.append("{\"").append(name).append("\": ");
    const bool written = writeContent();
    out_ += '}';
    return written;
  }

  bool writeArray(const Array& array) {
    if (!open('[')) return false;
    std::size_t index = 0;
    for (const ValueView& item : array) {
      separate(index == 0);
      if (!write(item)) {
        if constexpr (kPolicy == Policy::SortedPretty) {
          place_.push_back("[" + std::to_string(index) + "]");
        }
        return false;
      }
      ++index;
    }
    close(']', index == 0);
    return true;
  }

  bool writeDictionary(const Dictionary& dictionary) {
    if constexpr (kPolicy == Policy::RoundTrip) {
      const bool readsAsForm = dictionary.size() == 1 && (dictionary.contains("$date") || dictionary.contains("$data"));
      if (readsAsForm) return refuse("a dictionary that would read as another value");
    }
    if (!open('{')) return false;
    bool isFirst = true;
    if constexpr (kPolicy == Policy::SortedPretty) {
      std::vector<std::pair<std::string_view, ValueView>> members;
      members.reserve(dictionary.size());
      for (const Dictionary::Entry& entry : dictionary) {
        members.emplace_back(entry.key.text(), entry.value);
      }
      std::sort(members.begin(), members.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
      for (const auto& [key, value] : members) {
        if (!writeMember(key, value, std::exchange(isFirst, false))) return false;
      }
    } else {
      for (const Dictionary::Entry& entry : dictionary) {
        if (!writeMember(entry.key.text(), entry.value, std::exchange(isFirst, false))) return false;
      }
    }
    close('}', isFirst);
    return true;
  }

  bool writeMember(std::string_view key, const ValueView& value, bool isFirst) {
    separate(isFirst);
    if (!writeText(key)) return false;
    out_ += kPolicy == Policy::Compact ? ":" : ": ";
    if (write(value)) return true;
    if constexpr (kPolicy == Policy::SortedPretty) {
      std::string step = "[";
      appendJsonText(step, key);
      place_.push_back(step + "]");
    }
    return false;
  }

  bool open(char bracket) {
    out_ += bracket;
    ++level_;
    if constexpr (kPolicy != Policy::RoundTrip) return true;
    return level_ <= kMaximumJsonNesting || refuse("such a depth");
  }
  void separate(bool isFirst) {
    if (!isFirst) {
      out_ += kPolicy == Policy::RoundTrip && layout_ == JsonLayout::OneLine ? ", " : ",";
    }
    beginLine();
  }
  void close(char bracket, bool isEmpty) {
    --level_;
    if (!isEmpty) {
      beginLine();
    }
    out_ += bracket;
  }
  void beginLine() {
    if constexpr (kPolicy == Policy::Compact) return;
    if (layout_ == JsonLayout::OneLine) return;
    out_ += '\n';
    out_.append(2 * level_, ' ');
  }

  std::string& out_;
  const JsonLayout layout_;
  std::size_t level_;
  std::string_view misfit_;
  std::vector<std::string> place_;  // the way to what can't be written, innermost step first
};

}  // namespace

void appendJson(std::string& out, const ValueView& value) {
  static_cast<void>(Writer<Policy::Compact>(out, JsonLayout::OneLine).write(value));
}

std::optional<std::string> appendPrettyJson(std::string& out, const ValueView& value, std::size_t level) {
  const std::size_t before = out.size();
  Writer<Policy::SortedPretty> writer(out, JsonLayout::Indented, level);
  if (writer.write(value)) return std::nullopt;
  out.resize(before);
  return writer.complaint();
}

std::optional<std::string> jsonText(const ValueView& value, JsonLayout layout) {
  std::string text;
  if (!Writer<Policy::RoundTrip>(text, layout).write(value)) return std::nullopt;
  if (layout == JsonLayout::Indented) {
    text += '\n';
  }
  return text;
}

}  // namespace tarn::plist
