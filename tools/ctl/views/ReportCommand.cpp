// SPDX-License-Identifier: Apache-2.0
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "host/system/FileReplacement.h"
#include "host/system/Files.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"
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

// A file is replaced whole, so that nobody reads half a page; a pipe or a device is written to as it is.
Status writePage(const std::string& path, const std::string& page) {
  struct stat there {};
  if (::stat(path.c_str(), &there) == 0 && !S_ISREG(there.st_mode)) {
    const linux_host::UniqueDescriptor file(::open(path.c_str(), O_WRONLY | O_CLOEXEC));
    if (!file) return linux_host::lastSystemError();
    return linux_host::writeAll(file.get(), page);
  }
  return linux_host::replaceFile(path, path + "." + std::to_string(::getpid()) + ".tmp", page);
}

int printPage(const std::string& page) {
  if (::isatty(STDOUT_FILENO) == 1) {
    complain("the report is a page for a browser: name its file with -o, or send it to a program");
    return kWrongUsage;
  }
  const Status written = linux_host::writeAll(STDOUT_FILENO, page);
  if (written.ok() || written->code == EPIPE) return kSuccess;
  complain("can't write the report: " + written->text);
  return kFailure;
}

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
  const std::string page = report::page(made.value);
  if (arguments.file.empty() || arguments.file == "-") return printPage(page);
  if (const Status written = writePage(arguments.file, page); written.failed()) {
    complain("can't write the report to " + arguments.file + ": " + written->text);
    return kFailure;
  }
  return kSuccess;
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
