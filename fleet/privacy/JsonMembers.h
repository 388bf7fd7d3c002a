// SPDX-License-Identifier: Apache-2.0
// JsonMembers: goes over the members of a JSON object in its text, without making anything of them. Values are handed
// on as they stand there, so what leaves is what was recorded, to the last digit.
//
//   JsonMembers members(text);
//   while (members.next()) use(members.key(), members.value());
//   if (members.failed()) ...  // the text isn't one object
//
// Threads: one at a time. The text outlives it. It allocates nothing.
#pragma once

#include <cstddef>
#include <string_view>

namespace tarn::fleet {

class JsonMembers {
 public:
  explicit JsonMembers(std::string_view text) : text_(text) {}

  // To the next member; false at the end, and where the text isn't what it should be.
  bool next();
  bool failed() const noexcept { return failed_; }
  // Without its quotes, escapes as they are.
  std::string_view key() const noexcept { return key_; }
  // As it stands there, a text with its quotes.
  std::string_view value() const noexcept { return value_; }

 private:
  bool fail() noexcept;
  char at(std::size_t place) const noexcept { return place < text_.size() ? text_[place] : '\0'; }
  void passBlanks() noexcept;
  bool passText() noexcept;
  bool passValue() noexcept;
  bool passNested() noexcept;
  bool passPlain() noexcept;
  bool atEnd() noexcept;

  std::string_view text_;
  std::size_t place_ = 0;
  std::string_view key_;
  std::string_view value_;
  bool begun_ = false;
  bool failed_ = false;
};

}  // namespace tarn::fleet
