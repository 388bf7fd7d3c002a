// SPDX-License-Identifier: Apache-2.0
#include "plist/Key.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <unordered_map>

#include "plist/Allocation.h"
#include "plist/KeyText.h"
#include "plist/ThreadSafety.h"

namespace tarn::plist {

namespace {

// Seeded by where the program was loaded, so that a client can't prepare names that collide.
std::uint64_t hashSeed() noexcept {
  static const char anchor = 0;
  return static_cast<std::uint64_t>(reinterpret_cast<std::uintptr_t>(&anchor));
}

__extension__ typedef unsigned __int128 Product;  // NOLINT(modernize-use-using): only so is it an extension

// Both halves of the product, folded. The factors hold secrets, so no text makes one of them zero on purpose.
std::uint64_t mix(std::uint64_t a, std::uint64_t b) noexcept {
  const Product product = static_cast<Product>(a) * b;
  return static_cast<std::uint64_t>(product) ^ static_cast<std::uint64_t>(product >> 64U);
}

template <class Word>
std::uint64_t load(const char* at) noexcept {
  Word word;
  std::memcpy(&word, at, sizeof word);
  return word;
}

struct Hasher {
  std::size_t operator()(std::string_view text) const noexcept { return Key::hashOf(text); }
};

// Every text in use, found by itself. A text leaves the table, under its lock, when the last key lets go.
struct Table {
  Mutex mutex;
  std::unordered_map<std::string_view, detail::KeyText*, Hasher> texts TARN_GUARDED_BY(mutex);
};

Table& table() {
  static Table* const instance = new Table;  // never destroyed: keys of static storage outlive everything
  return *instance;
}

detail::KeyText* makeText(std::string_view text) {
  void* memory = detail::allocate(sizeof(detail::KeyText) + text.size());
  auto* made = ::new (memory) detail::KeyText{
      {1}, static_cast<std::uint32_t>(text.size()), Key::hashOf(text), text.find(' ') != std::string_view::npos};
  if (!text.empty()) {
    std::memcpy(made->chars(), text.data(), text.size());
  }
  return made;
}

struct FreeText {
  void operator()(detail::KeyText* text) const noexcept { std::free(text); }
};

}  // namespace

namespace detail {

KeyText* internText(std::string_view text) {
  Table& all = table();
  const MutexLock lock(all.mutex);
  if (const auto found = all.texts.find(text); found != all.texts.end()) {
    found->second->references.fetch_add(1, std::memory_order_relaxed);
    return found->second;
  }
  std::unique_ptr<KeyText, FreeText> made(makeText(text));
  all.texts.emplace(made->text(), made.get());
  return made.release();
}

void releaseText(KeyText* text) noexcept {
  if (text == nullptr || !releaseUnlessLast(text->references)) return;
  // The last reference goes under the lock, so that nobody finds a text that is about to be freed.
  Table& all = table();
  {
    const MutexLock lock(all.mutex);
    if (text->references.fetch_sub(1, std::memory_order_acq_rel) != 1) return;
    all.texts.erase(text->text());
  }
  std::free(text);
}

}  // namespace detail

// Names are mostly 8 to 24 bytes: two overlapping loads and two products, without a tail byte by byte.
std::uint64_t Key::hashOf(std::string_view text) noexcept {
  const std::uint64_t secret = hashSeed() * 0x9FB21C651E98DF25U;
  std::uint64_t hash = secret ^ 0x9E3779B97F4A7C15U;
  const char* at = text.data();
  const std::size_t size = text.size();
  const char* const end = at + size;
  for (; end - at > 16; at += 16) {
    hash = mix(load<std::uint64_t>(at) ^ secret, load<std::uint64_t>(at + 8) ^ hash);
  }
  std::uint64_t first = 0;
  std::uint64_t last = 0;
  if (size >= 8) {
    first = load<std::uint64_t>(size >= 16 ? end - 16 : at);
    last = load<std::uint64_t>(end - 8);
  } else if (size >= 4) {
    first = load<std::uint32_t>(at);
    last = load<std::uint32_t>(end - 4);
  } else if (size > 0) {
    first = load<std::uint8_t>(at) << 16U | load<std::uint8_t>(at + size / 2) << 8U | load<std::uint8_t>(end - 1);
  }
  return mix(secret ^ size, mix(first ^ secret, last ^ hash));
}

Key::Key(std::string_view text) : text_(detail::internText(text)) {}

Key::Key(const Key& other) noexcept : text_(other.text_) {
  if (text_ != nullptr) {
    text_->references.fetch_add(1, std::memory_order_relaxed);
  }
}

Key& Key::operator=(Key other) noexcept {
  std::swap(text_, other.text_);
  return *this;
}

Key::~Key() {
  detail::releaseText(text_);
}

std::string_view Key::text() const noexcept {
  return text_->text();
}

std::uint64_t Key::hash() const noexcept {
  return text_->hash;
}

bool Key::hasBlank() const noexcept {
  return text_->hasBlank;
}

}  // namespace tarn::plist
