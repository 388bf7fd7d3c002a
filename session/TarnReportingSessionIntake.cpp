// SPDX-License-Identifier: Apache-2.0
// The intake of TarnReportingSession: what happens to a message before any worker sees it, and to whom it goes.
#include <array>
#include <cassert>
#include <unordered_map>

#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/TracePoints.h"
#include "plist/Value.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "service/vocabulary/TarnReportingServerQueue.h"
#include "service/vocabulary/TarnReportingSignpost.h"
#include "service/vocabulary/TarnReportingUtility.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionKeys.h"

namespace tarn {

namespace {

constexpr std::string_view kModule = "TarnReportingSession";
constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, kModule};
constexpr std::uint32_t kTraceMessage = 0x21044838;
constexpr double kOldestStampSeconds = 31536000;  // 365 days

std::string withoutBlanks(std::string_view key) {
  std::string replaced(key);
  for (char& character : replaced) {
    if (character == ' ') {
      character = '_';
    }
  }
  return replaced;
}

bool isStale(const plist::ValueView& stamp, double now) {
  return stamp.asDouble() < now - kOldestStampSeconds;
}

std::string tagOf(const TarnReportingSessionMessage& message) {
  std::string tag = TarnReportingUtilityCategoryString(message.category());
  tag += TarnReportingUtilityTypeString(message.type());
  return tag;
}

}  // namespace

std::size_t TarnReportingSession::sendMessage(const MessagePointer& message, platform::Reply<> reply) {
  assert(TarnReportingIsOnServerQueue());
  const TarnReportingSignpost signpost(SignpostCategory::Message, kModule, "sendMessage", {"reporterID", reporterID_});
  const platform::SessionScope scope = chronicle_.enter();
  ++totalMessageCount_;
  complete(*message);
  const std::size_t workers = takeIn(message);
  if (reply) {
    reply(std::nullopt);
  }
  return workers;
}

TarnReportingSession::Taken TarnReportingSession::sendMessage(const plist::PackedBuilder::Draft& draft,
                                                              AudioEventCategory category, AudioEventType type) {
  assert(TarnReportingIsOnServerQueue());
  const TarnReportingSignpost signpost(SignpostCategory::Message, kModule, "sendMessage", {"reporterID", reporterID_});
  const platform::SessionScope scope = chronicle_.enter();
  const auto [message, isComplete] = makeMessage(draft, category, type);
  ++totalMessageCount_;
  if (!isComplete) {
    complete(*message);
  }
  const std::size_t workers = takeIn(message);
  return {message->isRedundant(), workers};
}

// As complete() would leave it, where that would add tag and application and nothing else.
std::pair<TarnReportingSession::MessagePointer, bool> TarnReportingSession::makeMessage(
    const plist::PackedBuilder::Draft& draft, AudioEventCategory category, AudioEventType type) {
  const TarnReportingSessionTags::Known* const known = tags().find(draft, category, type, application_);
  const bool isPlain =
      known != nullptr && !isStale(draft.at(known->stamp), TarnReportingFacilities().clock.epochSeconds());
  return {std::make_shared<TarnReportingSessionMessage>(isPlain ? known->added.addedTo(draft) : draft.dictionary(),
                                                        category, type),
          isPlain};
}

void TarnReportingSession::complete(TarnReportingSessionMessage& message) {
  addMissingDates(message);
  removeWhiteSpaceFromKeys(message);
  addTagAndAppName(message);
}

std::size_t TarnReportingSession::takeIn(const MessagePointer& message) {
  TarnReportingFacilities().tracePoints.emit(kTraceMessage, reporterID_);
  message->setIsSessionStarted(started_);
  message->setIsRedundant(messageIsRedundant(*message));
  message->isRedundant() ? chronicle_.countRepeated(message->message()) : chronicle_.count();
  kLog(
      LogLevel::Debug, "TarnReportingSessionWorker action=sendMessage reporterID=%lli app=%@ redundant=%@ message=%@",
      reporterID_, [&] { return TarnReportingUtilityRetrieveAppName(configuration_); },
      message->isRedundant() ? "YES" : "NO", message->message());
  previousValues_.merge(message->message());
  if (!message->isRedundant()) {
    log_.append(message);
  }
  return workers_.deliver(message, reporterID_);
}

TarnReportingSessionTags& TarnReportingSession::tags() {
  if (!tags_) [[unlikely]] {
    tags_ = ProcessState::of<TarnReportingSessionTags>();
  }
  return *tags_;
}

void TarnReportingSession::addMissingDates(TarnReportingSessionMessage& message) {
  const double now = TarnReportingFacilities().clock.epochSeconds();
  plist::Dictionary& payload = message.mutableMessage();
  const plist::ValueView stamp = payload.get(keys::kTimestamp);
  if (!stamp) {
    payload.set(keys::kInvalidTimestamp, "nil");
    payload.set(keys::kTimestamp, now);
  } else if (isStale(stamp, now)) {
    payload.set(keys::kInvalidTimestamp, stamp);
    payload.set(keys::kTimestamp, now);
  }
}

void TarnReportingSession::removeWhiteSpaceFromKeys(TarnReportingSessionMessage& message) {
  plist::Dictionary& payload = message.mutableMessage();
  if (!payload.hasKeyWithBlank()) return;
  // Later entries win over earlier ones of the same new name, and all of them over a key that had no blank.
  std::vector<plist::Key> names;
  names.reserve(payload.size());
  std::vector<plist::Dictionary::Entry> entries;
  std::unordered_map<plist::Key, std::size_t> places;
  for (const plist::Dictionary::Entry& entry : payload) {
    if (!entry.key.hasBlank()) {
      places.emplace(entry.key, entries.size());
      entries.push_back(entry);
    }
  }
  for (const plist::Dictionary::Entry& entry : payload) {
    if (!entry.key.hasBlank()) continue;
    names.emplace_back(withoutBlanks(entry.key.text()));
    const auto [place, isNew] = places.emplace(names.back(), entries.size());
    if (isNew) {
      entries.push_back({names.back(), entry.value});
    } else {
      entries[place->second].value = entry.value;
    }
  }
  payload = plist::Dictionary::fromEntries(entries);
}

// Nearly every message comes without a tag and an application of its own: then its block grows once for both.
void TarnReportingSession::addTagAndAppName(TarnReportingSessionMessage& message) {
  {
    const MutexLock guard(message);
    if (tags().addTo(message.mutableMessage(), message.category(), message.type(), application_)) return;
  }
  addAudioMessageTag(message);
  addAppName(message);
}

void TarnReportingSession::addAudioMessageTag(TarnReportingSessionMessage& message) {
  message.mutableMessage().set(keys::kAudioTag, tagOf(message));
}

void TarnReportingSession::addAppName(TarnReportingSessionMessage& message) const {
  const MutexLock guard(message);
  plist::Dictionary& payload = message.mutableMessage();
  const plist::ValueView present = payload.get(keys::kHostApplicationDisplayID);
  if (present && !(present == plist::ValueView("Unknown"))) return;
  payload.set(keys::kHostApplicationDisplayID, application_.text());
}

bool TarnReportingSession::messageIsRedundant(const TarnReportingSessionMessage& message) const {
  static const std::array<plist::Key, 3> kIgnored{keys::kProcessUptime, keys::kSystemUptime, keys::kTimestamp};
  if (message.type() == AudioEventType::Error || message.category() == AudioEventCategory::Error) return false;
  const TarnReportingSessionMessage* const earlier = log_.newest(message.category(), message.type());
  if (earlier == nullptr || !message.message().equalsIgnoring(earlier->message(), kIgnored)) return false;
  kLog(LogLevel::Debug, "marking event redundant");
  return true;
}

double TarnReportingSession::getEpochTimeFromTarnReportingStateMessage(const TarnReportingSessionMessage& message) {
  return message.message().get(keys::kTimestamp).asDouble();
}

}  // namespace tarn
