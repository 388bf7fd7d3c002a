// SPDX-License-Identifier: Apache-2.0
// Markup: writes a page that is HTML and well-formed XML at once, so that a browser and a strict parser read the same.
//
// Texts and values of attributes may hold anything: what would be taken for markup is escaped, and what a page may not
// hold or a reader couldn't see (controls, marks that turn the direction of writing, bytes that aren't UTF-8) is
// written out as a backslash, u and hexadecimal digits. Names of elements and attributes are the program's own. Owner:
// who makes a page. Threads: one at a time.
//
//   markup.open("p", {{"class", "note"}}).text("a < b").close();
#pragma once

#include <cstddef>
#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace tarn::report {

struct Attribute {
  const char* name;
  std::string value;
};
using Attributes = std::initializer_list<Attribute>;

class Markup {
 public:
  Markup() = default;
  Markup(const Markup&) = delete;
  Markup& operator=(const Markup&) = delete;

  // An element that is open until its close(); `name` is a literal.
  Markup& open(const char* name, Attributes attributes = {});
  // Ends the element that was opened last.
  Markup& close();
  Markup& text(std::string_view text);
  // A whole element with a text in it, which may be empty.
  Markup& element(const char* name, Attributes attributes, std::string_view text);
  // An element that has no content by its kind: meta, rect, path.
  Markup& empty(const char* name, Attributes attributes);
  // Markup of the program's own, as it stands: the document type, a style sheet, a part that a Markup has made.
  Markup& literal(std::string_view markup);
  Markup& line() { return literal("\n"); }

  // How many elements are open, and what was written so far.
  std::size_t depth() const noexcept { return open_.size(); }
  std::size_t size() const noexcept { return out_.size(); }
  const std::string& written() const noexcept { return out_; }

 private:
  void tag(const char* name, Attributes attributes);

  std::string out_;
  std::vector<const char*> open_;
};

// Appends the text so that it stands for itself, between tags and in quotes.
void appendEscaped(std::string& out, std::string_view text);

}  // namespace tarn::report
