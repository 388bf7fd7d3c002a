// SPDX-License-Identifier: Apache-2.0
#include <sys/ioctl.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <cstdint>
#include <memory>

#include "host/system/Files.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/StopRequest.h"
#include "tools/ctl/terminal/TimeOption.h"
#include "tools/ctl/views/LiveSource.h"
#include "tools/ctl/views/TopLoop.h"

namespace tarn::ctl {

namespace {

constexpr double kLongestInterval = 86400;

struct Arguments {
  bool asJson = false;
  std::uint64_t count = 0;
  double interval = 1;
};

// A terminal is written anew with each view; elsewhere an empty line stands between two.
class LiveScreen final : public TopScreen {
 public:
  explicit LiveScreen(const Arguments& arguments) : arguments_(arguments), isTerminal_(::isatty(STDOUT_FILENO) == 1) {}

  bool show(const TopView& view) override;
  bool pause() override { return pauseUnlessStopped(std::chrono::duration<double>(arguments_.interval)); }
  int status() { return output_.status(); }

 private:
  void showLines(const TopView& view);

  const Arguments& arguments_;
  const bool isTerminal_;
  Output output_{STDOUT_FILENO};
  bool isFirst_ = true;
};

void LiveScreen::showLines(const TopView& view) {
  std::size_t width = 160;
  std::size_t height = 1000;
  winsize size{};
  if (isTerminal_ && ::ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0 && size.ws_row > 1) {
    width = size.ws_col;
    height = size.ws_row - std::size_t{1};
  }
  if (isTerminal_) {
    // A terminal that is gone fails with the lines, too.
    static_cast<void>(linux_host::writeAll(STDOUT_FILENO, "\x1b[H\x1b[2J"));
  } else if (!isFirst_) {
    output_.line("");
  }
  isFirst_ = false;
  for (const std::string& line : topLines(view, std::max<std::size_t>(width, 40), height)) {
    output_.line(line);
  }
}

bool LiveScreen::show(const TopView& view) {
  if (arguments_.asJson) {
    output_.line(topJson(view));
  } else {
    showLines(view);
  }
  return output_.good() && !isStopRequested();
}

int top(const Context& context, const Arguments& arguments) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  stopOnSignals();
  LiveSource source(context.socket, context.stateDirectory + "/recorder.sqlite3");
  LiveScreen screen(arguments);
  const int status = runTop(source, screen, arguments.count);
  return status == kSuccess ? screen.status() : status;
}

}  // namespace

void addTopCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("top", "Watch the open sessions, what waits and the ledger");
  const auto arguments = std::make_shared<Arguments>();
  command->add_flag("--json", arguments->asJson, "Print one object a line: time, up, status, rates, sessions");
  command->add_option("--count", arguments->count, "End after so many views (default: when interrupted)")
      ->type_name("N")
      ->check(CLI::PositiveNumber);
  command->add_option("--interval", arguments->interval, "Seconds from one view to the next (default: 1)")
      ->type_name("S")
      ->check([](const std::string& text) { return checkSeconds(text, 0.05, kLongestInterval); });
  command->footer(
      "\nThe service tells what waits and what was counted, the recorder in the state directory which sessions are "
      "open\n"
      "and what was recorded of them. Exit status 69 when the service is not up at the first view.\n\n"
      "Examples:\n"
      "  tarnreportingctl top\n"
      "  tarnreportingctl top --json --count 2 | tail -n 1 | jq .rates.messages_received");
  command->callback(
      [&context, arguments] { context.chosen = [&context, arguments] { return top(context, *arguments); }; });
}

}  // namespace tarn::ctl
