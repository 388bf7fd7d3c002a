// SPDX-License-Identifier: Apache-2.0
// tarnreporting-fleet: options, then one question to the database, then its answer. docs/fleet.md is its manual.
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <string>
#include <utility>

#include "fleet/ask/AskOptions.h"
#include "fleet/ask/FleetPage.h"
#include "fleet/ask/FleetReader.h"
#include "fleet/ask/SessionsAnswer.h"
#include "fleet/ask/TopAnswer.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/PageOutput.h"
#include "tools/ctl/terminal/Terminal.h"

namespace tarn::fleet {

namespace {

constexpr const char* kProgram = "tarnreporting-fleet";

ctl::ColorChoice colorChoice(const std::string& text) {
  if (text == "always") return ctl::ColorChoice::Always;
  return text == "never" ? ctl::ColorChoice::Never : ctl::ColorChoice::Auto;
}

Span spanOf(const ctl::TimeRange& range) {
  return {range.since, range.until};
}

SessionWish wishOf(const SessionsArguments& asked) {
  return {spanOf(asked.range), asked.deviceGlob, asked.applicationGlob, asked.releaseGlob, asked.open,
          asked.all,           asked.limit};
}

// One question to the database.
class Asking {
 public:
  explicit Asking(AskOptions& options)
      : options_(options), terminal_(terminalOf(ctl::currentTerminal(), colorChoice(options.color), options.quiet)) {}

  int answer() {
    if (!range().read()) return ctl::kWrongUsage;
    if (const Status wrong = checkDatabaseUrl(options_.database); wrong.failed()) {
      ctl::complain("--db: " + wrong->text);
      return ctl::kWrongUsage;
    }
    switch (options_.question) {
      case Question::Top:
        return top();
      case Question::Sessions:
        return sessions();
      case Question::Report:
        return report();
    }
    return ctl::kFailure;
  }

 private:
  ctl::TimeRange& range() {
    if (options_.question == Question::Report) return options_.report.range;
    return options_.question == Question::Top ? options_.top.range : options_.sessions.range;
  }

  // What the database answers to one question; how far it is nobody knows.
  template <class Ask>
  auto ask(Ask question) {
    return ctl::withProgress(terminal_.progress, "asking the database", [&](const ctl::ProgressHandler&) {
      decltype(question(reader_)) answer;
      answer.error = reader_.open(options_.database, kProgram);
      return answer.ok() ? question(reader_) : std::move(answer);
    });
  }

  int fail(const Status& status) const {
    ctl::complain(status->text);
    return reader_.isReached() ? ctl::kFailure : ctl::kUnreachable;
  }

  int top() {
    const auto parts = ask([this](FleetReader& reader) { return reader.played(spanOf(options_.top.range)); });
    if (parts.failed()) return fail(parts.error);
    ctl::Output output(STDOUT_FILENO, ctl::Output::Pace::Together);
    printTop(parts.value, options_.top, output, terminal_);
    return output.status();
  }

  int sessions() {
    const auto found = ask([this](FleetReader& reader) { return reader.sessions(wishOf(options_.sessions)); });
    if (found.failed()) return fail(found.error);
    ctl::Output output(STDOUT_FILENO, ctl::Output::Pace::Together);
    printSessions(found.value, options_.sessions.asJson, output, terminal_);
    return output.status();
  }

  int report() {
    auto picture = ask(
        [this](FleetReader& reader) { return reader.picture(spanOf(options_.report.range), options_.report.exact); });
    if (picture.failed()) return fail(picture.error);
    picture.value.made = ctl::currentTime();
    return ctl::putPage(options_.report.file, fleetPage(picture.value));
  }

  AskOptions& options_;
  const ctl::Terminal terminal_;
  FleetReader reader_;
};

}  // namespace

}  // namespace tarn::fleet

int main(int argumentCount, char** arguments) {
  std::signal(SIGPIPE, SIG_IGN);
  tarn::fleet::AskCommand command = tarn::fleet::parseAskCommand(argumentCount, arguments);
  if (command.usage.failed()) {
    tarn::ctl::complain(command.usage->text);
    return tarn::ctl::kWrongUsage;
  }
  if (!command.options) {
    std::fputs(command.output.c_str(), stdout);
    return tarn::ctl::kSuccess;
  }
  return tarn::fleet::Asking(*command.options).answer();
}
