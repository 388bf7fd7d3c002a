// SPDX-License-Identifier: Apache-2.0
// TarnReportingRunDelivery: hands the messages of a run to their sessions, one after the other and at once.
//
// Made for one run, on the stack. Threads: the server queue.
//
// Each message is dealt with as TarnReportingMessageDelivery does with one for a single session: told, counted, and
// refused while reporting is disabled. The session is looked up again only when the ID is another one, when it may have
// changed who has it, or when the look-up is to be told.
#pragma once

#include <cstdint>
#include <memory>

#include "service/TarnReportingServiceDelegateProtocol.h"

namespace tarn {

class TarnReportingRunDelivery {
 public:
  // `processIdentifier` is the sender's. Without a service nothing is delivered or counted.
  TarnReportingRunDelivery(std::int32_t processIdentifier,
                           std::shared_ptr<TarnReportingServiceDelegateProtocol> service);
  TarnReportingRunDelivery(const TarnReportingRunDelivery&) = delete;
  TarnReportingRunDelivery& operator=(const TarnReportingRunDelivery&) = delete;
  ~TarnReportingRunDelivery();

  // When memory is missing in the middle of it, it counts as refused, and the exception goes on.
  void deliver(const platform::MessageRun::Message& message);

 private:
  TarnReportingOutcome handOver(const platform::MessageRun::Message& message);
  // Null when nobody has one.
  TarnReportingSession* sessionFor(std::int64_t reporterID);

  const std::int32_t processIdentifier_;
  const std::shared_ptr<TarnReportingServiceDelegateProtocol> service_;
  // The one that was found last, under which ID, and how the index stood then.
  std::shared_ptr<TarnReportingSession> session_;
  std::int64_t reporterID_ = 0;
  std::uint64_t changes_ = 0;
};

}  // namespace tarn
