#include "tests/scenario/Comparison.h"

#include <algorithm>
#include <cmath>
#include <set>

namespace tarn::scenario {

namespace {

constexpr const char* kUptimeEvent = "sys.oxbow.tarnkit.tarnreportingclientuptime";

std::string shown(const RecordedEvent& event) {
  return event.backend + " event " + std::to_string(event.id) + " " + event.name + " " + event.payload.dump();
}

std::string shown(const ExpectedEvent& event) {
  return event.name + " (from " + event.origin + ") " + event.payload.dump();
}

}  // namespace

void Comparison::compareEvents(const std::vector<RecordedEvent>& events) {
  std::map<std::string, Lane> lanes;
  Lane uptimes;
  for (const RecordedEvent& event : events) {
    if (event.backend != "tally") {
      continue;
    }
    if (!event.payload.is_object()) {
      differences_.push_back("extra: " + shown(event));
    } else if (event.name == kUptimeEvent) {
      uptimes.push_back(&event);
    } else {
      lanes[event.payload.value("HostApplicationDisplayID", std::string("(no application)"))].push_back(&event);
    }
  }
  std::set<std::string> known;
  for (const Expectation& expectation : expectations_) {
    for (const auto& [application, expected] : expectation.events) {
      if (!known.insert(application).second) {
        differences_.push_back("two scripts report as " + application + ", so their events can't be told apart");
      }
      compareLane(application, expected, lanes[application]);
    }
  }
  for (const auto& [application, found] : lanes) {
    if (!known.contains(application)) {
      compareLane(application, {}, found);
    }
  }
  compareUptimes(uptimes);
}

// Walks both in order. Where they differ, the side whose event comes again sooner on the other one is behind.
void Comparison::compareLane(const std::string& application, const std::vector<ExpectedEvent>& expected,
                             const Lane& found) {
  std::size_t wanted = 0;
  std::size_t got = 0;
  const std::string where = application + ": ";
  while (wanted < expected.size() || got < found.size()) {
    const std::string difference = wanted < expected.size() && got < found.size()
                                       ? differenceOf(expected[wanted], *found[got])
                                       : "one side has ended";
    if (difference.empty()) {
      ++matched_;
      ++wanted;
      ++got;
      continue;
    }
    const auto comesLater = [&](std::size_t from) {
      return wanted < expected.size() &&
             std::any_of(found.begin() + static_cast<std::ptrdiff_t>(from), found.end(),
                         [&](const auto* one) { return differenceOf(expected[wanted], *one).empty(); });
    };
    if (got < found.size() && (wanted == expected.size() || comesLater(got))) {
      differences_.push_back(where + "extra: " + shown(*found[got++]));
    } else if (got < found.size() && expected[wanted].name == found[got]->name) {
      std::string text = where + "differs: ";
      text.append(shown(expected[wanted++])).append(" was expected, ");
      text.append(shown(*found[got++])).append(" arrived: ").append(difference);
      differences_.push_back(std::move(text));
    } else {
      differences_.push_back(where + "missing: " + shown(expected[wanted++]));
    }
  }
}

std::string Comparison::differenceOf(const ExpectedEvent& expected, const RecordedEvent& found) const {
  if (found.name != expected.name) {
    return "another name";
  }
  if (found.detail != json::object()) {
    return "the detail " + found.detail.dump();
  }
  return rules_.differenceOf(expected, found.payload);
}

// One event for each connection. Which is whose can't be told, so both sides are sorted.
void Comparison::compareUptimes(const Lane& found) {
  std::vector<double> least;
  for (const Expectation& expectation : expectations_) {
    least.insert(least.end(), expectation.connections.begin(), expectation.connections.end());
  }
  std::sort(least.begin(), least.end());
  std::vector<double> seconds;
  for (const RecordedEvent* event : found) {
    const json uptime = event->payload.value("seconds", json());
    if (event->payload.size() != 2 || !uptime.is_number_integer() ||
        !rules_.isClientName(event->payload.value("processName", json()))) {
      differences_.push_back("differs: " + shown(*event) + ", expected the client's processName and whole seconds");
      continue;
    }
    seconds.push_back(uptime.get<double>());
  }
  std::sort(seconds.begin(), seconds.end());
  if (seconds.size() != least.size()) {
    differences_.push_back("connections: " + std::to_string(least.size()) + " were made, " +
                           std::to_string(seconds.size()) + " uptimes arrived");
    return;
  }
  const double most =
      rules_.circumstances().endedAt - rules_.circumstances().startedAt + PayloadRules::kClockSlackSeconds;
  for (std::size_t index = 0; index < least.size(); ++index) {
    if (seconds[index] < std::floor(least[index]) || seconds[index] > most) {
      differences_.push_back("connections: an uptime of " + std::to_string(seconds[index]) + " s, expected from " +
                             std::to_string(std::floor(least[index])) + " to " + std::to_string(most));
    } else {
      ++matched_;
    }
  }
}

void Comparison::compareLedger(const json& ledger, std::size_t eventCount) {
  std::size_t messages = 0;
  for (const Expectation& expectation : expectations_) {
    messages += expectation.messages;
  }
  const std::map<std::string, json> expected = {{"messages_received", messages},
                                                {"recorder_handed_over", eventCount},
                                                {"recorder_committed", eventCount},
                                                {"recorder_waiting", 0},
                                                {"recorder_failed", 0},
                                                {"queued", 0},
                                                {"requests_refused", json::object()},
                                                {"connections_cut", json::object()}};
  for (const auto& [name, value] : expected) {
    json found = ledger.value(name, json());
    // A reason that was counted zero times is as good as none.
    for (auto reason = found.begin(); found.is_object() && reason != found.end();) {
      reason = *reason == 0 ? found.erase(reason) : std::next(reason);
    }
    if (found != value) {
      differences_.push_back("ledger: " + name + " is " + found.dump() + ", not " + value.dump());
    }
  }
}

void Comparison::compareReplies(const Expectation& expectation, const std::vector<json>& replies) {
  std::map<std::size_t, json> byLine;
  for (const json& reply : replies) {
    const auto line = reply.value("line", std::size_t{0});
    if (!byLine.emplace(line, reply).second) {
      differences_.push_back(expectation.script + ":" + std::to_string(line) + ": two replies");
    }
  }
  for (const ExpectedReply& expected : expectation.replies) {
    const std::string where = expectation.script + ":" + std::to_string(expected.line) + ": ";
    const auto found = byLine.find(expected.line);
    if (found == byLine.end()) {
      differences_.push_back(where + "no reply");
      continue;
    }
    const json reply = found->second;
    byLine.erase(found);
    const bool isRight = reply.value("error", json("none")).is_null() &&
                         (!expected.result || reply.value("result", json("none")) == *expected.result);
    if (!isRight) {
      differences_.push_back(where + "the reply " + reply.dump() + ", expected the result " +
                             expected.result.value_or(json("any")).dump());
    }
  }
  for (const auto& [line, reply] : byLine) {
    differences_.push_back(expectation.script + ":" + std::to_string(line) +
                           ": a reply that can't be: " + reply.dump());
  }
}

}  // namespace tarn::scenario
