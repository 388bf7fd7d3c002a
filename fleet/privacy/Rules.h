// SPDX-License-Identifier: Apache-2.0
// Rules: what may leave the device, as its configuration says. Plain data; PrivacySieve applies it.
//
// Patterns are those of globMatches: `*`, `?`, `[a-z]`. What no pattern allows stays.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace tarn::fleet {

enum class Mode : std::uint8_t {
  Off,     // nothing is read, written or sent
  Local,   // messages are made and kept in a folder of this machine
  Export,  // they leave it
};

struct Rules {
  Mode mode = Mode::Off;
  // Of messages, by what they are sent as: "Volume" and "Summary".
  std::vector<std::string> categories{"*"};
  std::vector<std::string> types{"*"};
  // Other events, as BACKEND/NAME: "snare/requestSnapshot".
  std::vector<std::string> others;
  // Keys of an event, and of a session `application` and `process`: what leaves as it is, and what leaves as a keyed
  // hash. The second goes first: no pattern of `keys` shows what is to be hashed.
  std::vector<std::string> keys{"play_seconds",
                                "inputrunning_seconds",
                                "session_duration",
                                "session_output_running",
                                "session_input_running",
                                "session_selected_format",
                                "KvSessionVolume",
                                "issue_type",
                                "node",
                                "audiotag",
                                "tarnreporting_timestamp",
                                "service_type",
                                "summaryServiceName",
                                "total_active_time",
                                "active_count",
                                "average_active_time",
                                "overload_count",
                                "num_messages",
                                "num_unique_messages",
                                "num_redundant_messages",
                                "mFormatID",
                                "mChannelsPerFrame",
                                "msgidx",
                                "msgcnt"};
  std::vector<std::string> hashed{"HostApplicationDisplayID", "application", "process", "clientProcessName",
                                  "active_devices"};
  // The share of sessions whose events leave, of 0 to 1.
  double sample = 1;
  // For so many days a value has the same hash; 0: for ever.
  std::int64_t rotateDays = 0;
};

}  // namespace tarn::fleet
