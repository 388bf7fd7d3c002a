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

// Seconds since 1970-01-01 00:00:00 UTC.
struct Date {
  double epochSeconds = 0;
};

struct Data {
  std::string bytes;
};

using Array = std::vector<Value>;

// Keeps its members in the order in which they were first set.
class Dictionary {
 public:
  // All made below, where a member is known whole.
  Dictionary();
  Dictionary(const Dictionary& other);
  Dictionary(Dictionary&& other) noexcept;
  Dictionary& operator=(const Dictionary& other);
  Dictionary& operator=(Dictionary&& other) noexcept;
  ~Dictionary();
  // Of a key given twice the later value stands at the earlier place.
  Dictionary(std::initializer_list<Member> members);

  void set(std::string key, Value value);
  // The value under the key, null when there is none. Valid until the next change.
  const Value* find(std::string_view key) const noexcept;
  std::size_t size() const noexcept;
  bool empty() const noexcept { return size() == 0; }
  std::vector<Member>::const_iterator begin() const noexcept;
  std::vector<Member>::const_iterator end() const noexcept;

 private:
  std::vector<Member> members_;
};

class Value {
 public:
  // Integers of the service come as std::int64_t where they fit, else as std::uint64_t.
  using Held =
      std::variant<bool, std::int64_t, std::uint64_t, float, double, Date, std::string, Data, Array, Dictionary>;

  // The constructors are implicit: whatever is one of these can be handed over as a value.
  // NOLINTBEGIN(google-explicit-constructor)
  template <std::same_as<bool> Bool>
  Value(Bool value) : held_(value) {}
  template <std::signed_integral Number>
  Value(Number value) : held_(std::in_place_type<std::int64_t>, value) {}
  template <std::unsigned_integral Number>
  requires(!std::same_as<Number, bool>) Value(Number value) : held_(std::in_place_type<std::uint64_t>, value) {}
  Value(float value) : held_(value) {}
  Value(double value) : held_(value) {}
  Value(Date value) : held_(value) {}
  Value(std::string text) : held_(std::move(text)) {}
  Value(std::string_view text) : held_(std::string(text)) {}
  Value(const char* text) : held_(std::string(text)) {}
  Value(Data value) : held_(std::move(value)) {}
  Value(Array value) : held_(std::move(value)) {}
  Value(Dictionary value) : held_(std::move(value)) {}
  // NOLINTEND(google-explicit-constructor)

  const Held& held() const noexcept { return held_; }
  // What it holds, null when that is of another type.
  template <class Type>
  const Type* as() const noexcept {
    return std::get_if<Type>(&held_);
  }

 private:
  Held held_;
};

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
