// SPDX-License-Identifier: Apache-2.0
// SessionStory: all that `show` tells of one session: who it was, what it did and what became of it. Threads: one.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "plist/Result.h"
#include "tools/ctl/sessions/SessionOverview.h"
#include "tools/ctl/sessions/SessionTimeline.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/Terminal.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::ctl {

struct SessionStory {
  SessionOverview overview;
  std::optional<recorder::RunRow> run;
  plist::Dictionary device;  // the device's settings, as they were last told
  SessionTimeline timeline;
  std::vector<SessionMessage> segments;                     // derived ones
  std::vector<std::pair<std::string, std::size_t>> issues;  // what went wrong and how often, the most frequent first
  std::optional<SessionMessage> summary;                    // the session's own, the last one
  // How many events each back-end got, by back-end and name.
  std::map<std::pair<std::string, std::string>, std::int64_t> counts;
};

// `now` in epoch seconds. The error names the file.
Result<SessionStory> storyOf(recorder::SessionReader& reader, const recorder::SessionRow& session, double now,
                             const ProgressHandler& progress = {});

// On one screen: of long lists the beginning, and how much more there is.
void printStory(const SessionStory& story, const TimeZone& zone, Output& output, const Terminal& terminal);
// One object with all of it.
std::string storyJson(const SessionStory& story);

}  // namespace tarn::ctl
