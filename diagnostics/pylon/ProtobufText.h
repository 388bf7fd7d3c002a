// SPDX-License-Identifier: Apache-2.0
// ProtobufText: a text rendering for people, in the text format that the Protocol Buffers tools read and print:
//
//   AudioIssueDetected {
//     duration: 2
//     issuetype: "glitch"
//   }
//
// Strings stand in quotes; quotes, backslashes and whatever isn't a printable ASCII character are escaped.
#pragma once

#include <cstddef>
#include <string>

#include "diagnostics/pylon/TextFormatter.h"

namespace pylonmetrics {

// Objects nest, each two blanks further in. Owner: whoever renders. Threads: one formatter is for one thread at a time.
class ProtobufText final : public TextFormatter {
 public:
  void beginObject(std::string_view name) override;
  void formatSigned(std::string_view name, std::int64_t value) override;
  void formatUnsigned(std::string_view name, std::uint64_t value) override;
  // Line feed, carriage return and tab are \n, \r and \t; other bytes that aren't printable are three octal digits.
  void formatString(std::string_view name, std::string_view bytes) override;
  void endObject() override;

  // What was rendered so far; each line ends with a line feed.
  const std::string& text() const noexcept { return text_; }

 private:
  // Indents and writes the name.
  void beginLine(std::string_view name);

  std::string text_;
  std::size_t depth_ = 0;
};

}  // namespace pylonmetrics
