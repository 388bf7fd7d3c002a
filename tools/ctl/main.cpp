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
#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::ctl {

namespace {

constexpr double kLongestSeconds = 86400;
constexpr const char* kUsualWait = "30";

// What all commands take, beside what Context holds.
struct Options {
  std::string socket;
  double timeout = 5;
  std::optional<double> wait;
  std::string color = "auto";
  bool quiet = false;
};

constexpr const char* kDescription = "Talks to the audio reporting service and reads what it recorded.";
constexpr const char* kFooter = R"(
Results go to stdout, complaints to stderr. Exit status: 0 success; 64 wrong usage; 65 bad input data; 69 the service
can't be reached or the connection was lost; 1 any other failure.

"tarnreportingctl COMMAND --help" tells more, with examples.)";

void describe(CLI::App& app, Context& context, Options& options) {
  app.name("tarnreportingctl");
  app.description(kDescription);
  app.footer(kFooter);
  app.set_version_flag("--version", "tarnreportingctl " TARN_VERSION, "Print the version and exit");
  app.add_option("--socket", options.socket,
                 "The service's socket (default: $TARNREPORTING_SOCKET, else the user's, else the system's)")
      ->type_name("PATH");
  app.add_option("--timeout", options.timeout, "How many seconds an answer may take (default: 5); then 69")
      ->type_name("S")
      ->check([](const std::string& text) { return checkSeconds(text, 0.001, kLongestSeconds); });
  app.add_option("--wait", options.wait,
                 "First wait until the service is there, so many seconds (default: 30); then 69")
      ->type_name("[=S]")
      ->check([](const std::string& text) { return checkSeconds(text, 0, kLongestSeconds); });
  app.add_option("--state-dir", context.stateDirectory, "The service's state directory")
      ->capture_default_str()
      ->type_name("DIR");
  app.add_option("--color", options.color, "Colours: auto (on a terminal, unless NO_COLOR is set), always or never")
      ->type_name("WHEN")
      ->check(CLI::IsMember({"auto", "always", "never"}));
  app.add_flag("-q,--quiet", options.quiet, "No headings and no remarks: results alone");
  app.require_subcommand(1);
  // The options above may also stand after the command.
  app.fallthrough();
  addRunCommand(app, context);
  addEventsCommand(app, context);
  addDefaultsCommand(app, context);
  addNotifyCommand(app, context);
  addReportersCommand(app, context);
  addKillCommand(app, context);
  addStatusCommand(app, context);
  addLintCommand(app, context);
  addExplainCommand(app, context);
  addCheckCommand(app, context);
  addSessionsCommand(app, context);
  addShowCommand(app, context);
  addExportCommand(app, context);
  addReportCommand(app, context);
  addTopCommand(app, context);
}

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
  describe(app, context, options);
  if (const auto status = parse(app, wordsOf(argc, argv))) return *status;
  if (!options.socket.empty()) {
    context.socket.sockets = {options.socket};
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
