// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionStory.h"

#include <algorithm>
#include <map>

#include "tools/ctl/sessions/SessionEvents.h"

namespace tarn::ctl {

namespace {

// The system monitor's message of a setting has this beside it.
constexpr const char* kLastUpdated = "last_updated";

void noteSettings(const SessionMessage& message, plist::Dictionary& device) {
  if (!message.is("Setup", "Setup") || !message.payload.contains(kLastUpdated)) return;
  for (const auto& entry : message.payload) {
    const std::string_view key = entry.key.text();
    if (key == "ringerstate" || key == "device_name" || key == "spatial-audio-accessory-feature") {
      device.set(entry.key, entry.value);
    }
  }
}

std::vector<std::pair<std::string, std::size_t>> issuesOf(const SessionTimeline& timeline) {
  std::map<std::string, std::size_t> counts;
  for (const auto& overload : timeline.overloads) {
    ++counts["overload " + overload.text];
  }
  for (const auto& error : timeline.errors) {
    ++counts[error.text];
  }
  std::vector<std::pair<std::string, std::size_t>> issues(counts.begin(), counts.end());
  std::stable_sort(issues.begin(), issues.end(),
                   [](const auto& one, const auto& other) { return one.second > other.second; });
  return issues;
}

void sortMessages(std::vector<SessionMessage>& messages, SessionStory& story) {
  for (SessionMessage& message : messages) {
    noteSettings(message, story.device);
    if (isSessionSummary(message)) {
      story.summary = std::move(message);
    } else if (message.isDerived) {
      story.segments.push_back(std::move(message));
    }
  }
}

}  // namespace

Result<SessionStory> storyOf(recorder::SessionReader& reader, const recorder::SessionRow& session, double now,
                             const ProgressHandler& progress) {
  auto overviews = overviewsOf(reader, {session}, now);
  if (overviews.failed()) return {{}, overviews.error};
  auto run = reader.run(session.run);
  if (run.failed()) return {{}, run.error};
  SessionStory story;
  std::vector<SessionMessage> messages;
  MessageSieve sieve;
  EventProgress told(overviews.value.front().periods, progress);
  const Status read = eachEvent(reader.file(), session.id, 0, [&](recorder::EventRow&& row) {
    told.at(row.id);
    ++story.counts[{row.backend, row.name}];
    auto message = sieve.letsThrough(row) ? messageOf(row) : std::nullopt;
    if (message) {
      messages.push_back(std::move(*message));
    }
    return true;
  });
  if (read.failed()) return {{}, read};
  story.overview = std::move(overviews.value.front());
  story.run = std::move(run.value);
  story.timeline = timelineOf(messages);
  story.issues = issuesOf(story.timeline);
  sortMessages(messages, story);
  return {std::move(story), {}};
}

}  // namespace tarn::ctl
