// GyreService: requests for a stack-sampling trace of the whole device. Threads: the server queue.
#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "plist/Dictionary.h"

namespace tarn::platform {

struct GyreRequest {
  std::string subsystem;              // who asks
  std::string reason;                 // why
  std::string applicationIdentifier;  // for whom
  plist::Dictionary payload;
  std::array<std::int32_t, 5> options{};  // in the service's order
};

class GyreService {
 public:
  virtual ~GyreService() = default;
  // Asks for a trace. There is no result.
  virtual void requestGyre(const GyreRequest& request) = 0;
};

}  // namespace tarn::platform
