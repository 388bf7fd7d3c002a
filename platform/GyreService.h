// SPDX-License-Identifier: Apache-2.0
// GyreService: requests for a stack-sampling trace of the whole device. Threads: the server queue.
#pragma once

#include <array>
#include <cstdint>
#include <string>

#include "plist/Dictionary.h"

namespace tarn::platform {

// Everything that a trace is asked for with. Texts are UTF-8.
struct GyreRequest {
  // Texts that people read in the trace's list.
  std::string subsystem;              // who asks
  std::string reason;                 // why
  std::string applicationIdentifier;  // for whom
  // What the trace is to carry with it; the service doesn't look into it.
  plist::Dictionary payload;
  // Numbers that only the service knows the meaning of.
  std::array<std::int32_t, 5> options{};  // in the service's order
};

// Owned by the platform, which may lack it. The trace is of the whole device, not of this process.
class GyreService {
 public:
  virtual ~GyreService() = default;
  // Asks for a trace and returns at once. There is no result, and whether the service takes one is not told.
  virtual void requestGyre(const GyreRequest& request) = 0;
};

}  // namespace tarn::platform
