// SPDX-License-Identifier: Apache-2.0
#include "tools/script/ScriptParser.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <utility>
#include <vector>

#include "host/system/JsonValues.h"
#include "plist/formats/Json.h"
#include "tools/script/VocabularyNames.h"

namespace tarn::script {

namespace {

using plist::Kind;
using plist::ValueView;

using wire::ArgumentRow;

// What a line that is no request may have.
constexpr std::string_view kSeconds = "seconds";
constexpr double kMaxSleepSeconds = 86400.0 * 365;

// The names that a line may write for the argument's numbers.
const NameTable& namesOf(const ArgumentRow& row) {
  switch (row.argument) {
    case wire::Argument::ServiceType:
      return serviceTypeNames();
    case wire::Argument::Category:
      return categoryNames();
    default:
      return typeNames();
  }
}

bool mayBeLeftOut(const ArgumentRow& row) {
  return std::holds_alternative<wire::ReporterIDs wire::Request::*>(row.member);
}

std::string quoted(std::string_view text) {
  return "\"" + std::string(text) + "\"";
}

// What a value is, for a complaint; long ones are cut.
std::string shown(const ValueView& value) {
  constexpr std::size_t kMaxShown = 60;
  std::string text;
  if (value.isText()) {
    text = quoted(value.text());
  } else {
    plist::appendJson(text, value);
  }
  if (text.size() > kMaxShown) {
    std::size_t end = kMaxShown;
    while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0U) == 0x80U) {
      --end;  // not in the middle of a character
    }
    text.resize(end);
    text += "...";
  }
  return text;
}

bool isInteger(const ValueView& value) {
  return value.kind() == Kind::Signed || value.kind() == Kind::Unsigned;
}

std::optional<std::int64_t> reporterIDFrom(const ValueView& value) {
  if (value.kind() == Kind::Signed) return value.signedValue();
  constexpr auto kMax = static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max());
  if (value.kind() == Kind::Unsigned && value.unsignedValue() <= kMax) {
    return static_cast<std::int64_t>(value.unsignedValue());
  }
  return std::nullopt;
}

// Fills a step from the members of a line; the first thing that is wrong stays in fault().
class LineReader {
 public:
  LineReader(const plist::Dictionary& members, ScriptStep& step) : members_(members), step_(step) {}

  bool read() { return readOp() && readClient() && checkMembers() && readArguments(); }
  Error fault() const { return {0, fault_}; }

 private:
  bool fail(std::string what, std::string_view expected) {
    fault_ = std::move(what) + ", expected " + std::string(expected);
    return false;
  }
  bool failMember(std::string_view name, const ValueView& value, std::string_view expected) {
    return fail("member " + quoted(name) + " is " + shown(value), expected);
  }
  bool takes(const ArgumentRow& row) const { return arguments_.contains(row.argument); }
  bool takesSeconds() const { return step_.kind == ScriptStep::Kind::Sleep; }
  bool takesMember(std::string_view name) const;

  bool readOp();
  bool readClient();
  bool checkMembers();
  bool readArguments();
  bool readSeconds();
  bool read(const ArgumentRow& row, std::int64_t& number);
  bool read(const ArgumentRow& row, wire::ReporterIDs& numbers);
  bool read(const ArgumentRow& row, plist::Dictionary& dictionary);
  template <class Number>
  bool read(const ArgumentRow& row, Number& number);

  const plist::Dictionary& members_;
  ScriptStep& step_;
  wire::ArgumentList arguments_{};  // of the line's operation
  std::string fault_;
};

bool LineReader::readOp() {
  const ValueView op = members_.get("op");
  if (!op.present()) return fail("there is no member \"op\"", "the name of an operation");
  if (!op.isText()) return failMember("op", op, "the name of an operation");
  step_.op = op.text();
  if (step_.op == "sleep") {
    step_.kind = ScriptStep::Kind::Sleep;
    return true;
  }
  if (step_.op == "disconnect") {
    step_.kind = ScriptStep::Kind::Disconnect;
    return true;
  }
  const auto operation = wire::operationFromName(step_.op);
  if (!operation || wire::rowOf(*operation).servedBy == wire::ServedBy::Host) {
    return failMember("op", op, R"(a remote operation, "sleep" or "disconnect")");
  }
  step_.request.operation = *operation;
  arguments_ = wire::rowOf(*operation).arguments;
  return true;
}

bool LineReader::readClient() {
  const ValueView client = members_.get("client");
  if (!client.present()) {
    step_.client = kDefaultClient;
    return true;
  }
  if (!client.isText() || client.text().empty()) return failMember("client", client, "a text that names a connection");
  step_.client = client.text();
  return true;
}

bool LineReader::takesMember(std::string_view name) const {
  return name == "op" || name == "client" || (takesSeconds() && name == kSeconds) ||
         std::any_of(wire::kArguments.begin(), wire::kArguments.end(),
                     [&](const ArgumentRow& row) { return row.name == name && takes(row); });
}

// Whether every member is one that the operation has, and every one that it needs is there.
bool LineReader::checkMembers() {
  std::string taken = R"("op", "client")";
  std::optional<std::string_view> missing;
  const auto note = [&](std::string_view name, bool isNeeded) {
    taken += ", " + quoted(name);
    if (isNeeded && !missing && !members_.contains(name)) {
      missing = name;
    }
  };
  for (const ArgumentRow& row : wire::kArguments) {
    if (takes(row)) {
      note(row.name, !mayBeLeftOut(row));
    }
  }
  if (takesSeconds()) {
    note(kSeconds, true);
  }
  for (const auto& entry : members_) {
    if (!takesMember(entry.key.text())) {
      return fail(step_.op + " has no member " + quoted(entry.key.text()), "only " + taken);
    }
  }
  return !missing || fail(step_.op + " lacks the member " + quoted(*missing), "it in every such line");
}

bool LineReader::readArguments() {
  const auto readOne = [&](const ArgumentRow& row) {
    return std::visit([&](auto member) { return read(row, step_.request.*member); }, row.member);
  };
  return std::all_of(wire::kArguments.begin(), wire::kArguments.end(),
                     [&](const ArgumentRow& row) { return !takes(row) || readOne(row); }) &&
         (!takesSeconds() || readSeconds());
}

bool LineReader::read(const ArgumentRow& row, std::int64_t& number) {
  const ValueView value = members_.get(row.name);
  const auto found = reporterIDFrom(value);
  if (!found) return failMember(row.name, value, "an integer from -2^63 to 2^63-1");
  number = *found;
  return true;
}

bool LineReader::read(const ArgumentRow& row, wire::ReporterIDs& numbers) {
  const ValueView value = members_.get(row.name);
  if (!value.present()) return true;
  if (value.kind() != Kind::Array) return failMember(row.name, value, "an array of integers");
  numbers.emplace();
  for (const ValueView item : value.array()) {
    const auto number = reporterIDFrom(item);
    if (!number) return failMember(row.name, value, "an array of integers from -2^63 to 2^63-1");
    numbers->push_back(*number);
  }
  return true;
}

bool LineReader::readSeconds() {
  const ValueView value = members_.get(kSeconds);
  const bool isNumber = isInteger(value) || value.kind() == Kind::Double;
  step_.seconds = value.asDouble();
  if (!isNumber || !(step_.seconds >= 0 && step_.seconds <= kMaxSleepSeconds)) {
    return failMember(kSeconds, value, "a number from 0 to a year of seconds");
  }
  return true;
}

bool LineReader::read(const ArgumentRow& row, plist::Dictionary& dictionary) {
  const ValueView value = members_.get(row.name);
  if (value.kind() != Kind::Dictionary) return failMember(row.name, value, "an object");
  dictionary = value.dictionary();
  return true;
}

template <class Number>
bool LineReader::read(const ArgumentRow& row, Number& number) {
  constexpr std::uint64_t kMax = std::numeric_limits<Number>::max();
  const NameTable& names = namesOf(row);
  const ValueView value = members_.get(row.name);
  std::optional<std::uint64_t> found;
  if (value.isText()) {
    found = names.numberOf(value.text());
  } else if (isInteger(value) && !(value.kind() == Kind::Signed && value.signedValue() < 0)) {
    found = value.asUInt64();
  }
  if (!found || *found > kMax) {
    return failMember(row.name, value, "an integer from 0 to " + std::to_string(kMax) + " or one of " + names.listed());
  }
  number = static_cast<Number>(*found);
  return true;
}

}  // namespace

Result<ScriptStep> parseLine(std::string_view text, std::size_t line) {
  // A line's own object is one level more than its values may have.
  const linux_host::JsonReading reading = linux_host::readJson(text, linux_host::kMaximumJsonNesting + 1);
  if (reading.fault) {
    return {{},
            Error{0, "column " + std::to_string(reading.fault->column) + ": " + reading.fault->text +
                         ", expected one JSON object a line"}};
  }
  const ValueView object = reading.value;
  if (object.kind() != Kind::Dictionary) {
    return {{}, Error{0, "the line is " + shown(object) + ", expected a JSON object: {\"op\": ...}"}};
  }
  ScriptStep step;
  step.line = line;
  const plist::Dictionary members = object.dictionary();
  LineReader reader(members, step);
  if (!reader.read()) return {{}, reader.fault()};
  return {std::move(step), {}};
}

bool isBlank(std::string_view text) noexcept {
  return text.find_first_not_of(" \t\r\n") == std::string_view::npos;
}

}  // namespace tarn::script
