// SPDX-License-Identifier: Apache-2.0
// Texts with what would be mistaken escaped: the one place that knows how a control character is written.
//
// Stateless. Threads: any.
#pragma once

#include <string>
#include <string_view>

namespace tarn::plist {

// Appends a JSON text with its quotes; control characters, quotes and backslashes escaped, all else as it is.
void appendJsonText(std::string& out, std::string_view text);
// Appends a text with its control characters escaped as in JSON and all else as it is.
void appendEscapedControls(std::string& out, std::string_view text);

// What becomes of a line end inside a text that people read.
enum class LineEnds {
  Escaped,   // written out like any other control character
  Indented,  // stays, and a tab stands before what follows
  Kept,
};
// Appends a text so that whoever reads it sees what it is: whatever a terminal or a reader of lines would obey is
// written as a backslash, u and four hexadecimal digits: the controls (those of Unicode too), the marks that turn the
// direction of writing, the separators of lines, and bytes that aren't UTF-8. All else stays as it is.
void appendPrintable(std::string& out, std::string_view text, LineEnds lineEnds);

}  // namespace tarn::plist
