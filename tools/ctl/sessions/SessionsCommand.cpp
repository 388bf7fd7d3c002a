// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "tools/ctl/Command.h"
#include "tools/ctl/sessions/SessionOverview.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/TextTable.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::ctl {

namespace {

struct Arguments {
  TimeRange range;
  recorder::SessionQuery query;
  std::string applicationGlob;
  std::size_t limit = 0;
  bool asJson = false;
  bool all = false;
};

Paint paintOf(const std::string& state) {
  if (state == "running") return Paint::Green;
  return state == "killed" || state == "client-gone" ? Paint::Red : Paint::Plain;
}

void printTable(const std::vector<SessionOverview>& sessions, Output& output, const Terminal& terminal) {
  TextTable table({{"SESSION", true},
                   {"CREATED"},
                   {"PROCESS", false, true},
                   {"PID", true},
                   {"APPLICATION", false, true},
                   {"SERVICE", false, true},
                   {"ACTIVE", true},
                   {"OVERLOADS", true},
                   {"END"}});
  const TimeZone zone = userTimeZone();
  for (const SessionOverview& session : sessions) {
    const recorder::SessionRow& row = session.row;
    table.add({{std::to_string(row.id)},
               {localTimeText(row.created, zone)},
               {row.process.empty() ? "-" : row.process},
               {std::to_string(row.pid)},
               {row.application.empty() ? "-" : row.application},
               {row.serviceName},
               {durationText(session.active)},
               {std::to_string(session.overloads), session.overloads > 0 ? Paint::Yellow : Paint::Plain},
               {session.state(), paintOf(session.state())}});
  }
  table.print(output, terminal);
}

int sessions(const Context& context, Arguments& arguments, bool hasGlob, bool hasLimit) {
  if (!isNamed(context.stateDirectory, "--state-dir") || !arguments.range.read()) return kWrongUsage;
  arguments.query.since = arguments.range.since;
  arguments.query.until = arguments.range.until;
  arguments.query.used = !arguments.all;
  if (hasGlob) {
    arguments.query.applicationGlob = arguments.applicationGlob;
  }
  if (hasLimit) {
    arguments.query.limit = arguments.limit;
  }
  recorder::SessionReader reader(context.stateDirectory + "/recorder.sqlite3");
  Result<std::vector<SessionOverview>> overviews;
  overviews.error = reader.open();
  if (overviews.ok()) {
    auto rows = reader.sessions(arguments.query);
    overviews.error = rows.error;
    if (rows.ok()) {
      overviews = withProgress(context.terminal.progress, "reading the sessions", [&](const ProgressHandler& progress) {
        return overviewsOf(reader, std::move(rows.value), currentTime(), progress);
      });
    }
  }
  if (overviews.failed()) {
    complain("can't list sessions: " + overviews.error->text);
    return kFailure;
  }
  Output output(STDOUT_FILENO, Output::Pace::Together);
  if (!arguments.asJson) {
    printTable(overviews.value, output, context.terminal);
    return output.status();
  }
  for (const SessionOverview& session : overviews.value) {
    if (!output.line(overviewJson(session))) break;
  }
  return output.status();
}

}  // namespace

void addSessionsCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("sessions", "List the sessions that the recorder holds, a line each");
  const auto arguments = std::make_shared<Arguments>();
  arguments->range.addTo(*command, "Only sessions that were there");
  command
      ->add_option("--app", arguments->applicationGlob, "Only sessions of applications that match this (*, ?, [a-z])")
      ->type_name("GLOB");
  command->add_flag("--open", arguments->query.open, "Only sessions that haven't ended");
  command->add_option("--limit", arguments->limit, "The newest so many")
      ->type_name("N")
      ->check(CLI::Range(1, std::numeric_limits<int>::max()));
  command->add_flag("--all", arguments->all, "Also those that one of another type replaced before they ever ran");
  command->add_flag("--json", arguments->asJson, "Print one object a line");
  command->footer(
      "\nReads the recorder in the state directory; the service need not run. Times are local ones. ACTIVE is the "
      "time\n"
      "between starts and stops. END says how the session ended: stopped, destroyed, replaced, retyped, client-gone,\n"
      "service-stopping or killed; running and open ones haven't.\n\n"
      "Examples:\n"
      "  tarnreportingctl sessions --since today --app 'org.example.*'\n"
      "  tarnreportingctl sessions --since -1h --json | jq 'select(.overloads > 0).id'");
  command->callback([&context, command, arguments] {
    const bool hasGlob = command->count("--app") > 0;
    const bool hasLimit = command->count("--limit") > 0;
    context.chosen = [&context, arguments, hasGlob, hasLimit] {
      return sessions(context, *arguments, hasGlob, hasLimit);
    };
  });
}

}  // namespace tarn::ctl
