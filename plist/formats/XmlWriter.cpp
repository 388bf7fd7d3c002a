// SPDX-License-Identifier: Apache-2.0
#include <cmath>
#include <string_view>

#include "plist/CalendarDate.h"
#include "plist/Characters.h"
#include "plist/Dictionary.h"
#include "plist/formats/Base64.h"
#include "plist/formats/XmlPropertyList.h"

namespace tarn::plist {

namespace {

constexpr std::string_view kOpening = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
constexpr std::string_view kClosing = "</plist>\n";

bool isXmlText(std::string_view text) {
  while (!text.empty()) {
    const auto character = takeCharacter(text);
    if (!character || !isXmlCharacter(*character)) return false;
  }
  return true;
}

// Writes one value; every operation says whether the value can be held by a property list.
class XmlWriter {
 public:
  explicit XmlWriter(std::string& out) : out_(out) {}

  bool write(const ValueView& value, std::size_t depth) {
    indent(depth);
    switch (value.kind()) {
      case Kind::None:
        return false;
      case Kind::Bool:
        out_ += value.boolValue() ? "<true/>\n" : "<false/>\n";
        return true;
      case Kind::Signed:
      case Kind::Unsigned:
        return element("integer", description(value));
      case Kind::Float:
      case Kind::Double:
        return element("real", realText(value));
      case Kind::Date:
        return writeDate(value.dateValue());
      case Kind::Text:
        return element("string", value.text());
      case Kind::Data:
        return writeData(value.data());
      case Kind::Array:
        return writeArray(value.array(), depth);
      case Kind::Dictionary:
        return writeDictionary(value.dictionary(), depth);
    }
    return false;
  }

 private:
  void indent(std::size_t depth) { out_.append(depth, '\t'); }

  bool element(std::string_view name, std::string_view text) {
    if (!isXmlText(text)) return false;
    out_.append("<").append(name).append(">");
    for (const char character : text) {
      appendEscaped(character);
    }
    out_.append("</").append(name).append(">\n");
    return true;
  }

  void appendEscaped(char character) {
    switch (character) {
      case '&':
        out_ += "&amp;";
        break;
      case '<':
        out_ += "&lt;";
        break;
      case '>':
        out_ += "&gt;";
        break;
      case '\r':
        out_ += "&#13;";  // a bare one would be read back as a line feed
        break;
      default:
        out_ += character;
    }
  }

  static std::string realText(const ValueView& value) {
    const double number = value.asDouble();
    if (std::isnan(number)) return "nan";
    if (std::isinf(number)) return number > 0 ? "+infinity" : "-infinity";
    return description(value);
  }

  bool writeDate(Date date) {
    const auto calendar = calendarDate(std::floor(date.epochSeconds));
    if (!calendar) return false;
    std::string text;
    appendDateAndTime(text, *calendar, 'T');
    text += 'Z';
    return element("date", text);
  }

  bool writeData(std::string_view bytes) {
    out_ += "<data>";
    appendBase64(out_, bytes);
    out_ += "</data>\n";
    return true;
  }

  bool writeArray(const Array& array, std::size_t depth) {
    if (array.empty()) {
      out_ += "<array/>\n";
      return true;
    }
    out_ += "<array>\n";
    for (const ValueView item : array) {
      if (!write(item, depth + 1)) return false;
    }
    indent(depth);
    out_ += "</array>\n";
    return true;
  }

  bool writeDictionary(const Dictionary& dictionary, std::size_t depth) {
    if (dictionary.empty()) {
      out_ += "<dict/>\n";
      return true;
    }
    out_ += "<dict>\n";
    for (const auto& [key, value] : dictionary) {
      indent(depth + 1);
      if (!element("key", key.text()) || !write(value, depth + 1)) return false;
    }
    indent(depth);
    out_ += "</dict>\n";
    return true;
  }

  std::string& out_;
};

}  // namespace

std::optional<std::string> xmlPropertyList(const ValueView& value) {
  std::string xml(kOpening);
  if (!XmlWriter(xml).write(value, 0)) return std::nullopt;
  xml += kClosing;
  return xml;
}

}  // namespace tarn::plist
