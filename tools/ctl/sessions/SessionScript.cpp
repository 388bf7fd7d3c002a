// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionScript.h"

#include <algorithm>
#include <optional>
#include <utility>

#include "plist/formats/Json.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionKeys.h"
#include "tools/ctl/sessions/JsonObject.h"
#include "tools/script/VocabularyNames.h"

namespace tarn::ctl {

namespace {

using recorder::PeriodRow;
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
  Writer(const SessionRow& session, const std::vector<PeriodRow>& periods, const std::vector<SessionMessage>& messages)
      : session_(session), periods_(periods), messages_(messages) {}

  SessionScript write();

 private:
  // The service's own, for messages that name no session: it makes, starts and ends it itself.
  bool isOfTheService() const { return session_.connection == 0 && periods_.size() <= 1 && session_.reporter == 1; }
  void add(const JsonObject& line) { script_.lines.push_back(line.text()); }
  void addOperation(std::string_view op);
  void addMessage(const SessionMessage& message);
  void addConfigurationBefore(const SessionMessage& message);
  void addConfiguration();
  // Starts and stops that came before this message.
  void goTo(const SessionMessage& message);
  void startNext();
  void stopCurrent();
  bool wasSummarised(const PeriodRow& period) const;

  const SessionRow& session_;
  const std::vector<PeriodRow>& periods_;
  const std::vector<SessionMessage>& messages_;
  SessionScript script_;
  std::size_t next_ = 0;    // period to be started
  bool isRunning_ = false;  // the one before that
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
    goTo(message);
    addConfigurationBefore(message);
    if (!message.isDerived) {
      addMessage(message);
    }
  }
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
                       const std::vector<SessionMessage>& messages) {
  return Writer(session, periods, messages).write();
}

}  // namespace tarn::ctl
