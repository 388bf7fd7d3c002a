// SPDX-License-Identifier: Apache-2.0
// SessionRecords: who keeps a record of the sessions: which there were, whose, when they ran and how they ended; and on
// whose behalf a thread works, so that what it hands over to a back-end is known as that session's.
//
// Threads: the server queue; enter() any.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "plist/Dictionary.h"

namespace tarn::platform {

// Serial number of a session in this run, from 1; 0 for nobody's. A reporter ID is its client's choice and may be used
// again and again; this isn't.
using SessionNumber = std::int64_t;

// What is known of a session. Its start and its end are told apart from it.
struct SessionFacts {
  std::int64_t reporter = 0;
  std::int64_t connection = 0;  // the service's number of the connection, 0 for none
  std::int32_t pid = 0;
  std::uint32_t uid = 0;
  std::string process;      // the client's process name, empty when not known
  std::string application;  // HostApplicationDisplayID of the configuration, empty when not known
  std::int64_t serviceType = 65535;
  std::string serviceName;
  bool operator==(const SessionFacts&) const = default;
};

// How a session ended.
enum class SessionEnd {
  Stopped,          // it was stopped, and nothing came after
  Destroyed,        // its client destroyed it, be it after a stop
  Replaced,         // its client made another one under its ID
  Retyped,          // a change of its type made another one in its place
  ClientGone,       // the connection ended while it ran or before it ever ran
  ServiceStopping,  // the service was asked to stop while it ran or before it ever ran
};

// The word for it, by which people and files know it.
constexpr std::string_view nameOf(SessionEnd end) noexcept {
  switch (end) {
    case SessionEnd::Stopped:
      return "stopped";
    case SessionEnd::Destroyed:
      return "destroyed";
    case SessionEnd::Replaced:
      return "replaced";
    case SessionEnd::Retyped:
      return "retyped";
    case SessionEnd::ClientGone:
      return "client-gone";
    case SessionEnd::ServiceStopping:
      return "service-stopping";
  }
  return "stopped";
}

// Owned by the platform, which may lack it: then nobody keeps them. Nothing here blocks; what is written, and when, is
// the keeper's. What memory is missing for throws std::bad_alloc and hasn't happened.
class SessionRecords {
 public:
  virtual ~SessionRecords() = default;
  // A session was made, now; the number by which it is known from here on.
  virtual SessionNumber created(const SessionFacts& facts) = 0;
  // Its type, application or process became known or changed.
  virtual void described(SessionNumber session, const SessionFacts& facts) = 0;
  // A period begins. One that was stopped goes on: it has no end any more.
  virtual void started(SessionNumber session) = 0;
  // A message of the period said what the session's newest of its kind had said, so no back-end got it. As the intake
  // left it, with its own stamp.
  virtual void repeated(SessionNumber session, const plist::Dictionary& message) = 0;
  // The period is over, in which so many messages came, those among them that repeated an earlier one counted again.
  // The session has ended so, unless it starts again or another end is told.
  virtual void stopped(SessionNumber session, std::uint64_t messages, std::uint64_t redundant) = 0;
  // The session is over, and this is how. Nothing more is told of it, though what it had queued may still be done.
  virtual void ended(SessionNumber session, SessionEnd end) = 0;
  // Whose work the calling thread does from here on; answers whose it did before. A load and a store, as it is called
  // with every message.
  virtual SessionNumber enter(SessionNumber session) noexcept = 0;
};

// While it lives the thread works for this session. Scopes nest: at the end the one before holds again. Null: nobody
// keeps records, and nothing happens.
class SessionScope {
 public:
  SessionScope(SessionRecords* records, SessionNumber session) noexcept
      : records_(records), previous_(records == nullptr ? 0 : records->enter(session)) {}
  SessionScope(const SessionScope&) = delete;
  SessionScope& operator=(const SessionScope&) = delete;
  ~SessionScope() {
    if (records_ != nullptr) {
      records_->enter(previous_);
    }
  }

 private:
  SessionRecords* const records_;
  const SessionNumber previous_;
};

}  // namespace tarn::platform
