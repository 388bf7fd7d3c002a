// Operation: the numbers and names of what a client can ask for, and the errors that the wire itself answers with.
//
// Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace tarn::wire {

// In the order of the remote interface; Status is the host's own.
enum class Operation : std::uint8_t {
  CreateReportingSession = 1,
  SetServiceType = 2,
  GetServiceNameForReporterID = 3,
  SetConfiguration = 4,
  StartReportingSessionForID = 5,
  SendMessage = 6,
  StopReportingSessionForID = 7,
  DestroyReportingSession = 8,
  ReporterID = 9,
  GetAllReporters = 10,
  KillService = 11,
  Status = 100,
};

// The operation of this number, nothing when there is none.
std::optional<Operation> operationFromNumber(std::uint64_t number) noexcept;
// "createReportingSession", ..., "killService", "status". The text lives for ever.
std::string_view operationName(Operation operation) noexcept;
// The operation of this name (upper and lower case count), nothing when there is none.
std::optional<Operation> operationFromName(std::string_view name) noexcept;
// How many arguments follow the operation in a request.
std::size_t argumentCount(Operation operation) noexcept;

// The domain of the errors that answer a frame which could be read but not served.
inline constexpr std::string_view kErrorDomain = "sys.oxbow.audio.reporting.ipc";

enum class ErrorCode : std::uint8_t {
  UnknownOperation = 1,
  BadArguments = 2,     // wrong count, or a wrong kind or range in an argument's place
  NotPropertyList = 3,  // something inside a dictionary argument that a property list can't hold
};

// Containers inside each other, a dictionary argument being the first.
inline constexpr std::size_t kMaxNesting = 64;
// Bytes of the length that stands before each frame (little-endian).
inline constexpr std::size_t kFrameHeaderBytes = 4;
// The largest frame, its length not counted, unless configured otherwise.
inline constexpr std::size_t kDefaultMaxFrameBytes = 1048576;

}  // namespace tarn::wire
