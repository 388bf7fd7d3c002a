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

class Key {
 public:
  // Interns `text` (UTF-8; may hold any byte, NUL included).
  Key(std::string_view text);                             // NOLINT(google-explicit-constructor): a name is a key
  Key(const char* text) : Key(std::string_view(text)) {}  // NOLINT(google-explicit-constructor)
  Key(const Key& other) noexcept;
  Key(Key&& other) noexcept : text_(other.text_) { other.text_ = nullptr; }
  Key& operator=(Key other) noexcept;
  ~Key();

  std::string_view text() const noexcept;
  // Hash of the text; the same for equal texts in one run.
  std::uint64_t hash() const noexcept;
  // Whether the text holds a blank (U+0020), found out once when the text was interned.
  bool hasBlank() const noexcept;

  friend bool operator==(const Key& a, const Key& b) noexcept { return a.text_ == b.text_; }

  // The hash that a key of this text has, without interning it.
  static std::uint64_t hashOf(std::string_view text) noexcept;

 private:
  friend class KeyList;
  explicit Key(detail::KeyText* text) noexcept : text_(text) {}

  detail::KeyText* text_;
};

}  // namespace tarn::plist

template <>
struct std::hash<tarn::plist::Key> {
  std::size_t operator()(const tarn::plist::Key& key) const noexcept { return key.hash(); }
};
