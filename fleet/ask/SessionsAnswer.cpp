// SPDX-License-Identifier: Apache-2.0
#include "fleet/ask/SessionsAnswer.h"

#include <string>

#include "tools/ctl/terminal/JsonObject.h"
#include "tools/ctl/terminal/TextTable.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::fleet {

namespace {

// Enough of a device's name to tell it from others, where nothing narrower is asked.
constexpr std::size_t kDeviceDigits = 12;

std::string stateOf(const FleetSession& session) {
  if (session.ended) return session.endReason.empty() ? "ended" : session.endReason;
  return session.running ? "running" : "open";
}

ctl::Paint paintOf(const std::string& state) {
  if (state == "running") return ctl::Paint::Green;
  return state == "killed" || state == "client-gone" ? ctl::Paint::Red : ctl::Paint::Plain;
}

std::string orDash(const std::string& text) {
  return text.empty() ? "-" : text;
}

std::string sessionJson(const FleetSession& session) {
  ctl::JsonObject object;
  object.add("device", session.device).add("run", session.run).add("session", session.id);
  object.addOrNull("release", session.release).addOrNull("process", session.process);
  object.addOrNull("application", session.application).add("service_type", session.serviceType);
  object.addOrNull("service_name", session.serviceName).add("created", session.created);
  object.addOptional("ended", session.ended).addOrNull("end_reason", session.endReason);
  object.add("looked_at", session.lookedAt).add("running", session.running).add("active", session.active);
  object.add("periods", session.periods).add("messages", session.messages).add("redundant", session.redundant);
  return object.add("overloads", session.overloads).text();
}

void printTable(const std::vector<FleetSession>& sessions, ctl::Output& output, const ctl::Terminal& terminal) {
  ctl::TextTable table({{"DEVICE"},
                        {"RUN", true},
                        {"SESSION", true},
                        {"CREATED"},
                        {"RELEASE", false, true},
                        {"PROCESS", false, true},
                        {"APPLICATION", false, true},
                        {"SERVICE", false, true},
                        {"ACTIVE", true},
                        {"OVERLOADS", true},
                        {"END"}});
  const ctl::TimeZone zone = ctl::userTimeZone();
  for (const FleetSession& session : sessions) {
    const std::string state = stateOf(session);
    table.add({{session.device.substr(0, kDeviceDigits)},
               {std::to_string(session.run)},
               {std::to_string(session.id)},
               {ctl::localTimeText(session.created, zone)},
               {orDash(session.release)},
               {orDash(session.process)},
               {orDash(session.application)},
               {orDash(session.serviceName)},
               {ctl::durationText(session.active)},
               {std::to_string(session.overloads), session.overloads > 0 ? ctl::Paint::Yellow : ctl::Paint::Plain},
               {state, paintOf(state)}});
  }
  table.print(output, terminal);
}

}  // namespace

void printSessions(const std::vector<FleetSession>& sessions, bool asJson, ctl::Output& output,
                   const ctl::Terminal& terminal) {
  if (!asJson) return printTable(sessions, output, terminal);
  for (const FleetSession& session : sessions) {
    if (!output.line(sessionJson(session))) return;
  }
}

}  // namespace tarn::fleet
