// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/XmlScanner.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <utility>

#include "plist/Characters.h"

namespace tarn::plist::detail {

namespace {

constexpr std::size_t kLongestEntity = 12;  // &#x0010FFFF; has that many bytes

// Of the names that matter here; others are faults anyway.
bool isNameCharacter(char character) {
  return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
         (character >= '0' && character <= '9') || character == '-' || character == '_' || character == '.';
}

// The value of an attribute in a declaration's text; empty when it isn't there.
std::string_view attribute(std::string_view declaration, std::string_view name) {
  const std::size_t found = declaration.find(name);
  if (found == std::string_view::npos) return {};
  const std::size_t opening = declaration.find_first_of("\"'", found);
  if (opening == std::string_view::npos) return {};
  const std::size_t closing = declaration.find(declaration[opening], opening + 1);
  if (closing == std::string_view::npos) return {};
  return declaration.substr(opening + 1, closing - opening - 1);
}

bool equalsIgnoringCase(std::string_view text, std::string_view lower) {
  return std::equal(text.begin(), text.end(), lower.begin(), lower.end(),
                    [](char a, char b) { return (a >= 'A' && a <= 'Z' ? static_cast<char>(a - 'A' + 'a') : a) == b; });
}

}  // namespace

bool XmlScanner::fail(std::string text) {
  if (fault_.empty()) {
    fault_ = std::move(text);
  }
  return false;
}

std::size_t XmlScanner::line() const {
  return 1 +
         static_cast<std::size_t>(std::count(text_.begin(), text_.begin() + static_cast<std::ptrdiff_t>(at_), '\n'));
}

void XmlScanner::skipBlanks() noexcept {
  while (at_ < text_.size() && isXmlBlank(text_[at_])) {
    ++at_;
  }
}

// Stands at `begin`.
bool XmlScanner::skipPast(std::string_view begin, std::string_view end) {
  const std::size_t found = text_.find(end, at_ + begin.size());
  if (found == std::string_view::npos) return fail(std::string(begin) + " without " + std::string(end));
  at_ = found + end.size();
  return true;
}

bool XmlScanner::skipDeclaration() {
  const std::size_t begin = at_;
  if (!skipPast("<?xml", "?>")) return false;
  const std::string_view encoding = attribute(text_.substr(begin, at_ - begin), "encoding");
  if (!encoding.empty() && !equalsIgnoringCase(encoding, "utf-8") && !equalsIgnoringCase(encoding, "us-ascii")) {
    return fail("the encoding is not UTF-8");
  }
  return true;
}

bool XmlScanner::skipQuoted() {
  const std::string_view quote = text_.substr(at_, 1);
  return skipPast(quote, quote);
}

// Passed over, declarations in brackets included: what it would define is not there.
bool XmlScanner::skipDocumentType() {
  std::size_t brackets = 0;
  while (at_ < text_.size()) {
    const char character = text_[at_];
    if (character == '"' || character == '\'') {
      if (!skipQuoted()) return false;
      continue;
    }
    if (rest().starts_with("<!--")) {
      if (!skipPast("<!--", "-->")) return false;
      continue;
    }
    ++at_;
    if (character == '[') {
      ++brackets;
    }
    if (character == ']' && brackets > 0) {
      --brackets;
    }
    if (character == '>' && brackets == 0) return true;
  }
  return fail("<!DOCTYPE without its end");
}

bool XmlScanner::skipProlog() {
  if (rest().starts_with("\xEF\xBB\xBF")) {
    at_ += 3;
  }
  if (rest().starts_with("<?xml") && !skipDeclaration()) return false;
  if (!skipMisc()) return false;
  if (rest().starts_with("<!DOCTYPE")) return skipDocumentType() && skipMisc();
  return true;
}

bool XmlScanner::skipMisc() {
  while (true) {
    skipBlanks();
    if (rest().starts_with("<?")) {
      if (!skipPast("<?", "?>")) return false;
    } else if (rest().starts_with("<!--")) {
      if (!skipPast("<!--", "-->")) return false;
    } else {
      return !failed();
    }
  }
}

bool XmlScanner::readStartTag(Tag& tag) {
  if (failed()) return false;
  if (atEnd()) return fail("the end comes too early");
  if (text_[at_] != '<') return fail("text where an element is wanted");
  const std::size_t begin = ++at_;
  while (at_ < text_.size() && isNameCharacter(text_[at_])) {
    ++at_;
  }
  tag.name = text_.substr(begin, at_ - begin);
  const bool isWhole = atEnd() || isXmlBlank(text_[at_]) || text_[at_] == '/' || text_[at_] == '>';
  if (tag.name.empty() || !isWhole) return fail("a tag that can't be read");
  while (at_ < text_.size()) {
    const char character = text_[at_];
    if (character == '<') break;
    if (character == '"' || character == '\'') {
      if (!skipQuoted()) return false;
      continue;
    }
    ++at_;
    if (character == '>') {
      tag.isEmpty = text_[at_ - 2] == '/';
      return true;
    }
  }
  return fail("a tag without its end");
}

bool XmlScanner::readEndTag(std::string_view name) {
  if (failed()) return false;
  if (atEnd()) return fail("the end comes too early");
  if (!atEndTag() || !rest().substr(2).starts_with(name)) return fail("</" + std::string(name) + "> is wanted here");
  at_ += 2 + name.size();
  skipBlanks();
  if (!rest().starts_with(">")) return fail("</" + std::string(name) + "> is wanted here");
  ++at_;
  return true;
}

bool XmlScanner::readText(const Tag& tag, std::string& text) {
  text.clear();
  if (tag.isEmpty) return true;
  while (at_ < text_.size()) {
    if (text_[at_] == '<') {
      if (atEndTag()) return readEndTag(tag.name);
      if (!readSection(text)) return false;
    } else if (!(text_[at_] == '&' ? readEntity(text) : readCharacter(text))) {
      return false;
    }
  }
  return fail("the end comes too early");
}

// A comment or a CDATA section.
bool XmlScanner::readSection(std::string& text) {
  if (rest().starts_with("<!--")) return skipPast("<!--", "-->");
  constexpr std::string_view kBegin = "<![CDATA[";
  if (!rest().starts_with(kBegin)) return fail("an element inside a text");
  const std::size_t end = text_.find("]]>", at_);
  if (end == std::string_view::npos) return fail("<![CDATA[ without ]]>");
  at_ += kBegin.size();
  while (at_ < end) {
    if (!readCharacter(text)) return false;
  }
  at_ = end + 3;
  return true;
}

bool XmlScanner::readEntity(std::string& text) {
  const std::size_t end = rest().substr(0, kLongestEntity).find(';');
  if (end == std::string_view::npos) return fail("& without ;");
  std::string_view name = rest().substr(1, end - 1);
  using Named = std::pair<std::string_view, char>;
  constexpr std::array<Named, 5> kNamed{Named{"amp", '&'}, Named{"lt", '<'}, Named{"gt", '>'}, Named{"quot", '"'},
                                        Named{"apos", '\''}};
  for (const auto& [known, character] : kNamed) {
    if (name == known) {
      text += character;
      at_ += end + 1;
      return true;
    }
  }
  if (!name.starts_with('#')) return fail("an entity that isn't known");
  const bool isHexadecimal = name.starts_with("#x");
  name.remove_prefix(isHexadecimal ? 2 : 1);
  std::uint32_t number = 0;
  const auto [stopped, error] =
      std::from_chars(name.data(), name.data() + name.size(), number, isHexadecimal ? 16 : 10);
  if (error != std::errc() || stopped != name.data() + name.size() || !isXmlCharacter(number)) {
    return fail("an entity that is no character");
  }
  appendCharacter(text, number);
  at_ += end + 1;
  return true;
}

bool XmlScanner::readCharacter(std::string& text) {
  std::string_view left = rest();
  const auto character = takeCharacter(left);
  if (!character || !isXmlCharacter(*character)) return fail("bytes that are no text");
  if (*character == '\r') {
    text += '\n';
    if (left.starts_with('\n')) {
      left.remove_prefix(1);
    }
  } else {
    text.append(rest().substr(0, rest().size() - left.size()));
  }
  at_ = text_.size() - left.size();
  return true;
}

}  // namespace tarn::plist::detail
