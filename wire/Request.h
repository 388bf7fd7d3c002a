// Request: what one request asks for, as plain data. Which members count depends on the operation; they stand here in
// the order in which they stand on the wire.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "plist/Dictionary.h"
#include "wire/Operation.h"

namespace tarn::wire {

struct Request {
  Operation operation = Operation::Status;
  std::uint16_t serviceType = 0;                         // setServiceType
  plist::Dictionary dictionary;                          // setConfiguration: configuration; sendMessage: message
  std::uint32_t category = 0;                            // sendMessage
  std::uint16_t type = 0;                                // sendMessage
  std::int64_t reporterID = 0;                           // every operation on one session
  std::optional<std::vector<std::int64_t>> reporterIDs;  // sendMessage; nothing stands for null
};

// A request with the number under which its reply goes back.
struct DecodedRequest : Request {
  std::uint64_t id = 0;
};

}  // namespace tarn::wire
