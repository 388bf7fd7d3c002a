// SPDX-License-Identifier: Apache-2.0
#include <array>
#include <cmath>
#include <cstdio>
#include <map>

#include "host/system/JsonValues.h"
#include "plist/formats/Json.h"
#include "tools/ctl/sessions/SessionStory.h"
#include "tools/ctl/terminal/JsonObject.h"
#include "tools/ctl/terminal/TextTable.h"

namespace tarn::ctl {

namespace {

constexpr std::size_t kMostSteps = 20;
constexpr std::size_t kMostSegments = 10;
constexpr std::size_t kMostOthers = 10;

// Prints the story, section by section.
class StoryPrinter {
 public:
  StoryPrinter(const SessionStory& story, const TimeZone& zone, Output& output, const Terminal& terminal)
      : story_(story), zone_(zone), output_(output), terminal_(terminal) {}

  void print() {
    printHead();
    printTimeline();
    printSegments();
    printIssues();
    printSummary();
    printBackends();
  }

 private:
  void section(const std::string& name) {
    output_.line("");
    output_.paintedLine(painted(name, Paint::Bold, terminal_));
  }
  void row(const std::string& label, const std::string& text) {
    constexpr std::size_t kLabelWidth = 13;
    std::string line = "  " + label;
    line.resize(std::max(line.size() + 1, kLabelWidth + 2), ' ');
    output_.paintedLine(cut(line + printable(text)));
  }
  // Of a list that is longer than it may be on one screen.
  void remark(std::size_t all, std::size_t shown) {
    if (all > shown && !terminal_.quiet) {
      output_.paintedLine(
          painted("  and " + std::to_string(all - shown) + " more (--json has all)", Paint::Dim, terminal_));
    }
  }
  std::string cut(const std::string& line) const { return terminal_.width ? fitted(line, *terminal_.width) : line; }
  // 2026-11-20 10:00:00.250
  std::string time(double seconds) const {
    const double whole = std::floor(seconds);
    std::array<char, 16> fraction{};
    std::snprintf(fraction.data(), fraction.size(), ".%03d", static_cast<int>((seconds - whole) * 1000));
    return localTimeText(whole, zone_) + fraction.data();
  }

  void printHead();
  void printTimeline();
  void printSegments();
  void printIssues();
  void printSummary();
  void printBackends();

  const SessionStory& story_;
  const TimeZone& zone_;
  Output& output_;
  const Terminal& terminal_;
};

// Empty where the recorder didn't note it, and where the file has something else there.
plist::Dictionary machineOf(const recorder::RunRow& run) {
  const linux_host::JsonReading reading = linux_host::readJson(run.machine);
  return reading.fault ? plist::Dictionary() : reading.value.view().dictionary();
}

std::string orUnknown(const std::string& text) {
  return text.empty() ? "unknown" : text;
}

void StoryPrinter::printHead() {
  const SessionOverview& overview = story_.overview;
  const recorder::SessionRow& session = overview.row;
  output_.paintedLine(painted("session " + std::to_string(session.id), Paint::Bold, terminal_) + "  " +
                      printable(overview.state()));
  row("client", orUnknown(session.process) + " (pid " + std::to_string(session.pid) + ", uid " +
                    std::to_string(session.uid) + "), connection " + std::to_string(session.connection));
  row("application", orUnknown(session.application));
  row("service", session.serviceName + " (" + std::to_string(session.serviceType) + "), reporter " +
                     std::to_string(session.reporter));
  std::string device;
  for (const auto& entry : story_.device) {
    device += (device.empty() ? "" : ", ") + std::string(entry.key.text()) + " " + entry.value.asText();
  }
  row("device", device.empty() ? "no settings told" : device);
  row("created", time(session.created));
  if (session.ended) {
    row("ended", time(*session.ended) + ", " + session.endReason);
  }
  row("active", durationText(overview.active) + " in " + std::to_string(overview.periods.size()) +
                    (overview.periods.size() == 1 ? " period" : " periods") + ", " + std::to_string(overview.messages) +
                    " messages, " + std::to_string(overview.redundant) + " of them repeated");
  if (story_.run) {
    row("run", std::to_string(story_.run->id) + " of the service " + story_.run->version + ", from " +
                   time(story_.run->started));
    std::string machine;
    for (const auto& entry : machineOf(*story_.run)) {
      machine += (machine.empty() ? "" : ", ") + std::string(entry.key.text()) + " " + entry.value.asText();
    }
    if (!machine.empty()) {
      row("machine", machine);
    }
  }
}

void StoryPrinter::printTimeline() {
  const auto& steps = story_.timeline.steps;
  if (steps.empty()) return;
  section("timeline");
  const std::size_t shown = std::min(steps.size(), kMostSteps);
  for (std::size_t i = 0; i < shown; ++i) {
    output_.paintedLine(cut("  " + time(steps[i].at) + "  " + printable(steps[i].text)));
  }
  remark(steps.size(), shown);
}

void StoryPrinter::printSegments() {
  if (story_.segments.empty()) return;
  section("segments");
  TextTable table({{"KIND"},
                   {"SECONDS", true},
                   {"VOLUME", true},
                   {"DEVICES", false, true},
                   {"FORMAT", false, true},
                   {"APPLICATION", false, true}});
  const std::size_t shown = std::min(story_.segments.size(), kMostSegments);
  for (std::size_t i = 0; i < shown; ++i) {
    const plist::Dictionary& payload = story_.segments[i].payload;
    const auto text = [&payload](const char* key) {
      return payload.contains(key) ? payload.get(key).asText() : std::string("-");
    };
    const std::string played = text("play_seconds");
    table.add({{story_.segments[i].kind()},
               {played == "-" ? text("inputrunning_seconds") : played},
               {text("KvSessionVolume")},
               {text("active_devices")},
               {text("session_selected_format")},
               {text("HostApplicationDisplayID")}});
  }
  table.print(output_, terminal_, "  ");
  remark(story_.segments.size(), shown);
}

void StoryPrinter::printIssues() {
  if (story_.issues.empty()) return;
  section("issues");
  const std::size_t shown = std::min(story_.issues.size(), kMostOthers);
  for (std::size_t i = 0; i < shown; ++i) {
    row(std::to_string(story_.issues[i].second), story_.issues[i].first);
  }
  remark(story_.issues.size(), shown);
}

void StoryPrinter::printSummary() {
  if (!story_.summary) return;
  const plist::Dictionary& payload = story_.summary->payload;
  const auto text = [&payload](const char* key) { return payload.get(key).asText(); };
  section("summary");
  row("active", text("total_active_time") + " s in " + text("active_count") + " messages, " +
                    text("average_active_time") + " s each");
  row("overloads", text("overload_count"));
  row("messages", text("num_messages") + ", " + text("num_unique_messages") + " kept, markers included");
  row("machine", "thermal state " + text("thermal_state") + ", load " + text("load_avg_1_min"));
}

void StoryPrinter::printBackends() {
  if (story_.counts.empty()) return;
  section("back-ends");
  std::map<std::string, std::int64_t> totals;
  for (const auto& [name, count] : story_.counts) {
    totals[name.first] += count;
  }
  std::string all;
  for (const auto& [backend, count] : totals) {
    all += (all.empty() ? "" : ", ") + backend + " " + std::to_string(count);
  }
  row("events", all);
  TextTable table({{"BACKEND"}, {"NAME", false, true}, {"EVENTS", true}});
  const std::size_t shown = std::min(story_.counts.size(), kMostOthers);
  auto each = story_.counts.begin();
  for (std::size_t i = 0; i < shown; ++i, ++each) {
    table.add({{each->first.first}, {each->first.second}, {std::to_string(each->second)}});
  }
  table.print(output_, terminal_, "  ");
  remark(story_.counts.size(), shown);
}

std::string runJson(const recorder::RunRow& run) {
  JsonObject object;
  std::string machine;
  plist::appendJson(machine, machineOf(run));
  object.add("id", run.id).addOrNull("boot", run.boot).addOrNull("version", run.version).add("started", run.started);
  object.addOptional("ended", run.ended).addOrNull("end_reason", run.endReason);
  return object.addJson("machine", machine).text();
}

std::vector<std::string> spansJson(const std::vector<SessionTimeline::Span>& spans, const char* textName) {
  std::vector<std::string> all;
  for (const auto& span : spans) {
    JsonObject object;
    object.add("from", span.from).add("to", span.to);
    all.push_back(textName == nullptr ? object.text() : object.add(textName, span.text).text());
  }
  return all;
}

std::vector<std::string> marksJson(const std::vector<SessionTimeline::Mark>& marks) {
  std::vector<std::string> all;
  for (const auto& mark : marks) {
    JsonObject object;
    all.push_back(object.add("at", mark.at).add("what", mark.text).text());
  }
  return all;
}

std::string timelineJson(const SessionTimeline& timeline) {
  std::vector<std::string> volumes;
  for (const auto& volume : timeline.volumes) {
    JsonObject object;
    volumes.push_back(object.add("at", volume.at).add("volume", volume.value).text());
  }
  JsonObject object;
  object.addArray("output", spansJson(timeline.output, nullptr)).addArray("input", spansJson(timeline.input, nullptr));
  object.addArray("routes", spansJson(timeline.routes, "devices")).addArray("volumes", volumes);
  object.addArray("overloads", marksJson(timeline.overloads)).addArray("errors", marksJson(timeline.errors));
  return object.addArray("steps", marksJson(timeline.steps)).text();
}

}  // namespace

void printStory(const SessionStory& story, const TimeZone& zone, Output& output, const Terminal& terminal) {
  StoryPrinter(story, zone, output, terminal).print();
}

std::string storyJson(const SessionStory& story) {
  std::vector<std::string> segments;
  for (const SessionMessage& segment : story.segments) {
    JsonObject object;
    segments.push_back(object.add("kind", segment.kind()).add("payload", segment.payload).text());
  }
  std::vector<std::string> issues;
  for (const auto& [what, count] : story.issues) {
    JsonObject object;
    issues.push_back(object.add("what", what).add("count", std::uint64_t{count}).text());
  }
  std::vector<std::string> counts;
  for (const auto& [name, count] : story.counts) {
    JsonObject object;
    counts.push_back(object.add("backend", name.first).add("name", name.second).add("events", count).text());
  }
  JsonObject object;
  object.addJson("session", overviewJson(story.overview)).addJson("run", story.run ? runJson(*story.run) : "null");
  object.add("device", story.device).addJson("timeline", timelineJson(story.timeline));
  object.addArray("segments", segments).addArray("issues", issues);
  object.add("summary", story.summary ? plist::ValueView(story.summary->payload) : plist::ValueView());
  return object.addArray("backends", counts).text();
}

}  // namespace tarn::ctl
