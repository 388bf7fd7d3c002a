// SPDX-License-Identifier: Apache-2.0
// Builders of client messages and readers of derived ones, for the tests of the walks.
#pragma once

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionPreviousValues.h"
#include "testing/FakePlatform.h"

namespace tarn::testing {

inline std::shared_ptr<TarnReportingSessionMessage> unstamped(plist::Dictionary payload) {
  return std::make_shared<TarnReportingSessionMessage>(std::move(payload), AudioEventCategory::Playback,
                                                       AudioEventType::State);
}

// A message whose time stamp is any value.
inline std::shared_ptr<TarnReportingSessionMessage> stamped(const plist::ValueView& time, plist::Dictionary payload) {
  payload.set("tarnreporting_timestamp", time);
  return unstamped(std::move(payload));
}

// A message of that many seconds.
inline std::shared_ptr<TarnReportingSessionMessage> at(double seconds, plist::Dictionary payload = {}) {
  return stamped(seconds, std::move(payload));
}

// Previous values of just these.
inline TarnReportingSessionPreviousValues previous(const plist::Dictionary& values) {
  TarnReportingSessionPreviousValues previousValues;
  previousValues.merge(values);
  return previousValues;
}

// A list as a session keeps it, of these records.
inline TarnReportingSessionMessageList messageListOf(const TarnReportingSessionMessages& messages) {
  TarnReportingSessionMessageList list;
  for (const auto& message : messages) {
    list.append(message);
  }
  return list;
}

// The values of these keys, a text for each message: "10 0.5 1"; "(null)" for a key that isn't there.
template <class Messages>
std::vector<std::string> rows(const Messages& messages, const std::vector<std::string>& keys) {
  std::vector<std::string> texts;
  for (const auto& message : messages) {
    std::string row;
    for (const std::string& key : keys) {
      row += (row.empty() ? "" : " ") + message->message().get(key).asText();
    }
    texts.push_back(row);
  }
  return texts;
}

using Rows = std::vector<std::string>;

// How many segments were looked at, whether or not a message came of them: each is one line of the log.
inline std::size_t segmentsLookedAt(const FakePlatform& platform) {
  std::size_t count = 0;
  for (const std::string& line : platform.log.messages()) {
    if (line.starts_with("playingTime {") || line.starts_with("runningTime {")) {
      ++count;
    }
  }
  return count;
}

}  // namespace tarn::testing
