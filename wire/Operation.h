// Operation: what a client can ask for, and the errors that the wire itself answers with.
//
// kOperations is the only list of operations: decoder, encoder, dispatcher, client, scripts and help texts go by it.
//
// Stateless. Threads: any.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <optional>
#include <string_view>

namespace tarn::wire {

// Those of the service, numbered in the order of the remote interface, then the host's own.
enum class Operation : std::uint8_t {
  CreateReportingSession = 1,
  SetServiceType,
  GetServiceNameForReporterID,
  SetConfiguration,
  StartReportingSessionForID,
  SendMessage,
  StopReportingSessionForID,
  DestroyReportingSession,
  ReporterID,
  GetAllReporters,
  KillService,
  Status = 100,
  Settle,
  OpenRing,
  DeclareShape,
};

// What follows the operation in a request. Names, kinds and places stand in kArguments (Request.h).
enum class Argument : std::uint8_t {
  ReporterID,
  ServiceType,
  Configuration,
  Message,
  Category,
  Type,
  ReporterIDs,
  Shape
};

// What a reply carries when all went well.
enum class Result : std::uint8_t {
  NoReply,     // there is none: the service ends
  Nothing,     // a reply without a result
  True,        // always true
  TrueAtStop,  // the same, held until the session stops
  Number,
  Dictionary,
  Numbers,
};

// Who serves it: the exported object, or the host before requests come there.
enum class ServedBy : std::uint8_t { Service, Host };

inline constexpr std::size_t kMaxArguments = 4;

class ArgumentList {
 public:
  constexpr ArgumentList(std::initializer_list<Argument> arguments) : size_(arguments.size()) {
    std::copy(arguments.begin(), arguments.end(), items_.begin());
  }
  constexpr const Argument* begin() const noexcept { return items_.data(); }
  constexpr const Argument* end() const noexcept { return items_.data() + size_; }
  constexpr std::size_t size() const noexcept { return size_; }
  constexpr Argument operator[](std::size_t index) const noexcept { return items_[index]; }
  constexpr bool contains(Argument argument) const noexcept { return std::find(begin(), end(), argument) != end(); }

 private:
  std::array<Argument, kMaxArguments> items_{};
  std::size_t size_;
};

struct OperationRow {
  Operation operation;
  std::string_view name;
  ArgumentList arguments;  // in the order in which they stand on the wire and in the remote interface
  Result result;
  ServedBy servedBy = ServedBy::Service;
};

inline constexpr std::array kOperations = {
    OperationRow{Operation::CreateReportingSession, "createReportingSession", {Argument::ReporterID}, Result::True},
    OperationRow{
        Operation::SetServiceType, "setServiceType", {Argument::ServiceType, Argument::ReporterID}, Result::True},
    OperationRow{
        Operation::GetServiceNameForReporterID, "getServiceNameForReporterID", {Argument::ReporterID}, Result::Number},
    OperationRow{
        Operation::SetConfiguration, "setConfiguration", {Argument::Configuration, Argument::ReporterID}, Result::True},
    OperationRow{Operation::StartReportingSessionForID,
                 "startReportingSessionForID",
                 {Argument::ReporterID},
                 Result::TrueAtStop},
    OperationRow{Operation::SendMessage,
                 "sendMessage",
                 {Argument::Message, Argument::Category, Argument::Type, Argument::ReporterIDs},
                 Result::Nothing},
    OperationRow{
        Operation::StopReportingSessionForID, "stopReportingSessionForID", {Argument::ReporterID}, Result::True},
    OperationRow{Operation::DestroyReportingSession, "destroyReportingSession", {Argument::ReporterID}, Result::True},
    OperationRow{Operation::ReporterID, "reporterID", {Argument::ReporterID}, Result::Dictionary},
    OperationRow{Operation::GetAllReporters, "getAllReporters", {}, Result::Numbers},
    OperationRow{Operation::KillService, "killService", {}, Result::NoReply},
    OperationRow{Operation::Status, "status", {}, Result::Dictionary, ServedBy::Host},
    OperationRow{Operation::Settle, "settle", {}, Result::Nothing, ServedBy::Host},
    OperationRow{Operation::OpenRing, "openRing", {}, Result::Number, ServedBy::Host},
    OperationRow{Operation::DeclareShape, "declareShape", {Argument::Shape}, Result::True, ServedBy::Host},
};

// The numbers from here up are the host's own.
inline constexpr std::uint64_t kFirstHostNumber = 100;
inline constexpr std::size_t kServiceOperations = std::count_if(
    kOperations.begin(), kOperations.end(), [](const OperationRow& row) { return row.servedBy == ServedBy::Service; });

constexpr std::uint64_t numberOf(Operation operation) noexcept {
  return static_cast<std::uint64_t>(operation);
}

// The place of a number in the table, if it is there at all.
constexpr std::uint64_t operationIndex(std::uint64_t number) noexcept {
  return number < kFirstHostNumber ? number - 1 : number - kFirstHostNumber + kServiceOperations;
}

static_assert(std::all_of(kOperations.begin(), kOperations.end(),
                          [](const OperationRow& row) {
                            const std::uint64_t number = numberOf(row.operation);
                            return &row == &kOperations[operationIndex(number)] &&
                                   (row.servedBy == ServedBy::Host) == (number >= kFirstHostNumber);
                          }),
              "each row stands at its number, the service's from 1, the host's own after them from 100");

constexpr const OperationRow& rowOf(Operation operation) noexcept {
  return kOperations[operationIndex(numberOf(operation))];
}

// The operation of this number, nothing when there is none.
constexpr std::optional<Operation> operationFromNumber(std::uint64_t number) noexcept {
  const std::uint64_t index = operationIndex(number);
  const bool known = index < kOperations.size() && numberOf(kOperations[index].operation) == number;
  return known ? std::optional(kOperations[index].operation) : std::nullopt;
}

// "createReportingSession", ..., "killService", "status", "settle". The text is static.
constexpr std::string_view operationName(Operation operation) noexcept {
  return rowOf(operation).name;
}

// The operation of this name (upper and lower case count), nothing when there is none.
constexpr std::optional<Operation> operationFromName(std::string_view name) noexcept {
  const auto row =
      std::find_if(kOperations.begin(), kOperations.end(), [&](const auto& one) { return one.name == name; });
  return row != kOperations.end() ? std::optional(row->operation) : std::nullopt;
}

// The domain of the errors that answer a frame which could be read but not served.
inline constexpr std::string_view kErrorDomain = "sys.oxbow.audio.reporting.ipc";

enum class ErrorCode : std::uint8_t {
  UnknownOperation = 1,
  BadArguments = 2,     // wrong count, or a wrong kind or range in an argument's place
  NotPropertyList = 3,  // something inside a dictionary argument that a property list can't hold
  OverQuota = 4,        // the client or its user has as much as it may have
  OutOfMemory = 5,      // the service has no memory for it now
};
inline constexpr std::size_t kErrorCodes = 5;
// The text of that error: short enough for a string to hold it in itself.
inline constexpr std::string_view kOutOfMemory = "out of memory";

// Containers inside each other, a dictionary argument being the first.
inline constexpr std::size_t kMaxNesting = 64;
// Entries of a list of reporter IDs.
inline constexpr std::size_t kMaxReporterIDs = 65536;
// Bytes of the length that stands before each frame (little-endian).
inline constexpr std::size_t kFrameHeaderBytes = 4;
// The largest frame, its length not counted, unless configured otherwise.
inline constexpr std::size_t kDefaultMaxFrameBytes = 1048576;

}  // namespace tarn::wire
