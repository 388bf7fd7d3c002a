// SPDX-License-Identifier: Apache-2.0
// What the producers that walk over a session's log at its stop do alike: walk, and send what came out.
//
// A walk is a class with `void take(const plist::Dictionary& payload)`, called for each message in order,
// `void keep()`, called before payloads that it took may go, and `TarnReportingSessionMessageList finish()`, called
// once after the last.
//
// Threads: the server queue.
//
// A walk sees the log sorted by time and once, from its oldest message to its newest. What it may hold of a payload
// lies in the page that is open; keep() comes when the next page begins, so a log of any length is walked in the same
// memory.
#pragma once

#include <cstddef>
#include <memory>
#include <string_view>
#include <utility>

#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionWorkerUtility.h"

namespace tarn {

// What the walk makes of the messages that `isLeftOut(index)` doesn't tell to leave out, in order. The walk is used up:
// each derivation has one of its own. Payloads may not be changed meanwhile.
template <class IsLeftOut, class Walk>
TarnReportingSessionMessageList TarnReportingDerivedMessages(const TarnReportingSessionMessageList& messages,
                                                             IsLeftOut isLeftOut, Walk&& walk) {
  messages.forEach(
      [&](std::size_t index, const TarnReportingSessionMessageList::Record& record) {
        if (!isLeftOut(index)) {
          walk.take(record->message());
        }
      },
      [&] { walk.keep(); });
  return walk.finish();
}
// All messages.
template <class Walk>
TarnReportingSessionMessageList TarnReportingDerivedMessages(const TarnReportingSessionMessageList& messages,
                                                             Walk&& walk) {
  return TarnReportingDerivedMessages(
      messages, [](std::size_t) { return false; }, std::forward<Walk>(walk));
}
// Those that weren't merged into others.
template <class Walk>
TarnReportingSessionMessageList TarnReportingDerivedMessages(const TarnReportingCombinedMessages& combined,
                                                             Walk&& walk) {
  return TarnReportingDerivedMessages(
      combined.all(), [&](std::size_t index) { return combined.isMerged(index); }, std::forward<Walk>(walk));
}

// Derives messages from a session (`derive(session)`) and sends them into it, in order. Before the first, `sendingText`
// is logged with the reporter ID. Nothing happens when the session is gone or has an empty log. Nothing is logged when
// nothing was derived. The messages go through the intake like any client's, so they are stamped with the present time,
// tagged, logged at the end of the log and handed to whoever still runs.
template <class Derive>
void TarnReportingSendDerivedMessages(const std::shared_ptr<TarnReportingSession>& session,
                                      const TarnReportingLogger& log, const LogText& sendingText,
                                      const Derive& derive) {
  if (!session || session->messages().empty()) return;
  const TarnReportingSessionMessageList derived = derive(std::as_const(*session));
  if (derived.empty()) return;
  log(LogLevel::Default, sendingText, session->reporterID());
  for (const auto& message : derived) {
    session->sendMessage(message);
  }
}

}  // namespace tarn
