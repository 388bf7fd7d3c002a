// TarnReportingSessionListing: the listing of all clients' reporter IDs, in slices.
//
// Owned by the piece of work that does its next slice. Threads: the server queue.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"
#include "service/TarnReportingSessionMap.h"

namespace tarn {

class TarnReportingServiceDelegateProtocol;

class TarnReportingSessionListing {
 public:
  explicit TarnReportingSessionListing(platform::Reply<std::vector<std::int64_t>> reply) : reply_(std::move(reply)) {}

  // Lists on, and replies at the end: with no ID where the service is gone.
  void proceed(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate);

 private:
  platform::Reply<std::vector<std::int64_t>> reply_;
  std::vector<std::int64_t> reporters_;
  std::uint64_t client_ = 0;                 // the number of the one whose sessions are listed
  TarnReportingSessionMap::Place from_ = 0;  // among its sessions
};

}  // namespace tarn
