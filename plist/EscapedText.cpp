#include "plist/EscapedText.h"

#include <cstddef>

#include "plist/Hex.h"

namespace tarn::plist {

namespace {

void appendControl(std::string& out, char character) {
  switch (character) {
    case '\b':
      out += "\\b";
      return;
    case '\f':
      out += "\\f";
      return;
    case '\n':
      out += "\\n";
      return;
    case '\r':
      out += "\\r";
      return;
    case '\t':
      out += "\\t";
      return;
    default:
      out += "\\u00";
      appendHex(out, character);
  }
}

bool isControl(char character) {
  return static_cast<unsigned char>(character) < 0x20;
}

template <class NeedsEscape, class AppendEscape>
void appendEscaped(std::string& out, std::string_view text, NeedsEscape needsEscape, AppendEscape appendEscape) {
  std::size_t begin = 0;
  for (std::size_t at = 0; at < text.size(); ++at) {
    if (needsEscape(text[at])) [[unlikely]] {
      out.append(text, begin, at - begin);
      appendEscape(text[at]);
      begin = at + 1;
    }
  }
  out.append(text, begin);
}

}  // namespace

void appendEscapedControls(std::string& out, std::string_view text) {
  appendEscaped(out, text, isControl, [&](char character) { appendControl(out, character); });
}

void appendJsonText(std::string& out, std::string_view text) {
  out += '"';
  appendEscaped(
      out, text, [](char character) { return isControl(character) || character == '"' || character == '\\'; },
      [&](char character) {
        if (isControl(character)) {
          appendControl(out, character);
        } else {
          out += '\\';
          out += character;
        }
      });
  out += '"';
}

}  // namespace tarn::plist
