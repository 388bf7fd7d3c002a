// SPDX-License-Identifier: Apache-2.0
// JsonLine: one JSON object on a line, which its end finishes. Threads: one.
#pragma once

#include <array>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <string>
#include <string_view>

#include "plist/EscapedText.h"

namespace tarn::fleet {

class JsonLine {
 public:
  JsonLine(std::string& out, std::string_view kind) : out_(out) { text("kind", kind); }
  ~JsonLine() { out_ += "}\n"; }
  JsonLine(const JsonLine&) = delete;
  JsonLine& operator=(const JsonLine&) = delete;

  void text(std::string_view key, std::string_view value) {
    begin(key);
    plist::appendJsonText(out_, value);
  }
  void number(std::string_view key, double value) {
    std::array<char, 32> digits{};
    const auto end = std::to_chars(digits.begin(), digits.end(), value).ptr;
    raw(key, std::isfinite(value) ? std::string_view(digits.data(), static_cast<std::size_t>(end - digits.begin()))
                                  : std::string_view("null"));
  }
  void number(std::string_view key, std::int64_t value) { raw(key, std::to_string(value)); }
  // JSON already.
  void raw(std::string_view key, std::string_view value) {
    begin(key);
    out_ += value;
  }

 private:
  void begin(std::string_view key) {
    out_ += isFirst_ ? "{" : ",";
    isFirst_ = false;
    plist::appendJsonText(out_, key);
    out_ += ':';
  }

  std::string& out_;
  bool isFirst_ = true;
};

}  // namespace tarn::fleet
