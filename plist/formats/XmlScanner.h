// SPDX-License-Identifier: Apache-2.0
// XmlScanner: the marks of an XML document, one after the other: tags, texts, and what lies between them. It knows no
// property list. Internal to plist/.
//
// Every operation says whether it worked; after the first fault none does.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tarn::plist::detail {

// A cursor in a text that it doesn't own. Made for one document and thrown away; it takes time in proportion to the
// text. The operations are called as the reader expects the marks: what else stands there is a fault.
class XmlScanner {
 public:
  // A start tag as it stood there; the name looks into the text.
  struct Tag {
    std::string_view name;
    bool isEmpty = false;  // <name/>: it has no end tag
  };

  // Looks at `text`, which must stay.
  explicit XmlScanner(std::string_view text) : text_(text) {}

  // A byte order mark, the XML declaration, the document type and what else may stand before the first element.
  bool skipProlog();
  // Blanks, comments and processing instructions.
  bool skipMisc();
  // Whether nothing is left.
  bool atEnd() const noexcept { return at_ == text_.size(); }
  bool atEndTag() const noexcept { return rest().starts_with("</"); }
  // <name ...> or <name .../>; attributes are skipped.
  bool readStartTag(Tag& tag);
  // </name>
  bool readEndTag(std::string_view name);
  // The text up to the end tag of the element, and that tag; nothing for an empty one. Entities are resolved, line ends
  // are line feeds, comments left out.
  bool readText(const Tag& tag, std::string& text);

  // Notes the fault at the line that is read; false.
  bool fail(std::string text);
  // The first fault, without its line; empty as long as there is none.
  bool failed() const noexcept { return !fault_.empty(); }
  const std::string& fault() const noexcept { return fault_; }
  // The line that is read, counted from 1. Costs a look at all that was read before, so it is for faults.
  std::size_t line() const;

 private:
  // What isn't read yet.
  std::string_view rest() const noexcept { return text_.substr(at_); }
  void skipBlanks() noexcept;
  // From a mark to another one: comments and processing instructions. False, and a fault, when the second never comes.
  bool skipPast(std::string_view begin, std::string_view end);
  // The parts of the prolog. A document type may have an internal part, whose entities are not taken: no text grows by
  // them.
  bool skipDeclaration();
  bool skipDocumentType();
  bool skipQuoted();
  // Each appends what follows to `text`: a CDATA section (or nothing, of a comment), an entity, one character.
  bool readSection(std::string& text);
  bool readEntity(std::string& text);
  bool readCharacter(std::string& text);

  const std::string_view text_;
  // The byte that is read next.
  std::size_t at_ = 0;
  std::string fault_;
};

// Whether the character is one of XML's four blanks.
constexpr bool isXmlBlank(char character) {
  return character == ' ' || character == '\t' || character == '\n' || character == '\r';
}

}  // namespace tarn::plist::detail
