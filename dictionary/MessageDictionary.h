// SPDX-License-Identifier: Apache-2.0
// MessageDictionary: what can be said to the service and what it says itself, as a table: the names of categories,
// types and service types, the keys that some part reads or writes, and the messages that the service derives.
//
// The table is dictionary/messages.toml; docs/messages.md shows it to people. All of it is constant. Threads: any.
//
// The service doesn't look at it, so a word here changes nothing of what it does: `explain` and `lint` of
// tarnreportingctl do, and the tests, which hold it against the vocabulary and play its examples.
// tools/lint/dictionary.py compares it with the keys that the code names.
#pragma once

#include <cstdint>
#include <limits>
#include <span>
#include <string>
#include <string_view>

namespace tarn::dictionary {

// The greatest value of a key without bounds; the least is minus this.
inline constexpr double kUnbounded = std::numeric_limits<double>::infinity();

// What a value has to be for its readers to make sense of it. A boolean may be given as 0 or 1, a number of epoch
// seconds as a date; the service itself takes any kind.
enum class KeyKind { Boolean, Integer, Number, Text, Any };

// A category, a domain of categories, a type or a service type. `name` is what the vocabulary's printer writes, `text`
// a sentence for people.
struct NamedNumber {
  // As it is on the wire; of a domain all 32 bits, with the low half empty.
  std::uint32_t number;
  std::string_view name;
  std::string_view text;
  bool byName;  // whether the name parses to the number; else only the number will do
};

// Lists are names with ", " between them. A key of messages, of configurations or of both; one that is in neither is
// only in what a worker hands to its back-end.
struct MessageKey {
  std::string_view name;  // a * stands for any text that isn't empty
  // With unit and range it is what a value has to be to mean something to its readers.
  KeyKind kind;
  std::string_view unit;  // empty: none
  // In the unit. Of values beyond it the service makes what it can; only the tools complain.
  double least;
  double greatest;
  // Where it may stand: in what clients send or the service derives, and in what setConfiguration takes.
  bool inMessages;
  bool inConfigurations;
  // The next four lists; what a CATEGORY.TYPE has a * for may be any, and parts are told by their names.
  std::string_view values;   // the texts that mean something; empty: any
  std::string_view onlyIn;   // CATEGORY.TYPE of the messages in which it is read; empty: all
  std::string_view readers;  // empty: nobody reads it
  std::string_view writers;  // empty: only clients write it
  std::string_view text;
  std::string_view derives;  // what becomes of it
};

// A message that the service makes, with an example that the tests play.
struct DerivedMessage {
  std::string_view name;  // CATEGORY.TYPE, or the events of a back-end
  // The part that makes it, and the moment.
  std::string_view by;
  std::string_view when;
  std::string_view text;
  // Without those that the intake adds.
  std::string_view keys;
  // What happens in the example, in a sentence.
  std::string_view exampleText;
  std::string_view script;    // as `tarnreportingctl run` takes it
  std::string_view recorded;  // what the recorder has then, one event a line
};

// Who reads and writes keys: a class, by its name, and a sentence about it.
struct KeyPart {
  std::string_view name;
  std::string_view text;
};

// The rows, in the order of the table. The tables are static: a row and its texts stay as long as the process.
std::span<const NamedNumber> categories();
std::span<const NamedNumber> domains();
std::span<const NamedNumber> types();
std::span<const NamedNumber> serviceTypes();
std::span<const MessageKey> keys();
std::span<const DerivedMessage> derived();
std::span<const KeyPart> parts();

// The row of this number; null when there is none. A pass over the rows.
const NamedNumber* rowOf(std::span<const NamedNumber> rows, std::uint32_t number) noexcept;
// The key of this name, or the one whose pattern stands for it; null when there is none. Of several patterns the first
// in the table. A pass over all keys, which is dear for a service and fine for a tool.
const MessageKey* keyOf(std::string_view name) noexcept;
// Whether the list, names with ", " between them, holds the name. False for an empty list.
bool lists(std::string_view list, std::string_view name) noexcept;
// "boolean", "integer", "number", "text" or "any".
std::string_view nameOf(KeyKind kind) noexcept;
// The least and the greatest value, "0 to 1"; empty when there are no bounds.
std::string rangeOf(const MessageKey& key);
// Kind, unit and range: "number, s, 0 to 10". What it has not is left out.
std::string measureOf(const MessageKey& key);
// A number for people: whole ones without an exponent. Others in the shortest form that reads back the same.
std::string numberText(double number);

}  // namespace tarn::dictionary
