// SPDX-License-Identifier: Apache-2.0
#include "tests/scenario/Notation.h"

#include <algorithm>
#include <map>
#include <stdexcept>
#include <string_view>
#include <vector>

namespace tarn::scenario {

namespace {

constexpr std::string_view kTextOf = "text of ";
constexpr std::string_view kWholeFrom = "whole from ";

// What depends on the machine, the load or the processes' numbers, by the name of the member.
const std::map<std::string, std::string, std::less<>> kByMember = {
    {"thermal_state", "<Nominal|Fair|Serious|Critical|Unknown>"},
    {"low_power_enabled", "<true|false>"},
    {"vmInfo_phys_footprint_MiB", "<whole>"},
    {"load_avg_1_min", "<number>"},
    {"load_avg_5_min", "<number>"},
    {"load_avg_15_min", "<number>"},
    {"hierarchyToken", "<text>"},
    {"processIDs", "<whole>"},
    {"seconds", "<whole>"},
    {"session", "<text>"},
};

std::vector<std::string> partsOf(const std::string& text, char separator) {
  std::vector<std::string> parts(1);
  for (const char character : text) {
    if (character == separator) {
      parts.emplace_back();
    } else {
      parts.back() += character;
    }
  }
  return parts;
}

bool isNotation(const std::string& text) {
  return text.size() > 2 && text.front() == '<' && text.back() == '>' && text.find(',') == std::string::npos;
}

// The value that a text spells; the text itself when it spells none.
json spelled(const std::string& text) {
  json value = json::parse(text, nullptr, false);
  return value.is_discarded() ? json(text) : value;
}

bool isOneOf(const std::string& alternatives, const json& value) {
  const std::string text = value.is_string() ? value.get<std::string>() : value.dump();
  for (const std::string& part : partsOf(alternatives, '|')) {
    if (part == text) return true;
  }
  return false;
}

// Whether a value is what "<meaning>" stands for. Throws std::runtime_error when that stands for nothing.
bool holds(const std::string& meaning, const json& value, const Playing& playing) {
  const bool isNumber = value.is_number() && value >= 0;
  if (meaning == "any") return true;
  if (meaning.starts_with('=')) return value == meaning.substr(1);
  if (meaning == "now") return value.is_number() && playing.contains(value.get<double>());
  if (meaning == "number") return isNumber;
  if (meaning == "whole" || meaning.starts_with("session ")) return isNumber && value.is_number_integer();
  if (meaning.starts_with(kWholeFrom)) {
    return value.is_number_integer() && value >= spelled(meaning.substr(kWholeFrom.size()));
  }
  if (meaning == "text") return value.is_string() && value != "";
  if (meaning.starts_with(kTextOf)) {
    const json inner = value.is_string() ? spelled(value.get<std::string>()) : json();
    return holds(meaning.substr(kTextOf.size()), inner, playing) && value.is_string();
  }
  if (meaning.find('|') != std::string::npos) return isOneOf(meaning, value);
  throw std::runtime_error("\"<" + meaning + ">\" means nothing");
}

std::string inside(const std::string& notation) {
  return notation.substr(1, notation.size() - 2);
}

bool matchesText(const std::string& expected, const json& found, const Playing& playing) {
  if (isNotation(expected)) return holds(inside(expected), found, playing);
  if (!found.is_string()) return false;
  const auto wanted = partsOf(expected, ',');
  const auto parts = partsOf(found.get<std::string>(), ',');
  if (wanted.size() != parts.size()) return false;
  for (std::size_t index = 0; index < parts.size(); ++index) {
    const bool matches = isNotation(wanted[index]) ? holds(inside(wanted[index]), spelled(parts[index]), playing)
                                                   : wanted[index] == parts[index];
    if (!matches) return false;
  }
  return true;
}

std::string differenceOfMembers(const std::string& path, const json& expected, const json& found,
                                const Playing& playing) {
  for (const auto& [key, value] : expected.items()) {
    const std::string inner = std::string(path).append(".").append(key);
    if (!found.contains(key)) return inner + " is missing";
    if (std::string difference = differenceOf(inner, value, found.at(key), playing); !difference.empty()) {
      return difference;
    }
  }
  for (const auto& [key, value] : found.items()) {
    if (!expected.contains(key)) return std::string(path).append(".").append(key) + " is extra: " + value.dump();
  }
  return {};
}

std::string differenceOfItems(const std::string& path, const json& expected, const json& found,
                              const Playing& playing) {
  for (std::size_t index = 0; index < std::min(expected.size(), found.size()); ++index) {
    const std::string inner = path + "[" + std::to_string(index) + "]";
    if (std::string difference = differenceOf(inner, expected[index], found[index], playing); !difference.empty()) {
      return difference;
    }
  }
  return expected.size() == found.size()
             ? std::string()
             : path + " has " + std::to_string(found.size()) + " items, not " + std::to_string(expected.size());
}

// With "<now>" for each part that tells a moment of the playing, and what looks like a notation but is none put in one.
std::string textAsExpectation(const std::string& text, const Playing& playing) {
  std::string written;
  for (const std::string& part : partsOf(text, ',')) {
    const json value = spelled(part);
    const bool isNow = value.is_number() && playing.contains(value.get<double>());
    written += isNow ? ",<now>" : isNotation(part) ? ",<=" + part + ">" : "," + part;
  }
  return written.substr(1);
}

json memberAsExpectation(const std::string& key, const json& found, const Playing& playing) {
  const auto known = kByMember.find(key);
  if (found.is_structured()) {
    json written = found;
    for (auto& [name, value] : written.items()) {
      value = memberAsExpectation(found.is_object() ? name : key, value, playing);
    }
    return written;
  }
  if (found.is_number() && playing.contains(found.get<double>())) return "<now>";
  if (known != kByMember.end()) {
    if (holds(inside(known->second), found, playing)) return known->second;
    const std::string asText = key == "low_power_enabled" ? "<0|1>" : "<text of " + inside(known->second) + ">";
    if (holds(inside(asText), found, playing)) return asText;
  }
  return found.is_string() ? json(textAsExpectation(found.get<std::string>(), playing)) : found;
}

}  // namespace

std::string differenceOf(const std::string& path, const json& expected, const json& found, const Playing& playing) {
  if (expected.is_object() && found.is_object()) return differenceOfMembers(path, expected, found, playing);
  if (expected.is_array() && found.is_array()) return differenceOfItems(path, expected, found, playing);
  const bool matches =
      expected.is_string() ? matchesText(expected.get<std::string>(), found, playing) : expected == found;
  return matches ? std::string() : path + " is " + found.dump() + ", not " + expected.dump();
}

json asExpectation(const json& found, const Playing& playing) {
  return memberAsExpectation("", found, playing);
}

void checkNotation(const json& expected) {
  if (expected.is_structured()) {
    for (const json& inner : expected) {
      checkNotation(inner);
    }
  } else if (expected.is_string()) {
    for (const std::string& part : partsOf(expected.get<std::string>(), ',')) {
      if (isNotation(part)) {
        holds(inside(part), json(), {});
      }
    }
  }
}

}  // namespace tarn::scenario
