#include "tests/scenario/ModelSession.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "tests/scenario/Vocabulary.h"

namespace tarn::scenario {

namespace {

constexpr const char* kStamp = "tarnreporting_timestamp";
constexpr double kYearSeconds = 365.0 * 86400;
constexpr std::uint16_t kTestService = 11;
constexpr std::uint16_t kApiUsageService = 12;
constexpr std::uint32_t kLagoon = 15;
constexpr std::uint16_t kSummary = 11;

// The session stops its producers in a fixed order: these two before the one that makes the summary.
bool isDerivedBeforeTheSummary(const DerivedMessage& message) {
  constexpr std::uint32_t kVolume = 14;
  return message.category == kVolume || message.category == kLagoon;
}

double now() {
  return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
}

// Whether the service puts its own stamp in.
bool mendStamp(json& payload) {
  const auto stamp = payload.find(kStamp);
  if (stamp == payload.end()) {
    payload["invalid_timestamp"] = "nil";
    return true;
  }
  if (stamp->get<double>() >= now() - kYearSeconds) {
    return false;
  }
  payload["invalid_timestamp"] = *stamp;
  payload.erase(kStamp);
  return true;
}

json withoutBlanksInKeys(const json& payload) {
  json mended = json::object();
  for (const auto& [key, value] : payload.items()) {
    if (key.find(' ') == std::string::npos) {
      mended[key] = value;
    }
  }
  for (const auto& [key, value] : payload.items()) {
    if (key.find(' ') != std::string::npos) {
      std::string name = key;
      std::replace(name.begin(), name.end(), ' ', '_');
      mended[name] = value;
    }
  }
  return mended;
}

}  // namespace

void ModelSession::configure(const json& configuration) {
  const auto host = configuration.find("KvHostApplicationDisplayID");
  if (host != configuration.end()) {
    configuration_["HostApplicationDisplayID"] = *host;
  }
  configuration_.update(configuration);
}

ModelSession ModelSession::successor(std::uint16_t type) const {
  ModelSession next(reporterID_);
  next.configuration_ = configuration_;
  next.type_ = type;
  return next;
}

void ModelSession::start(Expectation& expectation) {
  appendMarker(1);
  beginMirror(expectation);
  started_ = true;
  forwards_ = true;
}

void ModelSession::stop(const std::vector<DerivedMessage>& derived, bool internalBuild, Expectation& expectation) {
  const std::size_t received = log_.size() - 1;  // without the marker of the start
  appendMarker(2);
  const std::size_t withMarkers = log_.size();
  for (const DerivedMessage& message : derived) {
    if (isDerivedBeforeTheSummary(message)) {
      takeDerived(message, expectation);
    }
  }
  ExpectedEvent event;
  event.origin = expectation.script + ", the summary of " + application();
  event.isSummary = true;
  event.isMadeAtStop = true;
  take(summary(), 0x08000001U, kSummary, event, expectation);
  for (const DerivedMessage& message : derived) {
    if (!isDerivedBeforeTheSummary(message)) {
      takeDerived(message, expectation);
    }
  }
  if (type_ == kTestService || internalBuild) {
    expectation.files.push_back(
        {reporterID_, application(), serviceText(type_), received, beforeStart_, log_.size() - withMarkers});
  }
  if (mirror_) {
    expectation.mirrors[*mirror_].isEnded = true;
    mirror_.reset();
  }
  log_.clear();
  beforeStart_ = 0;
  received_ = 0;
  started_ = false;
  forwards_ = false;
}

void ModelSession::takeDerived(const DerivedMessage& message, Expectation& expectation) {
  ++expectation.derived;
  ExpectedEvent event;
  event.origin = message.origin;
  event.isMadeAtStop = true;
  event.isMirrored = message.category != kLagoon;  // the others are for everyone
  take(message.payload, message.category, message.type, event, expectation);
}

void ModelSession::receive(const json& message, std::uint32_t category, std::uint16_t type, const std::string& origin,
                           Expectation& expectation) {
  ++expectation.deliveries;
  ExpectedEvent event;
  event.origin = origin;
  if (!take(message, category, type, event, expectation)) {
    ++expectation.redundant;
  }
}

bool ModelSession::take(json payload, std::uint32_t category, std::uint16_t type, ExpectedEvent event,
                        Expectation& expectation) {
  ++received_;
  event.hasFreshStamp = mendStamp(payload);
  payload = withoutBlanksInKeys(payload);
  payload["audiotag"] = categoryText(category) + typeText(type);
  if (payload.value("HostApplicationDisplayID", std::string("Unknown")) == "Unknown") {
    payload["HostApplicationDisplayID"] = application();
  }
  Record record{category, type, payload};
  for (const char* key : {"processuptime_ms", "systemuptime_sec", kStamp}) {
    record.compared.erase(key);
  }
  if (isRepeated(record)) {
    return false;
  }
  log_.push_back(record);
  if (!started_) {
    ++beforeStart_;
  } else if (!isSingle_) {
    count(payload);
  }
  forward(payload, category, type, event, expectation);
  if (isSingle_ && !mirror_) {
    beginMirror(expectation);  // it is started by its first message
  }
  mirror(payload, category, type, std::move(event), expectation);
  return true;
}

bool ModelSession::isRepeated(const Record& record) const {
  if (record.type == 6 || record.category == 11) {
    return false;
  }
  for (auto earlier = log_.rbegin(); earlier != log_.rend(); ++earlier) {
    if (earlier->category == record.category && earlier->type == record.type) {
      return earlier->compared == record.compared;
    }
  }
  return false;
}

void ModelSession::count(const json& payload) {
  const auto duration = payload.find("session_duration");
  if (duration != payload.end()) {
    activeTime_ += duration->get<double>();
    ++activeCount_;
  } else if (payload.value("issue_type", json()) == "overload") {
    ++overloads_;
  }
}

void ModelSession::appendMarker(std::uint16_t type) {
  log_.push_back({8, type, json("marker")});
}

void ModelSession::forward(const json& payload, std::uint32_t category, std::uint16_t type, ExpectedEvent event,
                           Expectation& expectation) const {
  if (!forwards_) {
    return;
  }
  event.payload = payload;
  const std::string what = categoryText(category) + "." + typeText(type);
  auto& lane = expectation.events[payload.at("HostApplicationDisplayID").get<std::string>()];
  event.name = "sys.oxbow.tarnkit." + what;
  lane.push_back(event);
  event.name = "sys.oxbow." + serviceText(type_) + "." + what;
  lane.push_back(event);
}

void ModelSession::beginMirror(Expectation& expectation) {
  if (type_ == kTestService) {
    return;
  }
  mirror_ = expectation.mirrors.size();
  ExpectedMirror& mirror = expectation.mirrors.emplace_back();
  mirror.reporterID = reporterID_;
  mirror.serviceType = type_;
  const bool isRealTime = type_ == kApiUsageService;
  mirror.sessionInfo = {{"clientType", 19},
                        {"clientVersion", 2.1},
                        {"sessionID", reporterID_},
                        {"batchEvent", !isRealTime},
                        {"containsRealtimeEvents", isRealTime}};
  json configuration = configuration_;
  if (isSingle_) {
    configuration["HostApplicationDisplayID"] = application();
  }
  if (const auto host = configuration.find("HostApplicationDisplayID"); host != configuration.end()) {
    mirror.sessionInfo["clientBundleID"] = *host;
  }
  mirror.userInfo = {{"clientName", "sys.oxbow.tarnkit"},
                     {"TarnReportingSessionID", reporterID_},
                     {"serviceName", serviceText(type_) + (isSingle_ ? "" : "_session")}};
  mirror.userInfo.update(configuration);
}

void ModelSession::mirror(const json& payload, std::uint32_t category, std::uint16_t type, ExpectedEvent event,
                          Expectation& expectation) const {
  if (!mirror_ || !event.isMirrored) {
    return;
  }
  event.payload = payload;
  event.category = static_cast<std::uint16_t>(category & 0xFFFFU);
  event.type = type;
  expectation.mirrors[*mirror_].messages.push_back(std::move(event));
}

void ModelSession::leaveTextsOpen(const std::set<std::string>& keys, Expectation& expectation) const {
  if (mirror_) {
    expectation.mirrors[*mirror_].openTexts.insert(keys.begin(), keys.end());
  }
}

// As the service reads the counts: both markers are in the log by now.
json ModelSession::summary() const {
  const auto unique = static_cast<std::int64_t>(log_.size());
  return {{"total_active_time", activeTime_},
          {"active_count", activeCount_},
          {"overload_count", overloads_},
          {"average_active_time", activeCount_ == 0 ? 0.0 : activeTime_ / static_cast<double>(activeCount_)},
          {"num_messages", received_},
          {"num_unique_messages", unique},
          {"num_redundant_messages", received_ - unique},
          {"singleMessageSession", false},
          {"summaryServiceName", serviceText(type_)},
          {"HostApplicationDisplayID", application()}};
}

}  // namespace tarn::scenario
