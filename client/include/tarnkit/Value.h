// SPDX-License-Identifier: Apache-2.0
// Value, Dictionary and Array: what messages, configurations and results are made of. Plain data that owns itself.
//
//   tarnkit::Dictionary message{{"volume", 0.5}, {"muted", false}, {"route", "Speaker"}};
//   if (const auto* volume = message.find("volume")) use(volume->as<double>());
//
// Threads: as those of the standard library's containers.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <variant>
#include <vector>

namespace tarnkit {

struct Member;
class Value;

// A moment, as a kind of value of its own: seconds since 1970-01-01 00:00:00 UTC, fractions included.
struct Date {
  double epochSeconds = 0;
};

// Bytes that are no text, any of them.
struct Data {
  std::string bytes;
};

// Values of any kinds, mixed as you like. At most 64 containers may lie in each other on their way to the service.
using Array = std::vector<Value>;

// Values under keys that are all different. Keeps its members in the order in which they were first set, which the
// service keeps, too. A plain list: setting and finding take time in proportion to its size, which for a message is
// small.
class Dictionary {
 public:
  // All made below, where a member is known whole.
  Dictionary();
  Dictionary(const Dictionary& other);
  Dictionary(Dictionary&& other) noexcept;
  Dictionary& operator=(const Dictionary& other);
  Dictionary& operator=(Dictionary&& other) noexcept;
  ~Dictionary();
  // As in the example above. Of a key given twice the later value stands at the earlier place.
  Dictionary(std::initializer_list<Member> members);

  // Sets the value under the key, in its place when it is there, else after all others. Keys are UTF-8; the service
  // refuses a message with others.
  void set(std::string key, Value value);
  // The value under the key, null when there is none. Valid until the next change. Upper and lower case count.
  const Value* find(std::string_view key) const noexcept;
  // How many members there are; costs nothing.
  std::size_t size() const noexcept;
  bool empty() const noexcept { return size() == 0; }
  // The members in their order, each with `key` and `value`; valid until the next change.
  std::vector<Member>::const_iterator begin() const noexcept;
  std::vector<Member>::const_iterator end() const noexcept;

 private:
  // Keys that are all different.
  std::vector<Member> members_;
};

// One value, with a copy of everything in it. There is no value that stands for nothing: a member that isn't known is
// left out. A Value made of a literal is text, not bool.
class Value {
 public:
  // What a value may be. Integers of the service come as std::int64_t where they fit, else as std::uint64_t; floats
  // come as they were sent, in 32 or 64 bits.
  using Held =
      std::variant<bool, std::int64_t, std::uint64_t, float, double, Date, std::string, Data, Array, Dictionary>;

  // The constructors are implicit: whatever is one of these can be handed over as a value. Integers of all types are
  // held in 64 bits. Texts are UTF-8, which the service checks; a const char* ends at its zero and must not be null.
  // NOLINTBEGIN(google-explicit-constructor)
  // Only of a bool itself: no pointer and no number turns into one.
  template <std::same_as<bool> Bool>
  Value(Bool value) : held_(value) {}
  // A char counts as a number, too.
  template <std::signed_integral Number>
  Value(Number value) : held_(std::in_place_type<std::int64_t>, value) {}
  template <std::unsigned_integral Number>
  requires(!std::same_as<Number, bool>) Value(Number value) : held_(std::in_place_type<std::uint64_t>, value) {}
  // Kept in its own width, 32 bits.
  Value(float value) : held_(value) {}
  Value(double value) : held_(value) {}
  Value(Date value) : held_(value) {}
  // Of a copy that the caller can give up by std::move().
  Value(std::string text) : held_(std::move(text)) {}
  Value(std::string_view text) : held_(std::string(text)) {}
  Value(const char* text) : held_(std::string(text)) {}
  Value(Data value) : held_(std::move(value)) {}
  Value(Array value) : held_(std::move(value)) {}
  Value(Dictionary value) : held_(std::move(value)) {}
  // NOLINTEND(google-explicit-constructor)

  // For std::visit().
  const Held& held() const noexcept { return held_; }
  // What it holds, null when that is of another type: as<double>() of an integer is null. Valid as long as the value
  // stays as it is.
  template <class Type>
  const Type* as() const noexcept {
    return std::get_if<Type>(&held_);
  }

 private:
  // Never without a value, since moving from a Value leaves one of the same type.
  Held held_;
};

// What a dictionary holds, and what its literals are made of.
struct Member {
  std::string key;
  Value value;
};

inline Dictionary::Dictionary() = default;
inline Dictionary::Dictionary(const Dictionary& other) = default;
inline Dictionary::Dictionary(Dictionary&& other) noexcept = default;
inline Dictionary& Dictionary::operator=(const Dictionary& other) = default;
inline Dictionary& Dictionary::operator=(Dictionary&& other) noexcept = default;
inline Dictionary::~Dictionary() = default;

// What follows needs Member whole, and so stands here.
inline Dictionary::Dictionary(std::initializer_list<Member> members) {
  for (const Member& member : members) {
    set(member.key, member.value);
  }
}

inline void Dictionary::set(std::string key, Value value) {
  for (Member& member : members_) {
    if (member.key == key) {
      member.value = std::move(value);
      return;
    }
  }
  members_.push_back(Member{std::move(key), std::move(value)});
}

inline const Value* Dictionary::find(std::string_view key) const noexcept {
  for (const Member& member : members_) {
    if (member.key == key) return &member.value;
  }
  return nullptr;
}

inline std::size_t Dictionary::size() const noexcept {
  return members_.size();
}

inline std::vector<Member>::const_iterator Dictionary::begin() const noexcept {
  return members_.begin();
}

inline std::vector<Member>::const_iterator Dictionary::end() const noexcept {
  return members_.end();
}

}  // namespace tarnkit
