// SPDX-License-Identifier: Apache-2.0
// Key: the name of a dictionary entry, stored once for the whole process.
//
// Messages repeat a few hundred names without end. A Key is a counted handle on the one copy of its text, so that a
// dictionary stores eight bytes a name, two keys compare by address, and a name that nobody uses any more is forgotten.
//
// Threads: any. Interning takes a lock; copying, comparing and reading do not.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string_view>

namespace tarn::plist {

namespace detail {
struct KeyText;
}

// A handle of eight bytes. Equal texts have one address, so comparing keys never looks at a character. A key that was
// moved from may only be assigned to or destroyed.
class Key {
 public:
  // Interns `text` (UTF-8; may hold any byte, NUL included): a look into the table under its lock, and an allocation
  // when it is new. On paths that come often, a key is made once and kept; Dictionary::get() takes texts as they are.
  // Throws std::bad_alloc.
  Key(std::string_view text);                             // NOLINT(google-explicit-constructor): a name is a key
  Key(const char* text) : Key(std::string_view(text)) {}  // NOLINT(google-explicit-constructor)
  Key(const Key& other) noexcept;
  Key(Key&& other) noexcept : text_(other.text_) { other.text_ = nullptr; }
  Key& operator=(Key other) noexcept;
  ~Key();

  // As long as any key of this text lives.
  std::string_view text() const noexcept;
  // Hash of the text; the same for equal texts in one run, another one in the next: nothing is ever stored by it.
  std::uint64_t hash() const noexcept;
  // Whether the text holds a blank (U+0020), found out once when the text was interned.
  bool hasBlank() const noexcept;

  friend bool operator==(const Key& a, const Key& b) noexcept { return a.text_ == b.text_; }

  // The hash that a key of this text has, without interning it. Seeded, so that nobody outside can prepare texts that
  // collide.
  static std::uint64_t hashOf(std::string_view text) noexcept;

 private:
  friend class KeyList;
  // Takes over one reference.
  explicit Key(detail::KeyText* text) noexcept : text_(text) {}

  // One reference held; null after a move.
  detail::KeyText* text_;
};

}  // namespace tarn::plist

template <>
// For tables by key; costs a load.
struct std::hash<tarn::plist::Key> {
  std::size_t operator()(const tarn::plist::Key& key) const noexcept { return key.hash(); }
};
