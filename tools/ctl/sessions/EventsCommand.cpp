// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <limits>
#include <memory>
#include <optional>

#include "recorder/store/reading/EventReader.h"
#include "recorder/store/reading/StoreAccess.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/EventText.h"
#include "tools/ctl/sessions/SessionEvents.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/Progress.h"
#include "tools/ctl/terminal/StopRequest.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::ctl {

namespace {

using recorder::EventReader;

struct Arguments {
  recorder::EventQuery query;
  std::string backend;
  std::string nameGlob;
  TimeRange range;
  std::int64_t session = 0;
  std::size_t limit = 0;  // 0: all
  bool follow = false;
  bool asJson = false;
  bool settled = false;
  bool once = false;
};

class EventPrinter {
 public:
  EventPrinter(const Context& context, const Arguments& arguments)
      : path_(context.stateDirectory + "/recorder.sqlite3"),
        isQuiet_(context.terminal.quiet),
        arguments_(arguments),
        reader_(path_) {
    if (!arguments.follow) {
      progress_.emplace(context.terminal.printingProgress, "printing the events");
    }
  }

  int print();

 private:
  // Prints what is there beyond the last one. False when it can't be read.
  bool printNew();
  void printRow(const recorder::EventRow& row, bool hasSession);
  // Complains; false.
  bool fail(const std::string& why) {
    progress_.reset();
    complain(why);
    return false;
  }
  bool isEnough() const { return arguments_.limit > 0 && printed_ >= arguments_.limit; }

  static constexpr std::chrono::milliseconds kPatience{200};  // as long a signal may go unnoticed

  const std::string path_;
  const bool isQuiet_;
  const Arguments& arguments_;
  EventReader reader_;
  MessageSieve sieve_;
  Output output_{STDOUT_FILENO, Output::Pace::Together};
  std::optional<Progress> progress_;
  std::int64_t after_ = 0;
  std::size_t printed_ = 0;
  bool isMissing_ = false;
  bool headingIsPrinted_ = false;
};

int EventPrinter::print() {
  after_ = arguments_.query.after;
  if (!printNew()) return kFailure;
  if (isMissing_ && !arguments_.follow) {
    fail("there are no events: " + path_ + " is not there");
    return kFailure;
  }
  while (arguments_.follow && !isEnough() && output_.good() && !isStopRequested()) {
    if (reader_.waitForChange(kPatience) && !printNew()) return kFailure;
  }
  progress_.reset();
  return output_.status();
}

bool EventPrinter::printNew() {
  recorder::EventQuery query = arguments_.query;
  Result<recorder::EventPage> page;
  do {
    query.after = after_;
    if (arguments_.limit > 0) {
      query.limit = std::min(query.limit, arguments_.limit - printed_);
    }
    page = reader_.read(query);
    if (page.failed()) return fail("can't read " + page.error->text);
    isMissing_ = page.value.missing;
    if (isMissing_) return true;
    if (query.session && !page.value.hasSessions) return fail(recorder::noSessionsIn(path_).text);
    for (const recorder::EventRow& row : page.value.rows) {
      if (!arguments_.once || sieve_.letsThrough(row)) {
        printRow(row, page.value.hasSessions);
      }
    }
    after_ = page.value.lookedUpTo;
    output_.flush();
  } while (page.value.more && !isEnough() && output_.good() && !isStopRequested());
  return true;
}

void EventPrinter::printRow(const recorder::EventRow& row, bool hasSession) {
  ++printed_;
  if (arguments_.asJson) {
    output_.line(eventJson(row, hasSession));
    return;
  }
  if (!headingIsPrinted_ && !isQuiet_) {
    headingIsPrinted_ = true;
    output_.line(eventHeading());
  }
  output_.line(eventLine(row));
}

int events(const Context& context, Arguments& arguments, bool hasBackend, bool hasName) {
  if (!isNamed(context.stateDirectory, "--state-dir") || !arguments.range.read()) return kWrongUsage;
  arguments.query.since = arguments.range.since;
  arguments.query.until = arguments.range.until;
  if (arguments.session > 0) {
    arguments.query.session = arguments.session;
  }
  if (hasBackend) {
    arguments.query.backend = arguments.backend;
  }
  if (hasName) {
    arguments.query.nameGlob = arguments.nameGlob;
  }
  if (arguments.settled) {
    if (const int status = settleService(context.socket); status != kSuccess) return status;
  }
  if (arguments.follow) {
    stopOnSignals();
  }
  return EventPrinter(context, arguments).print();
}

}  // namespace

void addEventsCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("events", "Print what the back-ends received");
  const auto arguments = std::make_shared<Arguments>();
  command->add_flag("--follow", arguments->follow, "Print what is there, then what comes, until interrupted");
  command->add_option("--backend", arguments->backend, "Only events of this back-end (tally, wattlog, ...)")
      ->type_name("B");
  command->add_option("--name", arguments->nameGlob, "Only events whose name matches this pattern (*, ?, [a-z])")
      ->type_name("GLOB");
  command->add_option("--after", arguments->query.after, "Only events with greater ids")->type_name("ID");
  command->add_option("--session", arguments->session, "Only events of this session, as \"sessions\" numbers them")
      ->type_name("SESSION")
      ->check(CLI::Range(std::int64_t{1}, std::numeric_limits<std::int64_t>::max()));
  arguments->range.addTo(*command, "Only events");
  command->add_option("--limit", arguments->limit, "The first so many, then the end")
      ->type_name("N")
      ->check(CLI::Range(1, std::numeric_limits<int>::max()));
  command->add_flag("--once", arguments->once,
                    "Each message once: not under both of its analytics names, nor its mirror");
  command->add_flag("--json", arguments->asJson,
                    "Print one object a line: id, time, backend, name, payload, detail, session");
  command->add_flag("--settled", arguments->settled,
                    "First wait until all that came to the service by now is on the disk");
  command->footer(
      "\nReads the recorder in the state directory; the service need not run. --settled asks it when it does.\n\n"
      "Examples:\n"
      "  tarnreportingctl events --name '*.Summary'\n"
      "  tarnreportingctl events --since -1h --once\n"
      "  tarnreportingctl events --follow --json | jq .payload.audiotag");
  command->callback([&context, command, arguments] {
    const bool hasBackend = command->count("--backend") > 0;
    const bool hasName = command->count("--name") > 0;
    context.chosen = [&context, arguments, hasBackend, hasName] {
      return events(context, *arguments, hasBackend, hasName);
    };
  });
}

}  // namespace tarn::ctl
