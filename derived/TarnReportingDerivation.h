// What the producers that walk over a session's log at its stop do alike: walk, and send what came out.
//
// A walk is a class with `void take(const plist::Dictionary& payload)`, called for each message in order, and
// `TarnReportingSessionMessages finish()`, called once after the last.
//
// Threads: the server queue.
#pragma once

#include <memory>
#include <string_view>
#include <utility>

#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

// What the walk makes of these messages, in order.
template <class Walk>
TarnReportingSessionMessages TarnReportingDerivedMessages(const TarnReportingSessionMessages& messages, Walk walk) {
  for (const auto& message : messages) {
    walk.take(message->message());
  }
  return walk.finish();
}

// Derives messages from a session (`derive(session)`) and sends them into it, in order. Before the first, `sendingText`
// is logged with the reporter ID. Nothing happens when the session is gone or has an empty log.
template <class Derive>
void TarnReportingSendDerivedMessages(const std::shared_ptr<TarnReportingSession>& session,
                                      const TarnReportingLogger& log, const LogText& sendingText,
                                      const Derive& derive) {
  if (!session || session->messages().empty()) return;
  const TarnReportingSessionMessages derived = derive(std::as_const(*session));
  if (derived.empty()) return;
  log(LogLevel::Default, sendingText, session->reporterID());
  for (const auto& message : derived) {
    session->sendMessage(message);
  }
}

}  // namespace tarn
