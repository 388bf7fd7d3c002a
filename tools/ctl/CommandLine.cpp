// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/CommandLine.h"

#include <CLI/CLI.hpp>

#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::ctl {

namespace {

constexpr double kLongestSeconds = 86400;

constexpr const char* kDescription = "Talks to the audio reporting service and reads what it recorded.";
constexpr const char* kFooter = R"(
Results go to stdout, complaints to stderr. Exit status: 0 success; 64 wrong usage; 65 bad input data; 69 the service
can't be reached or the connection was lost; 1 any other failure.

"tarnreportingctl COMMAND --help" tells more, with examples.)";

}  // namespace

void describeCommandLine(CLI::App& app, Context& context, Options& options, const std::string& version) {
  app.name("tarnreportingctl");
  app.description(kDescription);
  app.footer(kFooter);
  app.set_version_flag("--version", version, "Print the version and exit");
  app.add_option("--socket", options.socket,
                 "The service's socket (default: $TARNREPORTING_SOCKET, else the user's, else the system's)")
      ->type_name("PATH");
  app.add_flag(
      "--admin", options.admin,
      "Talk to the admin socket, which is the service's followed by -admin: only there may the service be ended, "
      "and others' sessions be seen, when it is set up so");
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
  addFleetCommand(app, context);
}

}  // namespace tarn::ctl
