// SPDX-License-Identifier: Apache-2.0
// TarnReportingServiceProtocol: the remote interface, the only way into the service. A listener's connections call the
// object that the service exports to them, with arguments that are already decoded and checked.
//
// Every operation returns at once and does its work on the reporting server queue. Nothing is thrown. Each reply is
// called at most once, on the server queue; a reply that is destroyed uncalled will never come.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"
#include "plist/PackedBuilder.h"

namespace tarn::platform {

// What an operation answers in place of results. One operation has one: sendMessage() while reporting is disabled.
struct RemoteError {
  std::string_view domain;  // a static text
  std::int64_t code = 0;
  // For people; UTF-8.
  std::string text;
};

// How an operation answers: with nothing and its results, or with an error and results that mean nothing.
template <class... Results>
using Reply = UniqueFunction<void(const std::optional<RemoteError>& error, Results... results)>;

// What setServiceType, setConfiguration and company answer: true, always.
using Acknowledge = Reply<bool>;
// Absent and empty mean the same to the service: every running session.
using ReporterIDs = std::optional<std::vector<std::int64_t>>;

// Messages that came one after the other, each for the one session that its ID names, and that nobody waits for. They
// are read from where they came as they are asked for. Threads: the server queue.
class MessageRun {
 public:
  struct Message {
    const plist::PackedBuilder::Draft* payload = nullptr;
    std::uint32_t category = 0;
    std::uint16_t type = 0;
    std::int64_t reporterID = 0;
  };

  virtual ~MessageRun() = default;
  // The next one, which has been received from then on; null when none is left, or others are to have their turn. What
  // it shows holds until the next call. Nothing is thrown.
  virtual const Message* next() = 0;
};

// One object a connection, held by it until it is over. Sessions belong to the connection that made them: only it
// configures, starts, stops and destroys them. A reporter ID that it has no session under, 0 among them, is no error:
// the operation does nothing and answers as if it had worked. Arguments are in their ranges; a service type, category
// or type without a meaning is taken like any other.
class TarnReportingServiceProtocol {
 public:
  virtual ~TarnReportingServiceProtocol() = default;
  // Makes a session under this ID of the client's choice, in place of the one that it has there. The replaced one is
  // let go of without being stopped, and the held reply of its start never comes. Answers true.
  virtual void createReportingSession(std::int64_t reporterID, Acknowledge reply) = 0;
  // Types the session. One that has this type already stays as it is. One that has another type is replaced by a new
  // one of the new type, not started, which keeps configuration and latest values. Answers true.
  virtual void setServiceType(std::uint16_t serviceType, std::int64_t reporterID, Acknowledge reply) = 0;
  // Despite its name it answers the service type, of any client's session: 65535 for an unknown session.
  virtual void getServiceNameForReporterID(std::int64_t reporterID, Reply<std::uint16_t> reply) = 0;
  // Merges the configuration into the session's: its keys get the new values, the others stay. Answers true.
  virtual void setConfiguration(plist::Dictionary configuration, std::int64_t reporterID, Acknowledge reply) = 0;
  // Makes the workers of the session's type and starts them. The reply is true and is held until the session stops; it
  // never comes when the session ends in another way, or ran already (then the first start's stands for both). Unknown
  // sessions, and test sessions of internal builds, are answered at once.
  virtual void startReportingSessionForID(std::int64_t reporterID, Acknowledge reply) = 0;
  // Hands each of these sessions, of whatever client, a record of the message; a session that is named twice gets it
  // twice. Without IDs each running session gets it, and where none runs one that the service makes for it and ends by
  // itself. Answers without a result once the sessions took it, or with an error while reporting is disabled. Takes as
  // long as there are sessions, in slices.
  virtual void sendMessage(plist::Dictionary message, std::uint32_t category, std::uint16_t type,
                           ReporterIDs reporterIDs, Reply<> reply) = 0;
  // Stops the session, which stays and may be started again; the held reply of its start goes out first. Answers true,
  // also for one that doesn't run.
  virtual void stopReportingSessionForID(std::int64_t reporterID, Acknowledge reply) = 0;
  // Stops the session if it runs, and drops it; the held reply of its start never comes. Answers true.
  virtual void destroyReportingSession(std::int64_t reporterID, Acknowledge reply) = 0;
  // Answers "reporterID" and "serviceType" of any client's session; 0 and 65535 for an unknown one.
  virtual void reporterID(std::int64_t reporterID, Reply<plist::Dictionary> reply) = 0;
  // Answers the reporter IDs of all sessions of all clients. Takes as long as there are sessions, in slices: one that
  // is there all the while is named once.
  virtual void getAllReporters(Reply<std::vector<std::int64_t>> reply) = 0;
  // Ends the process at once, without a reply and without stopping sessions; what back-ends hold is made safe first.
  virtual void killService() = 0;

  // No remote operation: does with each message of the run what sendMessage() to this one ID does, without a reply. As
  // work of the server queue, which it is done with when it returns; it returns when the run gives no further message.
  virtual void sendMessages(MessageRun& run) = 0;

  // No remote operations: what the client has now, for whoever bounds that. Threads: the server queue's.
  virtual std::size_t sessionCount() const { return 0; }
  virtual std::size_t logBytes() const { return 0; }  // memory that the messages of its sessions take
  // Whether this client has a session under the ID, so that a quota of sessions doesn't count one that is only
  // replaced.
  virtual bool hasSession(std::int64_t reporterID) const {
    static_cast<void>(reporterID);
    return false;
  }

  // No remote operations either: this client's own sessions, for whoever lets others see only some clients'. Threads:
  // the server queue's.
  // The type of the one under the ID; nothing when there is none.
  virtual std::optional<std::uint16_t> serviceTypeOf(std::int64_t reporterID) const {
    static_cast<void>(reporterID);
    return std::nullopt;
  }
  // Appends the IDs of at most so many, in the order of creation, those from the place `from` on; whether there may be
  // more, from where `from` is then. 0 is the first place. Those that come meanwhile stand at the end.
  virtual bool listReporterIDs(std::uint64_t& from, std::size_t atMost, std::vector<std::int64_t>& reporters) const {
    static_cast<void>(from);
    static_cast<void>(atMost);
    static_cast<void>(reporters);
    return false;
  }
};

}  // namespace tarn::platform
