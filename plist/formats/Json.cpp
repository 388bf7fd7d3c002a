#include "plist/formats/Json.h"

#include <cmath>

#include "plist/CalendarDate.h"
#include "plist/Dictionary.h"
#include "plist/EscapedText.h"
#include "plist/formats/Base64.h"

namespace tarn::plist {

namespace {

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
