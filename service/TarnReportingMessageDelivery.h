// SPDX-License-Identifier: Apache-2.0
// TarnReportingMessageDelivery: a message on its way to its sessions. A list of IDs may be long and a broadcast wide,
// so the look-up and the hand-over are done in slices.
//
// Owned by the piece of work that does its next slice. Threads: the server queue.
//
// Who gets it is settled by the end of the look-up: the sessions under the IDs, or whoever runs then. A broadcast
// leaves out those that were stopped before their turn in it; a session that was named gets the message though it was
// stopped meanwhile. Each session gets a record of its own; the payload is shared until somebody writes to it, and the
// last session takes the delivery's own. Handing over costs four units a session, and looking up a sixteenth of one an
// ID.
#pragma once

#include <cstdint>
#include <memory>

#include "plist/Dictionary.h"
#include "service/TarnReportingMessageAccount.h"
#include "service/TarnReportingServiceDelegateProtocol.h"

namespace tarn {

// Movable only: while it gives way it lies in the work that is to go on with it. When the service goes away in between,
// it is dropped and the reply never comes. So it is when memory is missing in the middle: then the message counts as
// refused, whatever it had reached.
class TarnReportingMessageDelivery {
 public:
  // Category and type are the bare numbers of the request; any number is taken and printed as the vocabulary prints it.
  TarnReportingMessageDelivery(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                               platform::ReporterIDs reporterIDs, platform::Reply<> reply,
                               TarnReportingMessageAccount account)
      : message_(std::move(message)),
        category_(category),
        type_(type),
        reply_(std::move(reply)),
        account_(std::move(account)),
        search_{std::move(reporterIDs), {}} {}
  TarnReportingMessageDelivery(TarnReportingMessageDelivery&&) = default;

  // For the operation's signpost.
  std::uint32_t category() const noexcept { return category_; }
  // No list and an empty one mean the same.
  bool isForWhoeverRuns() const { return !search_.reporterIDs || search_.reporterIDs->empty(); }
  // Delivers it, and replies at the end: with an error where the service is gone or reporting is disabled. The error is
  // that of the domain "sys.oxbow.audio.reporting" with code 1. Once, on the server queue; the process identifier is
  // the sender's and goes into the trace point alone. What became of the message is counted just before the reply, once
  // for all its sessions; see TarnReportingMessageAccount.
  void begin(std::int32_t processIdentifier, const std::weak_ptr<TarnReportingServiceDelegateProtocol>& service);

 private:
  // One slice: goes on with the search, then with the handing over, until it is done or others are to have their turn.
  void proceed(TarnReportingServiceDelegateProtocol& service,
               const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate);
  // What nearly every message is: for one session, which is found and served at once and without a list.
  void deliverToOne(TarnReportingServiceDelegateProtocol& service);
  // Hands itself over as the work of the next slice; nothing of this object may be touched afterwards.
  void giveWay(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate);
  // Counts the message and replies.
  void finish();
  // Makes the session's record and calls its intake. The last one's record takes the message itself.
  void handOver(const std::shared_ptr<TarnReportingSession>& session, bool isLast);

  plist::Dictionary message_;
  std::uint32_t category_;
  std::uint16_t type_;
  platform::Reply<> reply_;
  TarnReportingMessageAccount account_;
  TarnReportingServiceDelegateProtocol::SessionSearch search_;
  bool found_ = false;    // the search is over
  std::size_t next_ = 0;  // of the sessions that were found
  // The best one so far; what it begins with stands when no session is found.
  TarnReportingOutcome outcome_ = TarnReportingOutcome::WithoutSession;
};

}  // namespace tarn
