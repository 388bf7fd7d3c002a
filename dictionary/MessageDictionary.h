// MessageDictionary: what can be said to the service and what it says itself, as a table: the names of categories,
// types and service types, the keys that some part reads or writes, and the messages that the service derives.
//
// The table is dictionary/messages.toml; docs/messages.md shows it to people. All of it is constant. Threads: any.
#pragma once

#include <cstdint>
#include <limits>
#include <span>
#include <string>
#include <string_view>

namespace tarn::dictionary {

inline constexpr double kUnbounded = std::numeric_limits<double>::infinity();

enum class KeyKind { Boolean, Integer, Number, Text, Any };

// A category, a domain of categories, a type or a service type.
struct NamedNumber {
  std::uint32_t number;
  std::string_view name;
  std::string_view text;
  bool byName;  // whether the name parses to the number; else only the number will do
};

// Lists are names with ", " between them.
struct MessageKey {
  std::string_view name;  // a * stands for any text that isn't empty
  KeyKind kind;
  std::string_view unit;  // empty: none
  double least;
  double greatest;
  bool inMessages;
  bool inConfigurations;
  std::string_view values;   // the texts that mean something; empty: any
  std::string_view onlyIn;   // CATEGORY.TYPE of the messages in which it is read; empty: all
  std::string_view readers;  // empty: nobody reads it
  std::string_view writers;  // empty: only clients write it
  std::string_view text;
  std::string_view derives;  // what becomes of it
};

struct DerivedMessage {
  std::string_view name;  // CATEGORY.TYPE, or the events of a back-end
  std::string_view by;
  std::string_view when;
  std::string_view text;
  std::string_view keys;
  std::string_view exampleText;
  std::string_view script;    // as `tarnreportingctl run` takes it
  std::string_view recorded;  // what the recorder has then, one event a line
};

// Who reads and writes keys.
struct KeyPart {
  std::string_view name;
  std::string_view text;
};

std::span<const NamedNumber> categories();
std::span<const NamedNumber> domains();
std::span<const NamedNumber> types();
std::span<const NamedNumber> serviceTypes();
std::span<const MessageKey> keys();
std::span<const DerivedMessage> derived();
std::span<const KeyPart> parts();

// The row of this number; null when there is none.
const NamedNumber* rowOf(std::span<const NamedNumber> rows, std::uint32_t number) noexcept;
// The key of this name, or the one whose pattern stands for it; null when there is none.
const MessageKey* keyOf(std::string_view name) noexcept;
// Whether the list, names with ", " between them, holds the name.
bool lists(std::string_view list, std::string_view name) noexcept;
// "boolean", "integer", "number", "text" or "any".
std::string_view nameOf(KeyKind kind) noexcept;
// The least and the greatest value, "0 to 1"; empty when there are no bounds.
std::string rangeOf(const MessageKey& key);
// Kind, unit and range: "number, s, 0 to 10".
std::string measureOf(const MessageKey& key);
// A number for people: whole ones without an exponent.
std::string numberText(double number);

}  // namespace tarn::dictionary
