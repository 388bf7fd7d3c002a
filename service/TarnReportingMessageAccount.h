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
      : service_(std::move(other.service_)), isOpen_(std::exchange(other.isOpen_, false)) {}
  TarnReportingMessageAccount& operator=(TarnReportingMessageAccount&&) = delete;
  ~TarnReportingMessageAccount() { close(TarnReportingOutcome::Refused); }

  // Counts the message. Later calls do nothing.
  void close(TarnReportingOutcome outcome) {
    if (!std::exchange(isOpen_, false)) return;
    if (const auto service = service_.lock()) {
      service->countMessage(outcome);
    }
  }

 private:
  Service service_;
  bool isOpen_ = true;  // not counted yet
};

}  // namespace tarn
