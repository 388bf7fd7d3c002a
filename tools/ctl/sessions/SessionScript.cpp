// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionScript.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <utility>

#include "plist/formats/Json.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionKeys.h"
#include "tools/ctl/terminal/JsonObject.h"
#include "tools/script/VocabularyNames.h"

namespace tarn::ctl {

namespace {

using recorder::PeriodRow;
using recorder::RepeatedRow;
using recorder::SessionRow;

// The name where a script may write it, else the number.
template <class Number>
void addNamed(JsonObject& line, std::string_view member, const std::string& name, Number number,
              const script::NameTable& names) {
  if (names.numberOf(name) == number) {
    line.add(member, name);
  } else {
    line.add(member, std::uint64_t{number});
  }
}

// A session's messages, starts and stops, told one after the other.
class Writer {
 public:
  Writer(const SessionRow& session, const std::vector<PeriodRow>& periods, const std::vector<SessionMessage>& messages,
         const std::vector<RepeatedRow>& repeated)
      : session_(session), periods_(periods), messages_(messages), repeated_(repeated) {}

  SessionScript write();

 private:
  // The service's own, for messages that name no session: it makes, starts and ends it itself.
  bool isOfTheService() const { return session_.connection == 0 && periods_.size() <= 1 && session_.reporter == 1; }
  void add(const JsonObject& line) { script_.lines.push_back(line.text()); }
  void addOperation(std::string_view op);
  void addMessage(const SessionMessage& message);
  void addRepeatedBefore(std::int64_t event);
  void addRepeated(const RepeatedRow& row);
  void addConfigurationBefore(const SessionMessage& message);
  void addConfiguration();
  // Starts and stops that came before this message.
  void goTo(const SessionMessage& message);
  void goTo(const RepeatedRow& row);
  void startNext();
  void stopCurrent();
  bool wasSummarised(const PeriodRow& period) const;

  const SessionRow& session_;
  const std::vector<PeriodRow>& periods_;
  const std::vector<SessionMessage>& messages_;
  const std::vector<RepeatedRow>& repeated_;
  SessionScript script_;
  std::size_t next_ = 0;          // period to be started
  std::size_t nextRepeated_ = 0;  // to be added
  bool isRunning_ = false;        // the period before that
  bool isConfigured_ = false;
};

void Writer::addOperation(std::string_view op) {
  JsonObject line;
  add(line.add("op", op).add("reporterID", session_.reporter));
}

void Writer::addConfiguration() {
  if (isConfigured_ || session_.application.empty()) return;
  isConfigured_ = true;
  JsonObject line;
  plist::Dictionary configuration;
  configuration.set(keys::kHostApplicationDisplayID, session_.application);
  add(line.add("op", "setConfiguration").add("reporterID", session_.reporter).add("configuration", configuration));
}

// Not earlier than it was known: until then messages were about an unknown application, and they are to stay so.
void Writer::addConfigurationBefore(const SessionMessage& message) {
  const plist::ValueView application = message.payload.get(keys::kHostApplicationDisplayID);
  if (application.isText() && application.text() == session_.application) {
    addConfiguration();
  }
}

void Writer::addMessage(const SessionMessage& message) {
  plist::Dictionary payload = message.payload;
  const plist::ValueView stamp = payload.get(keys::kTimestamp);
  const auto date = stamp.isText() ? report::secondsOfDateText(stamp.text()) : std::nullopt;
  if (date) {
    payload.set(keys::kTimestamp, plist::Date{*date});
  }
  const auto text = plist::jsonText(payload);
  const auto category = categoryNumber(message.category);
  const auto type = typeNumber(message.type);
  if (!text || !category || !type) {
    script_.leftOut.push_back(message.event);
    return;
  }
  JsonObject line;
  line.add("op", "sendMessage");
  if (!isOfTheService()) {
    line.addArray("reporterIDs", {std::to_string(session_.reporter)});
  }
  addNamed(line, "category", message.category, *category, script::categoryNames());
  addNamed(line, "type", message.type, *type, script::typeNames());
  add(line.addJson("message", *text));
}

// Those that came before the event.
void Writer::addRepeatedBefore(std::int64_t event) {
  for (; nextRepeated_ < repeated_.size() && repeated_[nextRepeated_].afterEvent < event; ++nextRepeated_) {
    addRepeated(repeated_[nextRepeated_]);
  }
}

// As the message that it repeats, but for its stamp.
void Writer::addRepeated(const RepeatedRow& row) {
  const auto found =
      std::lower_bound(messages_.begin(), messages_.end(), row.event.value_or(0),
                       [](const SessionMessage& message, std::int64_t id) { return message.event < id; });
  if (!row.event || found == messages_.end() || found->event != *row.event) {
    ++script_.unknownRepeated;
    return;
  }
  if (found->isDerived) return;
  SessionMessage message = *found;
  const plist::ValueView stamp = message.payload.get(keys::kTimestamp);
  const bool isDate = stamp.isText() && report::secondsOfDateText(stamp.text());
  if (row.stamp) {
    isDate ? message.payload.set(keys::kTimestamp, plist::Date{*row.stamp})
           : message.payload.set(keys::kTimestamp, *row.stamp);
  }
  goTo(row);
  addMessage(message);
}

bool Writer::wasSummarised(const PeriodRow& period) const {
  return std::any_of(messages_.begin(), messages_.end(), [&](const SessionMessage& message) {
    return isSessionSummary(message) && message.event >= period.firstEvent.value_or(0) &&
           message.event <= period.lastEvent.value_or(0);
  });
}

void Writer::startNext() {
  addOperation("startReportingSessionForID");
  ++next_;
  isRunning_ = true;
}

// One that was replaced while it ran derived nothing: a fresh one in its place does the same.
void Writer::stopCurrent() {
  const PeriodRow& period = periods_[next_ - 1];
  const bool wasReplaced = (session_.endReason == "replaced" || session_.endReason == "retyped") &&
                           next_ == periods_.size() && !wasSummarised(period);
  if (wasReplaced) {
    addOperation("createReportingSession");
  } else if (period.stopped) {
    addOperation("stopReportingSessionForID");
  }
  isRunning_ = false;
}

void Writer::goTo(const SessionMessage& message) {
  for (;;) {
    if (isRunning_ && periods_[next_ - 1].lastEvent && message.event > *periods_[next_ - 1].lastEvent) {
      stopCurrent();
    } else if (next_ < periods_.size() &&
               (periods_[next_].firstEvent ? message.event >= *periods_[next_].firstEvent
                                           : message.handedOver >= periods_[next_].started)) {
      if (isRunning_) {
        stopCurrent();
      }
      startNext();
    } else {
      return;
    }
  }
}

// Which period it came in is known, unlike of an event.
void Writer::goTo(const RepeatedRow& row) {
  while (row.period && next_ < periods_.size() && periods_[next_].id <= *row.period) {
    isRunning_ ? stopCurrent() : startNext();
  }
}

SessionScript Writer::write() {
  if (isOfTheService()) {
    for (const SessionMessage& message : messages_) {
      if (!message.isDerived) {
        addMessage(message);
      }
    }
    return std::move(script_);
  }
  addOperation("createReportingSession");
  if (session_.serviceType != static_cast<std::int64_t>(AudioServiceType::Unknown)) {
    JsonObject line;
    line.add("op", "setServiceType").add("reporterID", session_.reporter);
    addNamed(line, "serviceType", session_.serviceName, static_cast<std::uint64_t>(session_.serviceType),
             script::serviceTypeNames());
    add(line);
  }
  for (const SessionMessage& message : messages_) {
    addRepeatedBefore(message.event);
    goTo(message);
    addConfigurationBefore(message);
    if (!message.isDerived) {
      addMessage(message);
    }
  }
  addRepeatedBefore(std::numeric_limits<std::int64_t>::max());
  addConfiguration();
  while (isRunning_ || next_ < periods_.size()) {
    isRunning_ ? stopCurrent() : startNext();
  }
  if (session_.endReason == "destroyed") {
    addOperation("destroyReportingSession");
  }
  return std::move(script_);
}

}  // namespace

SessionScript scriptOf(const SessionRow& session, const std::vector<PeriodRow>& periods,
                       const std::vector<SessionMessage>& messages, const std::vector<RepeatedRow>& repeated) {
  return Writer(session, periods, messages, repeated).write();
}

}  // namespace tarn::ctl
