#include "tests/scenario/Account.h"

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

std::string text(const json& payload, const char* key) {
  const json value = payload.value(key, json());
  return value.is_string() ? value.get<std::string>() : value.dump();
}

std::string cut(const std::string& line, std::size_t width) {
  return line.size() <= width ? line : line.substr(0, width - 3) + "...";
}

void printSummary(const json& payload) {
  std::printf("      summary  %s messages, %s in the log, %s redundant; active %s s in %s, %s overloads; %s, %s\n",
              text(payload, "num_messages").c_str(), text(payload, "num_unique_messages").c_str(),
              text(payload, "num_redundant_messages").c_str(), text(payload, "total_active_time").c_str(),
              text(payload, "active_count").c_str(), text(payload, "overload_count").c_str(),
              text(payload, "summaryServiceName").c_str(), text(payload, "thermal_state").c_str());
}

constexpr const char* kDriverMessage = "sys.oxbow.tarnkit.Flume.";

// What drivers counted: the members are named for driver, group and channel.
void printDriver(const json& payload) {
  for (const auto& [key, value] : payload.items()) {
    if (key != "audiotag" && key != "HostApplicationDisplayID" && !key.ends_with("timestamp")) {
      std::printf("      driver   %s = %s\n", key.c_str(),
                  value.is_string() ? value.get<std::string>().c_str() : value.dump().c_str());
    }
  }
}

// "Speaker, flac 44100 Hz stereo (flac, 2 channels)".
std::string outputOf(const json& payload) {
  return text(payload, "active_devices") + ", " + text(payload, "session_selected_format") + " (" +
         text(payload, "mFormatID") + ", " + text(payload, "mChannelsPerFrame") + " channels)";
}

std::string derivedText(const RecordedEvent& event) {
  const json& payload = event.payload;
  const std::string number = text(payload, "msgidx") + " of " + text(payload, "msgcnt") + ": ";
  if (payload.contains("KvSessionVolumeBucketed")) {
    std::string line = "volume " + number + text(payload, "play_seconds") + " s (about " +
                       text(payload, "play_secondsBucketed") + ") at " + text(payload, "KvSessionVolume") + " (about " +
                       text(payload, "KvSessionVolumeBucketed") + ") on " + outputOf(payload);
    for (const char* flag : {"spatializationEnabled", "spatial-audio-accessory-feature", "ringerstate"}) {
      line += payload.value(flag, json()) == true ? std::string(", ") + flag : std::string();
    }
    return line;
  }
  if (payload.contains("inputrunning_secondsBucketed")) {
    return "input " + number + text(payload, "inputrunning_seconds") + " s (about " +
           text(payload, "inputrunning_secondsBucketed") + ") on " + text(payload, "active_devices") + ", " +
           text(payload, "vp_config_operation_mode") + " from " + text(payload, "vp_config_input_port") +
           (payload.contains("vocoders") ? ", " + text(payload, "vocoders") : std::string());
  }
  return "group " + number + text(payload, "play_seconds") + " s (about " + text(payload, "play_secondsBucketed") +
         ") on " + outputOf(payload);
}

// A summary of the volume, input or group rule; clients send none with a number.
bool isDerived(const RecordedEvent& event) {
  return event.payload.contains("msgidx") &&
         (event.name == "sys.oxbow.tarnkit.Volume.Summary" || event.name == "sys.oxbow.tarnkit.Input.Summary" ||
          event.name == "sys.oxbow.tarnkit.Lagoon.Summary");
}

// Category and type for the names that have them, each of which comes with every service's name in it.
std::string shortName(const RecordedEvent& event) {
  const std::size_t type = event.name.find_last_of('.');
  const std::size_t category = type == std::string::npos || type == 0 ? type : event.name.find_last_of('.', type - 1);
  return event.backend == "tally" && category != std::string::npos ? event.name.substr(category + 1) : event.name;
}

void printNames(const std::map<std::string, std::size_t>& names) {
  constexpr std::size_t kWidth = 118;
  std::string line;
  for (const auto& [name, count] : names) {
    const std::string item = name + " " + std::to_string(count);
    if (line.size() + item.size() > kWidth) {
      std::printf("    %s\n", line.c_str());
      line.clear();
    }
    line += (line.empty() ? "" : ", ") + item;
  }
  std::printf("    %s\n", line.c_str());
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
    if (!isOneOf(event, application)) {
      continue;
    }
    if (isDerived(event)) {
      std::printf("      derived  %s\n", derivedText(event).c_str());
    } else if (event.name == "sys.oxbow.tarnkit.Session_Generic.Summary") {
      printSummary(event.payload);
    } else if (event.name.starts_with(kDriverMessage)) {
      printDriver(event.payload);
    }
  }
}

}  // namespace

void printBackends(const std::vector<RecordedEvent>& events) {
  struct Row {
    std::size_t events = 0;
    std::map<std::string, std::size_t> names;
    const RecordedEvent* sample = nullptr;
  };
  std::map<std::string, Row> rows;
  for (const RecordedEvent& event : events) {
    Row& row = rows[event.backend];
    ++row.events;
    ++row.names[shortName(event)];
    row.sample = row.sample == nullptr ? &event : row.sample;
  }
  constexpr std::size_t kSampleWidth = 150;
  std::printf("%-10s %7s %6s  %s\n", "back-end", "events", "names", "one of them");
  for (const auto& [backend, row] : rows) {
    const std::string sample = row.sample->name + " " + row.sample->payload.dump() +
                               (row.sample->detail.empty() ? "" : " ") +
                               (row.sample->detail.empty() ? std::string() : row.sample->detail.dump());
    std::printf("%-10s %7zu %6zu  %s\n", backend.c_str(), row.events, row.names.size(),
                cut(sample, kSampleWidth).c_str());
    printNames(row.names);
  }
}

void printSessions(const std::vector<Expectation>& expectations, const std::vector<RecordedEvent>& events) {
  std::printf("sessions\n");
  for (const Expectation& expectation : expectations) {
    std::printf(
        "  %s: %zu connections, %zu sessions, %zu messages in %zu deliveries, %zu of them redundant, %zu "
        "derived\n",
        expectation.script.c_str(), expectation.connections.size(), expectation.sessions, expectation.messages,
        expectation.deliveries, expectation.redundant, expectation.derived);
    for (const auto& [application, expected] : expectation.events) {
      printApplication(application, expected.size(), events);
    }
  }
}

}  // namespace tarn::scenario
