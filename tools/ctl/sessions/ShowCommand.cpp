// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>

#include "tools/ctl/Command.h"
#include "tools/ctl/sessions/SessionCommand.h"
#include "tools/ctl/sessions/SessionStory.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

struct Arguments {
  std::int64_t session = 0;
  bool asJson = false;
};

int show(const Context& context, const Arguments& arguments) {
  return withSession(context, arguments.session, [&](recorder::SessionReader& reader, const recorder::SessionRow& row) {
    const Result<SessionStory> story =
        withProgress(context.terminal.progress, "reading the session",
                     [&](const ProgressHandler& progress) { return storyOf(reader, row, currentTime(), progress); });
    if (story.failed()) return sessionFailure(row.id, story.error);
    Output output(STDOUT_FILENO, Output::Pace::Together);
    if (arguments.asJson) {
      output.line(storyJson(story.value));
    } else {
      printStory(story.value, userTimeZone(), output, context.terminal);
    }
    return output.status();
  });
}

}  // namespace

void addShowCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("show", "Tell on one screen what a session did");
  const auto arguments = std::make_shared<Arguments>();
  addSessionArgument(*command, arguments->session);
  command->add_flag("--json", arguments->asJson, "Print one object with all of it");
  command->footer(
      "\nTells the client, the device's settings, the timeline by the messages' own stamps, the segments that were\n"
      "derived, what went wrong, the session's own summary, and how many events each back-end got. Reads the recorder "
      "in\n"
      "the state directory; the service need not run. Times are local ones.\n\n"
      "Examples:\n"
      "  tarnreportingctl show 12\n"
      "  tarnreportingctl show 12 --json | jq .timeline.volumes");
  command->callback(
      [&context, arguments] { context.chosen = [&context, arguments] { return show(context, *arguments); }; });
}

}  // namespace tarn::ctl
