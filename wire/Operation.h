// SPDX-License-Identifier: Apache-2.0
// Operation: what a client can ask for, and the errors that the wire itself answers with.
//
// A frame is its length and one CBOR array; docs/wire.md shows some in hex:
//
//   request    [length 4, little-endian] [id, operation, arguments...]
//   reply      [length 4, little-endian] [id, null, results...]
//   refusal    [length 4, little-endian] [id, [domain, code, text]]
//
// kOperations is the only list of operations: decoder, encoder, dispatcher, client, scripts and help texts go by it. A
// request carries the arguments of its row, no fewer and no more; what a reply carries, the row's Result says.
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

// Those of the service, numbered in the order of the remote interface, then the host's own. The numbers stand in
// frames, so they never change. What each does is told at TarnReportingServiceProtocol; here what it takes and answers.
enum class Operation : std::uint8_t {
  // A session under an ID of the client's choice; one that is there already is replaced. Answers true.
  CreateReportingSession = 1,
  // Types the session; with another type than it has it is made anew and not started. Answers true.
  SetServiceType,
  // Answers the service type as a number, despite the name: 65535 for an ID that nobody has.
  GetServiceNameForReporterID,
  // Merges a dictionary into the session's configuration. Answers true, for an unknown session as well.
  SetConfiguration,
  // Starts it. Answers true when it stops; never when it is destroyed or replaced first, or ran already.
  StartReportingSessionForID,
  // Hands a message to the sessions of these IDs, or to every running one. Answers without a result, or with an error
  // while reporting is disabled.
  SendMessage,
  // Stops it; the start's answer goes out before this one's. Answers true.
  StopReportingSessionForID,
  // Stops it if it runs, and drops it. Answers true.
  DestroyReportingSession,
  // Answers a dictionary: the ID, or 0 for an unknown one, and the service type.
  ReporterID,
  // Answers the IDs of all clients' sessions as one array.
  GetAllReporters,
  // Ends the process, without an answer.
  KillService,
  // Answers the host's counters and levels as a dictionary, at once, also while other requests have to wait.
  Status = 100,
  // Answers without a result once what the connection sent before is committed; never when that failed.
  Settle,
  // Takes the memory file and the eventfd that come with the frame, and answers the ring's number on the connection.
  OpenRing,
  // Tells what messages of a number look like in the connection's rings. Answers true.
  DeclareShape,
};

// What follows the operation in a request. Names, kinds and places stand in kArguments (Request.h), in this order. Two
// that differ only in what they are called, as Configuration and Message, are two, since scripts name them.
enum class Argument : std::uint8_t {
  // A session's, an integer of 64 bits with its sign that the client has chosen; 0 means none.
  ReporterID,
  // 0 to 65535, of AudioServiceType or not: a number without a meaning is taken like any other.
  ServiceType,
  // A map of texts to property-list values, at most kMaxNesting deep.
  Configuration,
  // The same.
  Message,
  // 0 to 4294967295; the high half may hold a domain.
  Category,
  // 0 to 65535.
  Type,
  // An array of at most kMaxReporterIDs, or null.
  ReporterIDs,
  // A map whose keys docs/ring.md names; who serves it checks them.
  Shape
};

// What a reply carries when all went well. By it dispatcher and clients know what to expect; an error takes its place.
enum class Result : std::uint8_t {
  // There is none: the service ends. A client that waits for it sees the end of its connection.
  NoReply,
  // A reply without a result: the request was taken.
  Nothing,
  // Always true, whether there was something to do or not: an ID that nobody knows is no error.
  True,
  // The same, held until the session stops. It never comes when the session ends in another way.
  TrueAtStop,
  // A service type, or a ring's number.
  Number,
  // A dictionary of that operation's own keys.
  Dictionary,
  // Any number of reporter IDs, written as one array.
  Numbers,
};

// Who serves it: the exported object, or the host before requests come there.
enum class ServedBy : std::uint8_t { Service, Host };

// As many as sendMessage has.
inline constexpr std::size_t kMaxArguments = 4;

// The arguments of one operation, for the table alone: a vector that exists at compile time.
class ArgumentList {
 public:
  // At most kMaxArguments; one more would not compile, since the table is constant.
  constexpr ArgumentList(std::initializer_list<Argument> arguments) : size_(arguments.size()) {
    std::copy(arguments.begin(), arguments.end(), items_.begin());
  }
  constexpr const Argument* begin() const noexcept { return items_.data(); }
  constexpr const Argument* end() const noexcept { return items_.data() + size_; }
  constexpr std::size_t size() const noexcept { return size_; }
  // `index` is below size().
  constexpr Argument operator[](std::size_t index) const noexcept { return items_[index]; }
  // For scripts and tools that ask whether an operation has, say, reporter IDs.
  constexpr bool contains(Argument argument) const noexcept { return std::find(begin(), end(), argument) != end(); }

 private:
  std::array<Argument, kMaxArguments> items_{};
  std::size_t size_;
};

// All that the system knows of an operation by its number. A row of the service's without its entry in the dispatcher
// doesn't compile.
struct OperationRow {
  Operation operation;
  // As logs, scripts and the command-line tool spell it.
  std::string_view name;
  ArgumentList arguments;  // in the order in which they stand on the wire and in the remote interface
  // What a client may expect.
  Result result;
  // Nearly all are the service's, so that stands as the default.
  ServedBy servedBy = ServedBy::Service;
};

// In the order of the numbers, so that a number leads to its row without a search; checked below.
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

// The numbers from here up are the host's own. The gap leaves room for the service's.
inline constexpr std::uint64_t kFirstHostNumber = 100;
// How many the remote interface has: they fill the first rows.
inline constexpr std::size_t kServiceOperations = std::count_if(
    kOperations.begin(), kOperations.end(), [](const OperationRow& row) { return row.servedBy == ServedBy::Service; });

// As it stands in a frame.
constexpr std::uint64_t numberOf(Operation operation) noexcept {
  return static_cast<std::uint64_t>(operation);
}

// The place of a number in the table, if it is there at all: any number comes in, as frames have it, so the caller
// compares the place with the table's size. 0 gives a place far beyond it.
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

// Of an operation that exists; costs an addition.
constexpr const OperationRow& rowOf(Operation operation) noexcept {
  return kOperations[operationIndex(numberOf(operation))];
}

// The operation of this number, nothing when there is none: for numbers from outside.
constexpr std::optional<Operation> operationFromNumber(std::uint64_t number) noexcept {
  const std::uint64_t index = operationIndex(number);
  // The gap between the service's numbers and the host's leads to rows of other numbers.
  const bool known = index < kOperations.size() && numberOf(kOperations[index].operation) == number;
  return known ? std::optional(kOperations[index].operation) : std::nullopt;
}

// "createReportingSession", ..., "killService", "status", "settle". The text is static.
constexpr std::string_view operationName(Operation operation) noexcept {
  return rowOf(operation).name;
}

// The operation of this name (upper and lower case count), nothing when there is none. Looks through the table: for
// scripts and people, not for frames.
constexpr std::optional<Operation> operationFromName(std::string_view name) noexcept {
  const auto row =
      std::find_if(kOperations.begin(), kOperations.end(), [&](const auto& one) { return one.name == name; });
  return row != kOperations.end() ? std::optional(row->operation) : std::nullopt;
}

// The domain of the errors that answer a frame which could be read but not served; the service's own have another one.
inline constexpr std::string_view kErrorDomain = "sys.oxbow.audio.reporting.ipc";

// Codes of that domain. They stand in frames and are counted one by one in `status`.
enum class ErrorCode : std::uint8_t {
  // No row has the number, or it is no number.
  UnknownOperation = 1,
  // A wrong count, or a wrong kind or range in an argument's place.
  BadArguments = 2,
  // Something inside a dictionary argument that a property list can't hold: see PropertyListReader.
  NotPropertyList = 3,
  // The client or its user has as much as it may have; the text names the quota, its use and its limit.
  OverQuota = 4,
  // The service has no memory for the request now. It may be sent again.
  OutOfMemory = 5,
  // Only the admin socket serves it, since the service is set up so.
  AdminOnly = 6,
};
// For tables by code, whose places are the codes less 1.
inline constexpr std::size_t kErrorCodes = 6;

// Containers inside each other, a dictionary argument being the first. Readers, writers and comparisons of values call
// themselves once a level, so this bounds their stack.
inline constexpr std::size_t kMaxNesting = 64;
// Entries of a list of reporter IDs: each costs a look-up and may cost a copy of the message.
inline constexpr std::size_t kMaxReporterIDs = 65536;
// Bytes of the length that stands before each frame (little-endian).
inline constexpr std::size_t kFrameHeaderBytes = 4;
// The largest frame, its length not counted, unless configured otherwise. A connection's memory is bounded by it.
inline constexpr std::size_t kDefaultMaxFrameBytes = 1048576;

}  // namespace tarn::wire
