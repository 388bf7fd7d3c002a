#include "plist/formats/Json.h"

#include <cmath>

#include "plist/CalendarDate.h"
#include "plist/Dictionary.h"
#include "plist/EscapedText.h"

namespace tarn::plist {

namespace {

constexpr std::string_view kBase64Alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

template <class Floating>
void appendJsonNumber(std::string& out, Floating value) {
  const std::size_t before = out.size();
  if (!std::isfinite(value)) {
    out += '"';
    appendNumber(out, value);
    out += '"';
    return;
  }
  appendNumber(out, value);
  if (out.find_first_of(".e", before) == std::string::npos) {
    out += ".0";
  }
}

void appendJsonDate(std::string& out, Date date) {
  const auto calendar = calendarDate(date.epochSeconds);
  if (!calendar) {
    return appendJsonNumber(out, date.epochSeconds);
  }
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

void appendJsonArray(std::string& out, const Array& array) {
  out += '[';
  bool first = true;
  for (const ValueView& item : array) {
    if (!first) {
      out += ',';
    }
    first = false;
    appendJson(out, item);
  }
  out += ']';
}

void appendJsonObject(std::string& out, const Dictionary& dictionary) {
  out += '{';
  bool first = true;
  for (const Dictionary::Entry& entry : dictionary) {
    if (!first) {
      out += ',';
    }
    first = false;
    appendJsonText(out, entry.key.text());
    out += ':';
    appendJson(out, entry.value);
  }
  out += '}';
}

}  // namespace

void appendBase64(std::string& out, std::string_view bytes) {
  const auto byteAt = [&](std::size_t at) -> std::uint32_t {
    return at < bytes.size() ? static_cast<unsigned char>(bytes[at]) : 0U;
  };
  for (std::size_t at = 0; at < bytes.size(); at += 3) {
    const std::uint32_t group = byteAt(at) << 16U | byteAt(at + 1) << 8U | byteAt(at + 2);
    out += kBase64Alphabet[group >> 18U];
    out += kBase64Alphabet[(group >> 12U) & 63U];
    out += at + 1 < bytes.size() ? kBase64Alphabet[(group >> 6U) & 63U] : '=';
    out += at + 2 < bytes.size() ? kBase64Alphabet[group & 63U] : '=';
  }
}

std::optional<std::string> decodeBase64(std::string_view text) {
  if (text.size() % 4 != 0) {
    return std::nullopt;
  }
  const std::size_t padding = text.ends_with("==") ? 2 : (text.ends_with('=') ? 1 : 0);
  std::string bytes;
  std::uint32_t bits = 0;
  int held = 0;
  for (const char c : text.substr(0, text.size() - padding)) {
    const std::size_t digit = kBase64Alphabet.find(c);
    if (digit == std::string_view::npos) {
      return std::nullopt;
    }
    bits = (bits << 6U) | static_cast<std::uint32_t>(digit);
    held += 6;
    if (held >= 8) {
      held -= 8;
      bytes.push_back(static_cast<char>((bits >> static_cast<unsigned>(held)) & 0xFFU));
    }
  }
  const bool leftOver = (bits & ((1U << static_cast<unsigned>(held)) - 1U)) != 0;
  return leftOver ? std::nullopt : std::optional(std::move(bytes));
}

void appendJson(std::string& out, const ValueView& value) {
  switch (value.kind()) {
    case Kind::None:
      out += "null";
      return;
    case Kind::Bool:
      out += value.boolValue() ? "true" : "false";
      return;
    case Kind::Signed:
      return appendNumber(out, value.signedValue());
    case Kind::Unsigned:
      return appendNumber(out, value.unsignedValue());
    case Kind::Float:
      return appendJsonNumber(out, value.floatValue());
    case Kind::Double:
      return appendJsonNumber(out, value.doubleValue());
    case Kind::Date:
      return appendJsonDate(out, value.dateValue());
    case Kind::Text:
      return appendJsonText(out, value.text());
    case Kind::Data:
      out += '"';
      appendBase64(out, value.data());
      out += '"';
      return;
    case Kind::Array:
      return appendJsonArray(out, value.array());
    case Kind::Dictionary:
      return appendJsonObject(out, value.dictionary());
  }
}

}  // namespace tarn::plist
