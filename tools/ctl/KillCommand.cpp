// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>

#include "tools/ctl/Command.h"
#include "tools/ctl/ServiceConnection.h"

namespace tarn::ctl {

void addKillCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("kill", "End the service; what it still holds is committed first");
  command->footer(
      "\nSessions are not stopped. Returns once the service has ended; the service's own exit status is 2.\n\n"
      "Example:\n  tarnreportingctl --socket /run/tarnreporting/socket kill");
  command->callback(
      [&context] { context.chosen = [&context] { return askService(context.socket, client::killService()).status; }; });
}

}  // namespace tarn::ctl
