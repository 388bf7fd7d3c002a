// tarnreportingctl: talks to the reporting service and reads what it recorded.
#include <CLI/CLI.hpp>
#include <csignal>
#include <exception>
#include <iostream>
#include <optional>
#include <string>
#include <vector>

#include "host/settings/HostPaths.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/ExitStatus.h"
#include "tools/ctl/Output.h"

namespace tarn::ctl {

namespace {

constexpr const char* kDescription = "Talks to the audio reporting service and reads what it recorded.";
constexpr const char* kFooter = R"(
Results go to stdout, complaints to stderr. Exit status: 0 success; 64 wrong usage; 65 bad input data; 69 the service
can't be reached or the connection was lost; 1 any other failure.

"tarnreportingctl COMMAND --help" tells more, with examples.)";

void describe(CLI::App& app, Context& context) {
  app.name("tarnreportingctl");
  app.description(kDescription);
  app.footer(kFooter);
  app.set_version_flag("--version", "tarnreportingctl " TARN_VERSION, "Print the version and exit");
  app.add_option("--socket", context.socket, "The service's socket")->capture_default_str()->type_name("PATH");
  app.add_option("--state-dir", context.stateDirectory, "The service's state directory")
      ->capture_default_str()
      ->type_name("DIR");
  app.require_subcommand(1);
  // The two options above may also stand after the command.
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
}

// Parses; `context.chosen` is what to do then, unless everything is done and the exit status returned.
std::optional<int> parse(CLI::App& app, int argc, const char* const* argv) {
  try {
    app.parse(argc, argv);
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
    complain(printable(what) + " (--help tells more)");
    return kWrongUsage;
  }
  std::cout.flush();
  return kSuccess;
}

int mainProgram(int argc, const char* const* argv) {
  std::signal(SIGPIPE, SIG_IGN);
  Context context;
  const auto environment = linux_host::HostEnvironment::current();
  context.socket = linux_host::defaultSocketPath(environment).value_or("");
  context.stateDirectory = linux_host::defaultStateDirectory(environment).value_or("");
  CLI::App app;
  describe(app, context);
  if (const auto status = parse(app, argc, argv)) return *status;
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
