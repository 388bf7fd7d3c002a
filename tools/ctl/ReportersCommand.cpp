// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>

#include "tools/ctl/Command.h"
#include "tools/ctl/ServiceConnection.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

int reporters(const Context& context) {
  const Answer answer = askService(context.socket, client::getAllReporters());
  if (answer.status != 0) return answer.status;
  Output output(STDOUT_FILENO);
  for (const std::int64_t reporterID : answer.reply.numbers()) {
    output.line(std::to_string(reporterID));
  }
  return output.status();
}

}  // namespace

void addReportersCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("reporters", "Print the reporter IDs of all sessions of all clients");
  command->footer("\nOne ID a line, client by client.\n\nExample:\n  tarnreportingctl reporters | wc -l");
  command->callback([&context] { context.chosen = [&context] { return reporters(context); }; });
}

}  // namespace tarn::ctl
