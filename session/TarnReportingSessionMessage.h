// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionMessage: one message on its way through a session, with the flags that the session sets.
//
// A session keeps up to millions of these, so a record is 24 bytes beside its payload. Records are shared: the
// session's log and every worker hold the same one; a worker that wants to keep or change a record copies it. Producers
// may change the payload of a logged record in place.
//
// Threads: the server queue, apart from the payload's readers on back-end threads.
#pragma once

#include <atomic>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/ThreadSafety.h"
#include "service/vocabulary/TarnReportingVocabulary.h"

namespace tarn {

class TarnReportingSessionMessage;

using TarnReportingSessionMessages = std::deque<std::shared_ptr<TarnReportingSessionMessage>>;

// A new record isn't redundant, says that the session isn't started, and is addressed to everyone. The session sets the
// first two as it takes the record in; a producer that addresses a derived message sets the destinations before that.
class TARN_CAPABILITY TarnReportingSessionMessage {
 public:
  // Names of worker classes; the texts are static.
  using DestinationWorkers = std::vector<std::string_view>;
  // Category and type in one number.
  using Kind = std::uint64_t;

  // Shares the payload with the caller until one of the two writes to it.
  TarnReportingSessionMessage(plist::Dictionary message, AudioEventCategory category, AudioEventType type)
      : message_(std::move(message)), category_(category), type_(type) {}
  // For who keeps many copies and needs no pointers to them; what it is: see copyWithZone().
  struct Copy {};
  TarnReportingSessionMessage(Copy, const TarnReportingSessionMessage& original);
  TarnReportingSessionMessage(const TarnReportingSessionMessage&) = delete;
  TarnReportingSessionMessage& operator=(const TarnReportingSessionMessage&) = delete;

  // The payload; only the session and producers at its stop change that of a record which others hold.
  const plist::Dictionary& message() const noexcept { return message_; }
  // To be written to, under the record's guard where somebody else may hold the record.
  plist::Dictionary& mutableMessage() noexcept { return message_; }
  // With the type: what kind of message it is, for good.
  AudioEventCategory category() const noexcept { return category_; }
  AudioEventType type() const noexcept { return type_; }
  Kind kind() const noexcept { return kindOf(category_, type_); }
  static Kind kindOf(AudioEventCategory category, AudioEventType type) noexcept {
    return Kind{static_cast<std::uint32_t>(category)} << 16U | static_cast<std::uint16_t>(type);
  }

  // Whether the message repeats an earlier one of its session.
  bool isRedundant() const noexcept { return isRedundant_; }
  // For the session's intake, as is setIsSessionStarted().
  void setIsRedundant(bool redundant) noexcept { isRedundant_ = redundant; }
  // Whether the session was started when the message arrived.
  bool isSessionStarted() const noexcept { return isSessionStarted_; }
  void setIsSessionStarted(bool started) noexcept { isSessionStarted_ = started; }

  // The classes whose workers alone handle the message; empty means every consumer.
  const DestinationWorkers& destinationWorkers() const noexcept;
  // Whether the workers of this class are among them.
  bool isFor(std::string_view workerClass) const noexcept {
    return destinationWorkers_ == nullptr || isAddressedTo(workerClass);
  }
  // An empty list addresses everyone again. Few messages have one, so a record holds a pointer to it.
  void setDestinationWorkers(DestinationWorkers workers);

  // "category=%@ type=%@ %@"
  std::string description() const;

  // A record of its own with the same payload, category, type and flags. The destinations are left out on purpose: a
  // copy is addressed to everyone until someone addresses it.
  std::shared_ptr<TarnReportingSessionMessage> copyWithZone() const;

  // What records are sorted by: the time stamp, 0 when it is missing or no number.
  double sortingTime() const noexcept;
  // Sorts in place and stably by epoch time; records without a time stamp count as 0. One look when they are in order
  // already, which is the rule; false then. Without the memory for it nothing has changed.
  static bool sortMessages(TarnReportingSessionMessages& messages);

  // The record's own guard (BasicLockable), for changes to a record that a worker may still hold. A flag and not a
  // mutex, since there may be millions of records. It isn't recursive.
  void lock() const noexcept TARN_ACQUIRE();
  void unlock() const noexcept TARN_RELEASE();

 private:
  // Of a message with destinations.
  bool isAddressedTo(std::string_view workerClass) const noexcept;

  plist::Dictionary message_;
  std::unique_ptr<const DestinationWorkers> destinationWorkers_;
  const AudioEventCategory category_;
  const AudioEventType type_;
  bool isRedundant_ : 1 = false;
  bool isSessionStarted_ : 1 = false;
  mutable std::atomic_flag guard_;
};

// Part of what bounds a log's memory; costOf() of the log's memory counts on it.
static_assert(sizeof(TarnReportingSessionMessage) == 24);

}  // namespace tarn
