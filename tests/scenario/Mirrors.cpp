#include "tests/scenario/Mirrors.h"

#include <algorithm>
#include <cstdio>
#include <numeric>
#include <set>

namespace tarn::scenario {

namespace {

constexpr const char* kStamp = "tarnreporting_timestamp";
constexpr const char* kSummaryMember = "Tarn_Session_Summary_Event";
constexpr std::uint16_t kUnknown = 65535;

// The start, and for a stop the summary event and the flush.
std::size_t eventsOf(const ExpectedMirror& mirror) {
  return 1 + mirror.messages.size() + (mirror.isEnded ? 2 : 0);
}

std::string textOf(const json& value) {
  if (value.is_string()) {
    return value.get<std::string>();
  }
  if (value.is_boolean()) {
    return value.get<bool>() ? "1" : "0";
  }
  if (value.is_array()) {
    std::string text;
    for (const json& item : value) {
      text += (text.empty() ? "" : ", ") + textOf(item);
    }
    return "(" + text + ")";
  }
  const std::string text = value.dump();
  return text.ends_with(".0") ? text.substr(0, text.size() - 2) : text;
}

// A stamp of the service's own is of now, while those of the scripts lie ahead.
double stampOf(const ExpectedEvent& event) {
  return event.hasFreshStamp ? 0 : event.payload.value(kStamp, 0.0);
}

// The messages as the session's log has them at a stop: by stamp, then those that the stop itself made.
std::vector<std::size_t> logOrder(const std::vector<ExpectedEvent>& messages) {
  std::vector<std::size_t> order(messages.size());
  std::iota(order.begin(), order.end(), std::size_t{0});
  const auto received = std::stable_partition(order.begin(), order.end(),
                                              [&](std::size_t index) { return !messages[index].isMadeAtStop; });
  std::stable_sort(order.begin(), received, [&](std::size_t left, std::size_t right) {
    return stampOf(messages[left]) < stampOf(messages[right]);
  });
  return order;
}

// The keys whose texts aren't worked out here. Rapid changes of spatialisation are combined in the log at the stop: a
// message that tells one may have got values of another since it was sent.
std::set<std::string> openTextsOf(const ExpectedMirror& mirror) {
  std::set<std::string> combined;
  std::size_t count = 0;
  for (const ExpectedEvent& message : mirror.messages) {
    if (message.payload.contains("spatial-audio-accessory-feature") ||
        message.payload.contains("spatializationEnabled")) {
      ++count;
      for (const auto& [key, value] : message.payload.items()) {
        combined.insert(key);
      }
    }
  }
  std::set<std::string> keys = mirror.openTexts;
  if (count > 1) {
    keys.merge(combined);
    keys.insert(kStamp);
  }
  return keys;
}

bool isOfService(const RecordedEvent& event) {
  return event.backend == "rtc";
}

// Tells sessions of different reporter IDs and types apart.
std::string keyOf(const json& userInfo) {
  return textOf(userInfo.value("TarnReportingSessionID", json(0))) + " " +
         textOf(userInfo.value("serviceName", json("")));
}

std::string membersThatDiffer(const json& wanted, const json& found) {
  for (const auto& [key, value] : wanted.items()) {
    if (!found.contains(key) || found.at(key) != value) {
      return key + " is " + found.value(key, json()).dump() + ", not " + value.dump();
    }
  }
  return found.size() == wanted.size() ? std::string() : "members beyond those expected: " + found.dump();
}

std::string shown(const RecordedEvent& event) {
  return "rtc event " + std::to_string(event.id) + " " + event.name + " " + event.payload.dump() + " " +
         event.detail.dump();
}

}  // namespace

std::size_t mirrorEvents(const std::vector<Expectation>& expectations) {
  std::size_t count = 0;
  for (const Expectation& expectation : expectations) {
    for (const ExpectedMirror& mirror : expectation.mirrors) {
      count += eventsOf(mirror);
    }
  }
  return count;
}

void MirrorComparison::compare(const std::vector<RecordedEvent>& events) {
  for (const RecordedEvent& event : events) {
    if (isOfService(event)) {
      sessions_[event.detail.value("session", std::int64_t{0})].push_back(&event);
    }
  }
  // A session that replaces another on a change of type has a queue of its own, so only those of one type are in order.
  std::map<std::string, std::vector<std::int64_t>> numbers;
  for (const auto& [number, found] : sessions_) {
    numbers[keyOf(found.front()->payload.value("userInfo", json::object()))].push_back(number);
  }
  for (const Expectation& expectation : expectations_) {
    for (const ExpectedMirror& mirror : expectation.mirrors) {
      const std::string where = expectation.script + ", the mirror of " + std::to_string(mirror.reporterID) + ": ";
      std::vector<std::int64_t>& left = numbers[keyOf(mirror.userInfo)];
      if (left.empty()) {
        differences_.push_back(where + "missing");
        continue;
      }
      compareSession(where, mirror, sessions_.at(left.front()));
      left.erase(left.begin());
    }
  }
  for (const auto& [key, left] : numbers) {
    for (const std::int64_t number : left) {
      differences_.push_back("extra: " + shown(*sessions_.at(number).front()));
    }
  }
}

void MirrorComparison::compareSession(const std::string& where, const ExpectedMirror& expected, const Events& found) {
  if (found.size() != eventsOf(expected)) {
    differences_.push_back(where + std::to_string(found.size()) + " events, expected " +
                           std::to_string(eventsOf(expected)));
  }
  const std::size_t messages = expected.messages.size();
  for (std::size_t index = 0; index < std::min(found.size(), eventsOf(expected)); ++index) {
    const RecordedEvent& event = *found[index];
    std::string difference;
    if (index == 0) {
      difference = differenceOfInfo(expected, event);
    } else if (index <= messages) {
      difference = differenceOfMessage(expected.messages[index - 1], event);
    } else if (index == messages + 1) {
      difference = differenceOfSummary(expected, found, event);
    } else if (event.name != "flush" || event.payload != json::object()) {
      difference = "a flush was expected";
    }
    if (difference.empty()) {
      ++matched_;
    } else {
      differences_.push_back(
          std::string(where).append("differs: ").append(shown(event)).append(": ").append(difference));
    }
  }
}

std::string MirrorComparison::differenceOfInfo(const ExpectedMirror& expected, const RecordedEvent& found) const {
  if (found.name != "createSession" || found.payload.size() != 2) {
    return "createSession was expected";
  }
  json info = found.payload.value("sessionInfo", json::object());
  if (textOf(info.value("hierarchyToken", json(""))).empty()) {
    return "there is no token";
  }
  info.erase("hierarchyToken");
  const std::string difference = membersThatDiffer(expected.sessionInfo, info);
  return difference.empty() ? membersThatDiffer(expected.userInfo, found.payload.value("userInfo", json::object()))
                            : difference;
}

std::string MirrorComparison::differenceOfMessage(const ExpectedEvent& expected, const RecordedEvent& found) const {
  if (found.name != "sendMessage" || found.detail.value("category", 0) != expected.category ||
      found.detail.value("type", 0) != expected.type) {
    return "the message from " + expected.origin + " was expected";
  }
  ExpectedEvent event = expected;
  if (!internalBuild_) {
    event.hasFreshStamp = false;
    event.payload.erase(kStamp);
  }
  return rules_.differenceOf(event, found.payload);
}

// The summary event joins what the messages said, which was compared before. All of its texts come from there.
std::string MirrorComparison::differenceOfSummary(const ExpectedMirror& expected, const Events& messages,
                                                  const RecordedEvent& found) const {
  if (found.name != "sendMessage" || found.detail.value("category", 0) != kUnknown ||
      found.detail.value("type", 0) != kUnknown) {
    return "the summary event was expected";
  }
  json texts = {{kSummaryMember, std::to_string(expected.serviceType)}};
  for (const std::size_t index : logOrder(expected.messages)) {
    for (const auto& [key, value] : messages[index + 1]->payload.items()) {
      const auto text = texts.find(key);
      texts[key] = text == texts.end() ? textOf(value) : text->get<std::string>() + "," + textOf(value);
    }
  }
  json payload = found.payload;
  for (const std::string& key : openTextsOf(expected)) {
    if (texts.contains(key) != payload.contains(key)) {
      return key + " is " + (payload.contains(key) ? "extra" : "missing");
    }
    texts.erase(key);
    payload.erase(key);
  }
  return membersThatDiffer(texts, payload);
}

void MirrorComparison::print() const {
  std::printf("mirrored sessions\n");
  for (const auto& [number, found] : sessions_) {
    const json user = found.front()->payload.value("userInfo", json::object());
    const bool isFlushed = found.back()->name == "flush";
    std::printf("  %2lld  %-24s %-28s %3zu messages%s\n", static_cast<long long>(number),
                textOf(user.value("serviceName", json(""))).c_str(),
                textOf(user.value("HostApplicationDisplayID", json("(no application)"))).c_str(),
                found.size() - (isFlushed ? 3 : 1), isFlushed ? ", flushed" : "");
    if (!isFlushed) {
      continue;
    }
    constexpr std::size_t kWidth = 110;
    const std::string tags = textOf(found[found.size() - 2]->payload.value("audiotag", json("")));
    std::printf("      summary event of %zu members; audiotag \"%s\"\n", found[found.size() - 2]->payload.size(),
                (tags.size() > kWidth ? tags.substr(0, kWidth) + "..." : tags).c_str());
  }
}

}  // namespace tarn::scenario
