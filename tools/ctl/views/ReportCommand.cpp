// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/PageOutput.h"
#include "tools/ctl/terminal/TimeOption.h"
#include "tools/report/Page.h"
#include "tools/report/ReportMaker.h"
#include "tools/report/ReportStore.h"

namespace tarn::ctl {

namespace {

struct Arguments {
  std::vector<std::int64_t> sessions;
  TimeRange range;
  std::string file;
};

Result<report::Report> readReport(const std::string& file, const report::ReportRequest& request,
                                  const ProgressHandler& progress) {
  report::ReportStore store(file);
  if (Status opened = store.open(); opened.failed()) return {{}, std::move(opened)};
  return report::makeReport(store, request, currentTime(), progress);
}

int reportSessions(const Context& context, Arguments& arguments) {
  if (!arguments.range.read()) return kWrongUsage;
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  const report::ReportRequest request{arguments.sessions, {arguments.range.since, arguments.range.until}};
  const Result<report::Report> made =
      withProgress(context.terminal.progress, "reading the sessions", [&](const ProgressHandler& progress) {
        return readReport(context.stateDirectory + "/recorder.sqlite3", request, progress);
      });
  if (made.failed()) {
    complain(made.error->text);
    return kFailure;
  }
  return putPage(arguments.file, report::page(made.value));
}

}  // namespace

void addReportCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("report", "Make one HTML page of sessions, with pictures and their numbers");
  const auto arguments = std::make_shared<Arguments>();
  command->add_option("SESSION", arguments->sessions, "Sessions by their numbers (default: all of the time)")
      ->type_name("")
      ->check(CLI::Range(std::int64_t{1}, std::numeric_limits<std::int64_t>::max()));
  arguments->range.addTo(*command, "Only what was there");
  command->add_option("-o,--output", arguments->file, "The page's file, replaced whole (default: stdout)")
      ->type_name("FILE.html");
  command->footer(
      "\nThe page needs no network and no scripts, and goes well on paper. Reads the recorder in the state directory;\n"
      "the service need not run.\n\n"
      "Examples:\n"
      "  tarnreportingctl report --since -1d -o yesterday.html\n"
      "  tarnreportingctl report 12 -o session.html");
  command->callback([&context, arguments] {
    context.chosen = [&context, arguments] { return reportSessions(context, *arguments); };
  });
}

}  // namespace tarn::ctl
