// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/ProtobufText.h"

#include "plist/ValueView.h"

namespace pylonmetrics {

namespace {

void appendEscaped(std::string& out, char character) {
  constexpr unsigned kFirstPrintable = 0x20;
  constexpr unsigned kBeyondPrintable = 0x7f;
  const auto byte = static_cast<unsigned char>(character);
  if (character == '\n') {
    out += "\\n";
  } else if (character == '\r') {
    out += "\\r";
  } else if (character == '\t') {
    out += "\\t";
  } else if (character == '"' || character == '\'' || character == '\\') {
    out += '\\';
    out += character;
  } else if (byte >= kFirstPrintable && byte < kBeyondPrintable) {
    out += character;
  } else {
    out += '\\';
    for (const unsigned shift : {6U, 3U, 0U}) {
      out += static_cast<char>('0' + (byte >> shift & 7U));
    }
  }
}

}  // namespace

void ProtobufText::beginLine(std::string_view name) {
  text_.append(2 * depth_, ' ');
  text_ += name;
}

void ProtobufText::beginObject(std::string_view name) {
  beginLine(name);
  text_ += " {\n";
  ++depth_;
}

void ProtobufText::formatSigned(std::string_view name, std::int64_t value) {
  beginLine(name);
  text_ += ": ";
  tarn::plist::appendNumber(text_, value);
  text_ += '\n';
}

void ProtobufText::formatUnsigned(std::string_view name, std::uint64_t value) {
  beginLine(name);
  text_ += ": ";
  tarn::plist::appendNumber(text_, value);
  text_ += '\n';
}

void ProtobufText::formatString(std::string_view name, std::string_view bytes) {
  beginLine(name);
  text_ += ": \"";
  for (const char character : bytes) {
    appendEscaped(text_, character);
  }
  text_ += "\"\n";
}

void ProtobufText::endObject() {
  --depth_;
  beginLine("}\n");
}

}  // namespace pylonmetrics
