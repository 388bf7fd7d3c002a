// SPDX-License-Identifier: Apache-2.0
// VocabularyNames: the names that a script may write for categories, types and service types.
//
// The vocabulary's parsers answer every text, an unknown one with a value that a known name has as well. Here the two
// are told apart: only what a parser's own table holds counts. So "Unknown" is a category, "Generic" a type and
// "unknown" a service type, while "Tessels", "MemoryLog", "Undefined" and domain-prefixed names, which only the
// printers write, are no names.
//
// Stateless. Threads: any.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tarn::script {

// A constant; it asks the vocabulary each time.
class NameTable {
 public:
  // The vocabulary's two directions, with its enumeration as a bare number.
  using Parser = std::uint64_t (*)(std::string_view name);
  using Printer = std::string (*)(std::uint64_t number);

  // `fallbackName` is the known name of the number that unknown texts are parsed to.
  constexpr NameTable(Parser parser, Printer printer, std::string_view fallbackName)
      : parser_(parser), printer_(printer), fallbackName_(fallbackName) {}

  // Nothing for a name that the parser doesn't hold.
  std::optional<std::uint64_t> numberOf(std::string_view name) const;
  // All names, for a complaint: "Generic, Record, ...". In the order of their numbers, the one that unknown texts parse
  // to included.
  std::string listed() const;

 private:
  Parser parser_;
  Printer printer_;
  std::string_view fallbackName_;
};

// For the members "category", "type" and "serviceType" of a line.
const NameTable& categoryNames();
const NameTable& typeNames();
const NameTable& serviceTypeNames();

}  // namespace tarn::script
