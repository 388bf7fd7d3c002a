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

}  // namespace tarn::plist
