// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionListing: the listing of all clients' reporter IDs, in slices.
//
// Owned by the piece of work that does its next slice. Threads: the server queue.
//
// Sixteen IDs cost a unit. Between two slices clients may come, go, and make or destroy sessions; the listing remembers
// the client's number and the place in its map, not positions, so it neither skips nor repeats one that stays.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"
#include "service/TarnReportingSessionMap.h"

namespace tarn {

class TarnReportingServiceDelegateProtocol;

// Movable only, as the delivery of a message is.
class TarnReportingSessionListing {
 public:
  // Nothing is listed before proceed().
  explicit TarnReportingSessionListing(platform::Reply<std::vector<std::int64_t>> reply) : reply_(std::move(reply)) {}

  // Lists on, and replies at the end: with no ID where the service is gone. May hand itself over as the work of the
  // next slice: the object isn't used again after the call.
  void proceed(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate);

 private:
  platform::Reply<std::vector<std::int64_t>> reply_;
  // Those of the clients before, and of this one's sessions up to `from_`.
  std::vector<std::int64_t> reporters_;
  std::uint64_t client_ = 0;                 // the number of the one whose sessions are listed
  TarnReportingSessionMap::Place from_ = 0;  // among its sessions
};

}  // namespace tarn
