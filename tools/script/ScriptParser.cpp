#include "tools/script/ScriptParser.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>
#include <utility>
#include <vector>

#include "host/system/JsonValues.h"
#include "tools/script/VocabularyNames.h"

namespace tarn::script {

namespace {

using plist::Kind;
using plist::ValueView;

// The members that a line may have.
using Member = unsigned;
constexpr Member kReporterID = 1U << 0U;
constexpr Member kServiceType = 1U << 1U;
constexpr Member kConfiguration = 1U << 2U;
constexpr Member kMessage = 1U << 3U;
constexpr Member kCategory = 1U << 4U;
constexpr Member kType = 1U << 5U;
constexpr Member kReporterIDs = 1U << 6U;
constexpr Member kSeconds = 1U << 7U;

struct MemberRow {
  std::string_view name;
  Member member;
};
constexpr std::array kMembers = {
    MemberRow{"reporterID", kReporterID},       MemberRow{"serviceType", kServiceType},
    MemberRow{"configuration", kConfiguration}, MemberRow{"message", kMessage},
    MemberRow{"category", kCategory},           MemberRow{"type", kType},
    MemberRow{"reporterIDs", kReporterIDs},     MemberRow{"seconds", kSeconds},
};

constexpr double kMaxSleepSeconds = 86400.0 * 365;

unsigned membersOf(wire::Operation operation) {
  switch (operation) {
    case wire::Operation::SetServiceType:
      return kServiceType | kReporterID;
    case wire::Operation::SetConfiguration:
      return kConfiguration | kReporterID;
    case wire::Operation::SendMessage:
      return kMessage | kCategory | kType | kReporterIDs;
    case wire::Operation::GetAllReporters:
    case wire::Operation::KillService:
    case wire::Operation::Status:
      return 0;
    default:
      return kReporterID;
  }
}

std::string quoted(std::string_view text) {
  return "\"" + std::string(text) + "\"";
}

// What a value is, for a complaint; long ones are cut.
std::string shown(const ValueView& value) {
  constexpr std::size_t kMaxShown = 60;
  std::string text = value.isText() ? quoted(value.text()) : plist::description(value);
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
  if (value.kind() == Kind::Signed) {
    return value.signedValue();
  }
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
  Fault takeFault() { return Fault{std::move(fault_)}; }

 private:
  bool fail(std::string what, std::string_view expected) {
    fault_ = std::move(what) + ", expected " + std::string(expected);
    return false;
  }
  bool failMember(std::string_view name, const ValueView& value, std::string_view expected) {
    return fail("member " + quoted(name) + " is " + shown(value), expected);
  }
  bool has(Member member) const { return (allowed_ & member) != 0; }

  bool readOp();
  bool readClient();
  bool checkMembers();
  bool readArguments();
  bool readReporterID();
  bool readReporterIDs();
  bool readSeconds();
  bool readDictionary(std::string_view name);
  template <class Number>
  bool readNumberOrName(std::string_view name, const NameTable& names, Number& number);

  const plist::Dictionary& members_;
  ScriptStep& step_;
  unsigned allowed_ = 0;
  std::string fault_;
};

bool LineReader::readOp() {
  const ValueView op = members_.get("op");
  if (!op.present()) {
    return fail("there is no member \"op\"", "the name of an operation");
  }
  if (!op.isText()) {
    return failMember("op", op, "the name of an operation");
  }
  step_.op = op.text();
  if (step_.op == "sleep") {
    step_.kind = ScriptStep::Kind::Sleep;
    allowed_ = kSeconds;
    return true;
  }
  if (step_.op == "disconnect") {
    step_.kind = ScriptStep::Kind::Disconnect;
    return true;
  }
  const auto operation = wire::operationFromName(step_.op);
  if (!operation || *operation == wire::Operation::Status) {
    return failMember("op", op, R"(a remote operation, "sleep" or "disconnect")");
  }
  step_.request.operation = *operation;
  allowed_ = membersOf(*operation);
  return true;
}

bool LineReader::readClient() {
  const ValueView client = members_.get("client");
  if (!client.present()) {
    step_.client = kDefaultClient;
    return true;
  }
  if (!client.isText() || client.text().empty()) {
    return failMember("client", client, "a text that names a connection");
  }
  step_.client = client.text();
  return true;
}

// Whether every member is one that the operation has, and every one that it needs is there.
bool LineReader::checkMembers() {
  for (const auto& entry : members_) {
    const std::string_view name = entry.key.text();
    const auto* row = std::find_if(kMembers.begin(), kMembers.end(), [&](const auto& one) { return one.name == name; });
    const bool isKnown = row != kMembers.end() && has(row->member);
    if (!isKnown && name != "op" && name != "client") {
      std::string expected = R"(only "op", "client")";
      for (const auto& one : kMembers) {
        expected += has(one.member) ? ", " + quoted(one.name) : "";
      }
      return fail(step_.op + " has no member " + quoted(name), expected);
    }
  }
  for (const auto& row : kMembers) {
    if (has(row.member) && row.member != kReporterIDs && !members_.contains(row.name)) {
      return fail(step_.op + " lacks the member " + quoted(row.name), "it in every such line");
    }
  }
  return true;
}

bool LineReader::readArguments() {
  wire::Request& request = step_.request;
  return (!has(kReporterID) || readReporterID()) &&
         (!has(kServiceType) || readNumberOrName("serviceType", serviceTypeNames(), request.serviceType)) &&
         (!has(kConfiguration) || readDictionary("configuration")) && (!has(kMessage) || readDictionary("message")) &&
         (!has(kCategory) || readNumberOrName("category", categoryNames(), request.category)) &&
         (!has(kType) || readNumberOrName("type", typeNames(), request.type)) &&
         (!has(kReporterIDs) || readReporterIDs()) && (!has(kSeconds) || readSeconds());
}

bool LineReader::readReporterID() {
  const ValueView value = members_.get("reporterID");
  const auto number = reporterIDFrom(value);
  if (!number) {
    return failMember("reporterID", value, "an integer from -2^63 to 2^63-1");
  }
  step_.request.reporterID = *number;
  return true;
}

bool LineReader::readReporterIDs() {
  const ValueView value = members_.get("reporterIDs");
  if (!value.present()) {
    return true;
  }
  if (value.kind() != Kind::Array) {
    return failMember("reporterIDs", value, "an array of integers");
  }
  auto& numbers = step_.request.reporterIDs.emplace();
  for (const ValueView item : value.array()) {
    const auto number = reporterIDFrom(item);
    if (!number) {
      return failMember("reporterIDs", value, "an array of integers from -2^63 to 2^63-1");
    }
    numbers.push_back(*number);
  }
  return true;
}

bool LineReader::readSeconds() {
  const ValueView value = members_.get("seconds");
  const bool isNumber = isInteger(value) || value.kind() == Kind::Double;
  step_.seconds = value.asDouble();
  if (!isNumber || !(step_.seconds >= 0 && step_.seconds <= kMaxSleepSeconds)) {
    return failMember("seconds", value, "a number from 0 to a year of seconds");
  }
  return true;
}

bool LineReader::readDictionary(std::string_view name) {
  const ValueView value = members_.get(name);
  if (value.kind() != Kind::Dictionary) {
    return failMember(name, value, "an object");
  }
  step_.request.dictionary = value.dictionary();
  return true;
}

template <class Number>
bool LineReader::readNumberOrName(std::string_view name, const NameTable& names, Number& number) {
  constexpr std::uint64_t kMax = std::numeric_limits<Number>::max();
  const ValueView value = members_.get(name);
  std::optional<std::uint64_t> found;
  if (value.isText()) {
    found = names.numberOf(value.text());
  } else if (isInteger(value) && !(value.kind() == Kind::Signed && value.signedValue() < 0)) {
    found = value.asUInt64();
  }
  if (!found || *found > kMax) {
    return failMember(name, value, "an integer from 0 to " + std::to_string(kMax) + " or one of " + names.listed());
  }
  number = static_cast<Number>(*found);
  return true;
}

}  // namespace

std::variant<ScriptStep, Fault> parseLine(std::string_view text, std::size_t line) {
  // A line's own object is one level more than its values may have.
  const linux_host::JsonReading reading = linux_host::readJson(text, linux_host::kMaximumJsonNesting + 1);
  if (reading.fault) {
    return Fault{"column " + std::to_string(reading.fault->column) + ": " + reading.fault->text +
                 ", expected one JSON object a line"};
  }
  const ValueView object = reading.value;
  if (object.kind() != Kind::Dictionary) {
    return Fault{"the line is " + shown(object) + ", expected a JSON object: {\"op\": ...}"};
  }
  ScriptStep step;
  step.line = line;
  const plist::Dictionary members = object.dictionary();
  LineReader reader(members, step);
  if (!reader.read()) {
    return reader.takeFault();
  }
  return step;
}

bool isBlank(std::string_view text) noexcept {
  return text.find_first_not_of(" \t\r\n") == std::string_view::npos;
}

}  // namespace tarn::script
