// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/MessageLint.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <utility>

#include "dictionary/MessageDictionary.h"
#include "plist/ValueView.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "tools/ctl/SimilarNames.h"

namespace tarn::ctl {

namespace {

using dictionary::KeyKind;
using dictionary::MessageKey;
using plist::Kind;
using plist::ValueView;

constexpr std::uint32_t kDomainMask = 0xFFFF0000U;
constexpr std::string_view kEpochSeconds = "s since 1970";
constexpr std::string_view kScalar = "scalar";
constexpr std::string_view kHertz = "Hz";
constexpr double kLeastHertz = 1000;

std::string quoted(std::string_view text) {
  return "\"" + std::string(text) + "\"";
}

std::string_view nameOf(Kind kind) {
  switch (kind) {
    case Kind::Bool:
      return "a boolean";
    case Kind::Signed:
    case Kind::Unsigned:
      return "an integer";
    case Kind::Float:
    case Kind::Double:
      return "a number";
    case Kind::Date:
      return "a date";
    case Kind::Text:
      return "a text";
    case Kind::Data:
      return "data";
    case Kind::Array:
      return "an array";
    case Kind::Dictionary:
      return "a dictionary";
    case Kind::None:
      break;
  }
  return "nothing";
}

bool isInteger(const ValueView& value) {
  return value.kind() == Kind::Signed || value.kind() == Kind::Unsigned;
}

bool isOfKind(const MessageKey& key, const ValueView& value) {
  switch (key.kind) {
    case KeyKind::Boolean:
      return value.kind() == Kind::Bool || (isInteger(value) && (value.asDouble() == 0 || value.asDouble() == 1));
    case KeyKind::Integer:
      return isInteger(value);
    case KeyKind::Number:
      return (value.isNumber() && value.kind() != Kind::Bool) ||
             (value.kind() == Kind::Date && key.unit == kEpochSeconds);
    case KeyKind::Text:
      return value.isText();
    case KeyKind::Any:
      break;
  }
  return true;
}

// What a number that is out of its range may have been meant as; empty when there is no guess.
std::string guessOf(const MessageKey& key, double number) {
  if (key.unit == kScalar && number > 1 && number <= 100) {
    return "; is it per cent? that would be " + dictionary::numberText(number / 100);
  }
  if (key.unit == kScalar && number < 0) return "; is it in decibels?";
  if ((key.unit == kEpochSeconds || key.unit == "s") && number > key.greatest) {
    return "; is it in milliseconds? that would be " + dictionary::numberText(number / 1000);
  }
  return {};
}

// A rate that is written as a text.
std::optional<std::string> hertzFinding(const MessageKey& key, std::string_view text) {
  double hertz = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), hertz);
  const std::string lead = "key " + quoted(key.name) + " is " + quoted(text);
  if (error != std::errc() || end != text.data() + text.size()) {
    return lead + ": wrong unit, expected a number of Hz in a text, such as \"16000.0\"";
  }
  if (hertz >= 1 && hertz < kLeastHertz) {
    return lead + ": wrong unit, expected Hz; is it in kHz? that would be " +
           quoted(dictionary::numberText(hertz * 1000) + ".0");
  }
  return std::nullopt;
}

// The text that means something and differs from this one in its case alone.
std::optional<std::string> caseFinding(const MessageKey& key, std::string_view text) {
  std::string_view rest = key.values;
  while (!rest.empty() && !dictionary::lists(key.values, text)) {
    const std::string_view each = rest.substr(0, rest.find(", "));
    if (folded(each) == folded(text)) {
      return "key " + quoted(key.name) + " is " + quoted(text) + ": what means something is " + quoted(each);
    }
    rest.remove_prefix(std::min(each.size() + 2, rest.size()));
  }
  return std::nullopt;
}

std::optional<std::string> valueFinding(const MessageKey& key, const ValueView& value) {
  const std::string lead = "key " + quoted(key.name) + " is ";
  if (!isOfKind(key, value)) {
    return lead + std::string(nameOf(value.kind())) + ": wrong kind, expected " + dictionary::measureOf(key);
  }
  if (value.isText()) return key.unit == kHertz ? hertzFinding(key, value.text()) : caseFinding(key, value.text());
  const double number = value.asDouble();
  if (key.kind != KeyKind::Integer && key.kind != KeyKind::Number) return std::nullopt;
  if (number >= key.least && number <= key.greatest) return std::nullopt;
  return lead + dictionary::numberText(number) + ": wrong unit or out of range, expected " +
         dictionary::measureOf(key) + guessOf(key, number);
}

// Where a key stands.
struct Place {
  bool isConfiguration = false;
  std::uint32_t category = 0;
  std::uint16_t type = 0;
};

bool isReadIn(const MessageKey& key, const Place& place) {
  if (key.readers.empty() || (place.isConfiguration ? !key.inConfigurations : !key.inMessages)) return false;
  if (place.isConfiguration || key.onlyIn.empty()) return true;
  const dictionary::NamedNumber* category = dictionary::rowOf(dictionary::categories(), place.category);
  const std::string categoryName(category != nullptr ? category->name : "");
  const std::string type(TarnReportingUtilityTypeString(static_cast<AudioEventType>(place.type)));
  return dictionary::lists(key.onlyIn, categoryName + "." + type) || dictionary::lists(key.onlyIn, "*." + type) ||
         dictionary::lists(key.onlyIn, categoryName + ".*");
}

// The key that somebody reads here and that this one was likely meant to be.
std::optional<std::string> likelyFinding(std::string_view name, const Place& place) {
  for (const MessageKey& key : dictionary::keys()) {
    if (!isReadIn(key, place)) continue;
    if (withoutUnit(name) == withoutUnit(key.name)) {
      return "no part reads the key " + quoted(name) + ": wrong unit? there is " + quoted(key.name) + " (" +
             dictionary::measureOf(key) + ")";
    }
    if (areSimilar(name, key.name)) {
      return "no part reads the key " + quoted(name) + ", did you mean " + quoted(key.name) + "?";
    }
  }
  return std::nullopt;
}

// They are clients, so whoever sends what they send does as they do.
constexpr std::string_view kAdapters = "StreamAdapters";

std::optional<std::string> unreadFinding(std::string_view name, const MessageKey* key, const Place& place,
                                         bool ownKeysAreFine) {
  const bool isOfPlace = key != nullptr && (place.isConfiguration ? key->inConfigurations : key->inMessages);
  if (isOfPlace && key->readers.empty() && key->writers == kAdapters) {
    if (ownKeysAreFine) return std::nullopt;
    return "no part reads the key " + quoted(name) + ": it is there for people to read (" + std::string(kAdapters) +
           ")";
  }
  if (isOfPlace && key->readers.empty()) {
    return "no part reads the key " + quoted(name) + ": the service writes it itself (" + std::string(key->writers) +
           ")";
  }
  if (!isOfPlace) {
    if (auto likely = likelyFinding(name, place)) return likely;
  }
  if (ownKeysAreFine) return std::nullopt;
  if (isOfPlace) return "no part reads the key " + quoted(name) + " here, only in " + std::string(key->onlyIn);
  if (key != nullptr && (key->inMessages || key->inConfigurations) && !key->readers.empty()) {
    return "no part reads the key " + quoted(name) + " here, only in " +
           (key->inMessages ? "messages" : "configurations");
  }
  return "no part reads the key " + quoted(name);
}

void checkKeys(const plist::Dictionary& values, const Place& place, bool ownKeysAreFine,
               std::vector<std::string>& found) {
  for (const auto& entry : values) {
    // As the intake does.
    std::string name(entry.key.text());
    std::replace(name.begin(), name.end(), ' ', '_');
    const MessageKey* key = dictionary::keyOf(name);
    auto finding = key != nullptr && isReadIn(*key, place) ? valueFinding(*key, entry.value)
                                                           : unreadFinding(name, key, place, ownKeysAreFine);
    if (finding) {
      found.push_back(std::move(*finding));
    }
  }
}

void checkNumber(std::string_view what, std::span<const dictionary::NamedNumber> rows, std::uint32_t number,
                 std::vector<std::string>& found) {
  if (dictionary::rowOf(rows, number) == nullptr) {
    found.push_back("there is no " + std::string(what) + " " + std::to_string(number));
  }
}

void checkCategory(std::uint32_t category, std::vector<std::string>& found) {
  const std::uint32_t domain = category & kDomainMask;
  const bool hasDomain = domain != 0 && dictionary::rowOf(dictionary::categories(), category) == nullptr;
  const std::uint32_t proper = hasDomain ? category & ~kDomainMask : category;
  if (hasDomain) {
    checkNumber("domain of categories", dictionary::domains(), domain, found);
  }
  if (proper == 0) {
    found.emplace_back("a category 0 is none: it is printed as Undefined");
  } else {
    checkNumber("category", dictionary::categories(), proper, found);
  }
}

}  // namespace

std::vector<std::string> MessageLint::findings(const script::ScriptStep& step) const {
  std::vector<std::string> found;
  if (step.kind != script::ScriptStep::Kind::Request) return found;
  const wire::Request& request = step.request;
  if (request.operation == wire::Operation::SetServiceType) {
    checkNumber("service type", dictionary::serviceTypes(), request.serviceType, found);
  } else if (request.operation == wire::Operation::SetConfiguration) {
    checkKeys(request.dictionary, {.isConfiguration = true}, ownKeysAreFine_, found);
  } else if (request.operation == wire::Operation::SendMessage) {
    checkCategory(request.category, found);
    checkNumber("type", dictionary::types(), request.type, found);
    checkKeys(request.dictionary, {.category = request.category, .type = request.type}, ownKeysAreFine_, found);
  }
  return found;
}

}  // namespace tarn::ctl
