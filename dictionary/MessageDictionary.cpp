// SPDX-License-Identifier: Apache-2.0
#include "dictionary/MessageDictionary.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <system_error>

namespace tarn::dictionary {

namespace {

// Whether the name is the pattern with a text in the place of each *.
bool standsFor(std::string_view pattern, std::string_view name) noexcept {
  const std::size_t star = pattern.find('*');
  if (star == std::string_view::npos) return pattern == name;
  if (!name.starts_with(pattern.substr(0, star))) return false;
  const std::string_view rest = pattern.substr(star + 1);
  for (std::size_t begin = star + 1; begin <= name.size(); ++begin) {
    if (standsFor(rest, name.substr(begin))) return true;
  }
  return false;
}

}  // namespace

const NamedNumber* rowOf(std::span<const NamedNumber> rows, std::uint32_t number) noexcept {
  const auto found =
      std::find_if(rows.begin(), rows.end(), [&](const NamedNumber& row) { return row.number == number; });
  return found != rows.end() ? &*found : nullptr;
}

const MessageKey* keyOf(std::string_view name) noexcept {
  const std::span<const MessageKey> all = keys();
  auto found = std::find_if(all.begin(), all.end(), [&](const MessageKey& key) { return key.name == name; });
  if (found == all.end()) {
    found = std::find_if(all.begin(), all.end(), [&](const MessageKey& key) { return standsFor(key.name, name); });
  }
  return found != all.end() ? &*found : nullptr;
}

bool lists(std::string_view list, std::string_view name) noexcept {
  constexpr std::string_view kBetween = ", ";
  while (!list.empty()) {
    const std::size_t end = std::min(list.find(kBetween), list.size());
    if (list.substr(0, end) == name) return true;
    list.remove_prefix(std::min(end + kBetween.size(), list.size()));
  }
  return false;
}

std::string_view nameOf(KeyKind kind) noexcept {
  switch (kind) {
    case KeyKind::Boolean:
      return "boolean";
    case KeyKind::Integer:
      return "integer";
    case KeyKind::Number:
      return "number";
    case KeyKind::Text:
      return "text";
    case KeyKind::Any:
      break;
  }
  return "any";
}

std::string rangeOf(const MessageKey& key) {
  if (key.greatest == kUnbounded) return {};
  return numberText(key.least) + " to " + numberText(key.greatest);
}

std::string measureOf(const MessageKey& key) {
  std::string text(nameOf(key.kind));
  for (const std::string& more : {std::string(key.unit), rangeOf(key)}) {
    text += more.empty() ? "" : ", " + more;
  }
  return text;
}

std::string numberText(double number) {
  constexpr double kExact = 1e15;
  if (std::abs(number) < kExact && number == std::trunc(number)) {
    return std::to_string(static_cast<std::int64_t>(number));
  }
  std::array<char, 32> buffer{};
  const auto [end, error] = std::to_chars(buffer.data(), buffer.data() + buffer.size(), number);
  return error == std::errc() ? std::string(buffer.data(), end) : std::string();
}

}  // namespace tarn::dictionary
