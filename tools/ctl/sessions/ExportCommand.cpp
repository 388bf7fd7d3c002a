// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tools/ctl/Command.h"
#include "tools/ctl/EventText.h"
#include "tools/ctl/sessions/SessionCommand.h"
#include "tools/ctl/sessions/SessionEvents.h"
#include "tools/ctl/sessions/SessionScript.h"
#include "tools/ctl/sessions/SessionStory.h"
#include "tools/ctl/sessions/SessionTable.h"
#include "tools/ctl/sessions/SessionTrace.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

using recorder::SessionReader;
using recorder::SessionRow;

struct Arguments {
  std::int64_t session = 0;
  std::string format;
};

int printLines(const std::vector<std::string>& lines) {
  Output output(STDOUT_FILENO, Output::Pace::Together);
  for (const std::string& line : lines) {
    if (!output.line(line)) break;
  }
  return output.status();
}

// One object over many lines: what `show` tells, and then every event, so that it is never in memory as a whole.
int printJson(const Terminal& terminal, SessionReader& reader, const SessionRow& row) {
  const Result<SessionStory> story =
      withProgress(terminal.progress, "reading the session",
                   [&](const ProgressHandler& progress) { return storyOf(reader, row, currentTime(), progress); });
  if (story.failed()) return sessionFailure(row.id, story.error);
  Output output(STDOUT_FILENO, Output::Pace::Together);
  std::string line = storyJson(story.value);
  line.pop_back();
  output.line(line + ",\"events\":[");
  line.clear();
  const auto print = [&](const ProgressHandler& progress) {
    EventProgress told(story.value.overview.periods, progress);
    return eachEvent(reader.file(), row.id, 0, [&](recorder::EventRow&& event) {
      told.at(event.id);
      if (!line.empty()) {
        output.line(line + ",");
      }
      line = eventJson(event, true);
      return output.good();
    });
  };
  const Status read = withProgress(terminal.printingProgress, "printing the events", print);
  if (read.failed()) return sessionFailure(row.id, read);
  if (!line.empty()) {
    output.line(line);
  }
  output.line("]}");
  return output.status();
}

int printScript(const SessionRow& row, const std::vector<recorder::PeriodRow>& periods,
                const std::vector<SessionMessage>& messages, const std::vector<recorder::RepeatedRow>& repeated) {
  const SessionScript script = scriptOf(row, periods, messages, repeated);
  const int status = printLines(script.lines);
  for (const std::int64_t event : script.leftOut) {
    complain("the message of event " + std::to_string(event) + " can't be said in a script; it is left out");
  }
  if (script.unknownRepeated > 0) {
    complain(std::to_string(script.unknownRepeated) +
             " repeated messages are left out: what they repeat isn't recorded or is gone");
  }
  return script.leftOut.empty() ? status : kFailure;
}

int exportSession(const Context& context, const Arguments& arguments) {
  return withSession(context, arguments.session, [&](SessionReader& reader, const SessionRow& row) {
    if (arguments.format == "json") return printJson(context.terminal, reader, row);
    const auto periods = reader.periods(row.id);
    if (periods.failed()) return sessionFailure(row.id, periods.error);
    const auto messages = withProgress(
        context.terminal.progress, "reading the session",
        [&](const ProgressHandler& progress) { return messagesOf(reader.file(), row.id, periods.value, progress); });
    if (messages.failed()) return sessionFailure(row.id, messages.error);
    if (arguments.format == "csv") return printLines(tableOf(messages.value));
    if (arguments.format == "trace") return printLines(traceOf(row, periods.value, messages.value, currentTime()));
    const auto repeated = reader.repeated(row.id);
    if (repeated.failed()) return sessionFailure(row.id, repeated.error);
    return printScript(row, periods.value, messages.value, repeated.value);
  });
}

}  // namespace

void addExportCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("export", "Print a session for other programs, or to be played again");
  const auto arguments = std::make_shared<Arguments>();
  addSessionArgument(*command, arguments->session);
  command->add_option("--format", arguments->format, "json, csv, trace or script")
      ->required()
      ->type_name("FORMAT")
      ->check(CLI::IsMember({"json", "csv", "trace", "script"}));
  command->footer(
      "\n  json    what \"show --json\" tells, and all its events\n"
      "  csv     its messages, a row each, with a column for each key\n"
      "  trace   its timeline as a Chrome trace, which the usual viewers of traces open\n"
      "  script  its messages, starts and stops for \"run\", which derives the same of them: stamps are kept. "
      "Repeated\n"
      "          messages are in it where [recorder] redundant is \"mark\"; what the service itself derived is not. A\n"
      "          stamp that is more than a year old when it is played is replaced by the service.\n"
      "Reads the recorder in the state directory; the service need not run.\n\n"
      "Examples:\n"
      "  tarnreportingctl export 12 --format trace > session.json\n"
      "  tarnreportingctl export 12 --format script | tarnreportingctl run");
  command->callback(
      [&context, arguments] { context.chosen = [&context, arguments] { return exportSession(context, *arguments); }; });
}

}  // namespace tarn::ctl
