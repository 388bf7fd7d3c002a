// XmlScanner: the marks of an XML document, one after the other: tags, texts, and what lies between them. It knows no
// property list. Internal to plist/.
//
// Every operation says whether it worked; after the first fault none does.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace tarn::plist::detail {

class XmlScanner {
 public:
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
  bool failed() const noexcept { return !fault_.empty(); }
  const std::string& fault() const noexcept { return fault_; }
  std::size_t line() const;

 private:
  std::string_view rest() const noexcept { return text_.substr(at_); }
  void skipBlanks() noexcept;
  bool skipPast(std::string_view begin, std::string_view end);
  bool skipDeclaration();
  bool skipDocumentType();
  bool skipQuoted();
  bool readSection(std::string& text);
  bool readEntity(std::string& text);
  bool readCharacter(std::string& text);

  const std::string_view text_;
  std::size_t at_ = 0;
  std::string fault_;
};

// Whether the character is one of XML's four blanks.
constexpr bool isXmlBlank(char character) {
  return character == ' ' || character == '\t' || character == '\n' || character == '\r';
}

}  // namespace tarn::plist::detail
