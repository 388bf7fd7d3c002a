#include "tools/scenario/Account.h"

#include <cstdio>
#include <map>

namespace tarn::scenario {

namespace {

std::string applicationOf(const RecordedEvent& event) {
  return event.payload.value("HostApplicationDisplayID", std::string());
}

bool isOneOf(const RecordedEvent& event, const std::string& application) {
  return event.backend == "tally" && applicationOf(event) == application;
}

void printSummary(const RecordedEvent& event) {
  const json& payload = event.payload;
  const auto number = [&payload](const char* key) { return payload.value(key, json()).dump(); };
  std::printf("      summary  %s messages, %s in the log, %s redundant; active %s s in %s, %s overloads; %s, %s\n",
              number("num_messages").c_str(), number("num_unique_messages").c_str(),
              number("num_redundant_messages").c_str(), number("total_active_time").c_str(),
              number("active_count").c_str(), number("overload_count").c_str(), number("summaryServiceName").c_str(),
              number("thermal_state").c_str());
}

void printApplication(const std::string& application, std::size_t expected, const std::vector<RecordedEvent>& events) {
  std::size_t count = 0;
  std::string road;
  std::string last;
  for (const RecordedEvent& event : events) {
    if (!isOneOf(event, application)) {
      continue;
    }
    ++count;
    const std::string tag = event.payload.value("audiotag", std::string("?"));
    // Each message is two events, and runs of one kind are told once.
    if (tag != last) {
      road += (road.empty() ? "" : " ") + tag;
      last = tag;
    }
  }
  std::printf("    %-28s %3zu events (%zu expected)\n", application.c_str(), count, expected);
  constexpr std::size_t kRoadWidth = 400;
  if (road.size() > kRoadWidth) {
    road.resize(road.find_last_of(' ', kRoadWidth));
    road += " ...";
  }
  std::printf("      %s\n", road.c_str());
  for (const RecordedEvent& event : events) {
    if (isOneOf(event, application) && event.name == "sys.oxbow.tarnkit.Session_Generic.Summary") {
      printSummary(event);
    }
  }
}

}  // namespace

void printBackends(const std::vector<RecordedEvent>& events) {
  std::map<std::string, std::map<std::string, std::size_t>> backends;
  for (const RecordedEvent& event : events) {
    ++backends[event.backend][event.name];
  }
  std::printf("back-ends\n");
  for (const auto& [backend, names] : backends) {
    std::size_t total = 0;
    for (const auto& [name, count] : names) {
      total += count;
    }
    std::printf("  %s: %zu events of %zu names\n", backend.c_str(), total, names.size());
    for (const auto& [name, count] : names) {
      std::printf("    %4zu  %s\n", count, name.c_str());
    }
  }
}

void printSessions(const std::vector<Expectation>& expectations, const std::vector<RecordedEvent>& events) {
  std::printf("sessions\n");
  for (const Expectation& expectation : expectations) {
    std::printf("  %s: %zu connections, %zu sessions, %zu messages in %zu deliveries, %zu of them redundant\n",
                expectation.script.c_str(), expectation.connections.size(), expectation.sessions, expectation.messages,
                expectation.deliveries, expectation.redundant);
    for (const auto& [application, expected] : expectation.events) {
      printApplication(application, expected.size(), events);
    }
  }
}

}  // namespace tarn::scenario
