// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl: talks to the reporting service and reads what it recorded.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <csignal>
#include <exception>
#include <iostream>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "host/settings/HostPaths.h"
#include "host/system/ProgramVersion.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/CommandLine.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

constexpr const char* kUsualWait = "30";

ColorChoice colorChoice(const std::string& text) {
  if (text == "always") return ColorChoice::Always;
  return text == "never" ? ColorChoice::Never : ColorChoice::Auto;
}

// The words of the command line, last one first. A value of --wait stands after a sign alone: what follows it is the
// command's.
std::vector<std::string> wordsOf(int argc, const char* const* argv) {
  std::vector<std::string> words(argv + 1, argv + argc);
  const auto end = std::find(words.begin(), words.end(), "--");
  std::replace(words.begin(), end, std::string("--wait"), std::string("--wait=") + kUsualWait);
  std::reverse(words.begin(), words.end());
  return words;
}

std::chrono::milliseconds milliseconds(double seconds) {
  return std::chrono::ceil<std::chrono::milliseconds>(std::chrono::duration<double>(seconds));
}

// Parses; `context.chosen` is what to do then, unless everything is done and the exit status returned.
std::optional<int> parse(CLI::App& app, std::vector<std::string> words) {
  try {
    app.parse(std::move(words));
    return std::nullopt;
  } catch (const CLI::CallForHelp& help) {
    app.exit(help);
  } catch (const CLI::CallForAllHelp& help) {
    app.exit(help);
  } catch (const CLI::CallForVersion& version) {
    app.exit(version);
  } catch (const CLI::ParseError& error) {
    // Words that belong to nothing are passed over until the end, and then the missing command is complained of.
    const auto unknown = app.get_subcommands().empty() ? app.remaining() : std::vector<std::string>();
    const std::string what = unknown.empty() ? error.what() : "there is no command or option " + unknown.front();
    complain(what + " (--help tells more)");
    return kWrongUsage;
  }
  std::cout.flush();
  return kSuccess;
}

int mainProgram(int argc, const char* const* argv) {
  std::signal(SIGPIPE, SIG_IGN);
  Context context;
  const auto environment = linux_host::HostEnvironment::current();
  context.socket.sockets = linux_host::serviceSocketPaths(environment);
  context.stateDirectory = linux_host::defaultStateDirectory(environment).value_or("");
  CLI::App app;
  Options options;
  describeCommandLine(app, context, options, linux_host::versionOf("tarnreportingctl"));
  if (const auto status = parse(app, wordsOf(argc, argv))) return *status;
  if (!options.socket.empty()) {
    context.socket.sockets = {options.socket};
  }
  if (context.socket.sockets.size() == 1) {
    context.ordinarySocket = context.socket.sockets.front();
  }
  if (options.admin) {
    for (std::string& socket : context.socket.sockets) {
      socket = linux_host::adminSocketPath(socket);
    }
  }
  context.socket.timeout = milliseconds(options.timeout);
  context.terminal = terminalOf(currentTerminal(), colorChoice(options.color), options.quiet);
  if (options.wait) {
    if (const int status = waitForService(context.socket, milliseconds(*options.wait)); status != kSuccess) {
      return status;
    }
  }
  return context.chosen();
}

}  // namespace

}  // namespace tarn::ctl

int main(int argc, char** argv) {
  try {
    return tarn::ctl::mainProgram(argc, argv);
  } catch (const std::exception& trouble) {
    tarn::ctl::complain(trouble.what());
    return tarn::ctl::kFailure;
  }
}
