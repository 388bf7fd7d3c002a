// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Markup.h"

#include <array>
#include <cstdio>
#include <optional>

#include "plist/Characters.h"
#include "plist/EscapedText.h"

namespace tarn::report {

namespace {

// Characters that stand for nothing: a page that holds one is wrong, whichever way it is written.
bool isNoCharacter(char32_t character) {
  return (character & 0xFFFEU) == 0xFFFE || (character >= 0xFDD0 && character <= 0xFDEF) ||
         !plist::isXmlCharacter(character);
}

void appendCharacter(std::string& out, std::string_view bytes, char32_t character) {
  if (isNoCharacter(character)) {
    std::array<char, 16> code{};
    std::snprintf(code.data(), code.size(), "\\u%04x", static_cast<unsigned>(character));
    out += code.data();
    return;
  }
  switch (character) {
    case U'&':
      out += "&amp;";
      return;
    case U'<':
      out += "&lt;";
      return;
    case U'>':
      out += "&gt;";
      return;
    case U'"':
      out += "&quot;";
      return;
    default:
      out += bytes;
  }
}

}  // namespace

void appendEscaped(std::string& out, std::string_view text) {
  std::string printable;
  plist::appendPrintable(printable, text, plist::LineEnds::Escaped);
  std::string_view rest = printable;
  while (!rest.empty()) {
    const std::string_view before = rest;
    const std::optional<char32_t> character = plist::takeCharacter(rest);
    if (!character) return;  // printable texts are UTF-8
    appendCharacter(out, before.substr(0, before.size() - rest.size()), *character);
  }
}

void Markup::tag(const char* name, Attributes attributes) {
  out_ += '<';
  out_ += name;
  for (const Attribute& attribute : attributes) {
    out_ += ' ';
    out_ += attribute.name;
    out_ += "=\"";
    appendEscaped(out_, attribute.value);
    out_ += '"';
  }
}

Markup& Markup::open(const char* name, Attributes attributes) {
  tag(name, attributes);
  out_ += '>';
  open_.push_back(name);
  return *this;
}

Markup& Markup::close() {
  if (open_.empty()) return *this;
  out_ += "</";
  out_ += open_.back();
  out_ += '>';
  open_.pop_back();
  return *this;
}

Markup& Markup::text(std::string_view text) {
  appendEscaped(out_, text);
  return *this;
}

Markup& Markup::element(const char* name, Attributes attributes, std::string_view content) {
  return open(name, attributes).text(content).close();
}

Markup& Markup::empty(const char* name, Attributes attributes) {
  tag(name, attributes);
  out_ += "/>";
  return *this;
}

Markup& Markup::literal(std::string_view markup) {
  out_ += markup;
  return *this;
}

}  // namespace tarn::report
