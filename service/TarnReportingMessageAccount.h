// SPDX-License-Identifier: Apache-2.0
// TarnReportingMessageAccount: one message's way into the counts. It gets exactly one outcome there, also when its work
// ends in the middle because memory is missing: then it counts as refused.
//
// Owned by the message's delivery. Threads: the server queue.
#pragma once

#include <memory>
#include <utility>

#include "service/TarnReportingServiceDelegateProtocol.h"

namespace tarn {

class TarnReportingMessageAccount {
 public:
  using Service = std::weak_ptr<TarnReportingServiceDelegateProtocol>;

  explicit TarnReportingMessageAccount(Service service) noexcept : service_(std::move(service)) {}
  TarnReportingMessageAccount(TarnReportingMessageAccount&& other) noexcept
      : service_(std::exchange(other.service_, {})) {}
  TarnReportingMessageAccount& operator=(TarnReportingMessageAccount&&) = delete;
  ~TarnReportingMessageAccount() { close(TarnReportingOutcome::Refused); }

  // Counts the message. Later calls do nothing.
  void close(TarnReportingOutcome outcome) {
    if (const auto service = std::exchange(service_, {}).lock()) {
      service->countMessage(outcome);
    }
  }

 private:
  Service service_;  // empty once it is counted
};

}  // namespace tarn
