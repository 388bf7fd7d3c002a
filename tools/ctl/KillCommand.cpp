// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>

#include "tools/ctl/Command.h"
#include "tools/ctl/ServiceConnection.h"

namespace tarn::ctl {

void addKillCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("kill", "End the service; what it still holds is committed first");
  command->footer(
      "\nSessions are not stopped. Returns once the service has ended; the service's own exit status is 2. A service "
      "that\n"
      "keeps this to its admin socket refuses it over the other one: then give --admin.\n\n"
      "Examples:\n  tarnreportingctl --socket /run/tarnreporting/socket kill\n"
      "  tarnreportingctl --admin kill");
  command->callback(
      [&context] { context.chosen = [&context] { return askService(context.socket, client::killService()).status; }; });
}

}  // namespace tarn::ctl
