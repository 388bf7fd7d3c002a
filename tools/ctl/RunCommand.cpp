// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <memory>
#include <string>
#include <string_view>

#include "host/system/SystemError.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/InputFile.h"
#include "tools/ctl/ScriptPlayer.h"
#include "tools/ctl/terminal/Output.h"
#include "wire/Request.h"

namespace tarn::ctl {

namespace {

constexpr std::size_t kNameWidth = 30;

std::string operationLine(std::string_view name, const std::string& members) {
  std::string line = "    " + std::string(name);
  if (!members.empty()) {
    line.resize(4 + kNameWidth, ' ');
  }
  return line + members + "\n";
}

std::string operationLine(const wire::OperationRow& row) {
  std::string members;
  for (const wire::Argument argument : row.arguments) {
    members += (members.empty() ? "\"" : ", \"") + std::string(wire::rowOf(argument).name) + "\"";
  }
  return operationLine(row.name, members);
}

std::string operationLines() {
  std::string lines;
  for (const wire::OperationRow& row : wire::kOperations) {
    lines += row.servedBy == wire::ServedBy::Service ? operationLine(row) : "";
  }
  return lines + operationLine("sleep", "\"seconds\"") + operationLine("disconnect", "");
}

constexpr const char* kHelpBefore = R"(
A script is one JSON object a line; blank lines are passed over.
  "client"  the connection, "main" when left out; each name is a connection of its own
  values    JSON integers are integers, other numbers doubles; {"$date": seconds} is a date,
            {"$data": "base64"} is data
  "op"      one of these, each with the members that are its arguments:
)";

constexpr const char* kHelpAfter = R"(
"reporterIDs" may be left out: every running session. Categories, types and service types by number or name.

Each line waits for its reply, except a start (its reply comes at the stop) and killService (it has none). Replies are
printed as they arrive, one JSON object a line: client, line, op, error, result. A reply that carries an error is a
reply like any other; one that doesn't come within --timeout stops the script with 69. A bad line stops the script: FILE:LINE, what is wrong and what was expected, exit 65.

Example:
  tarnreportingctl run <<'END'
  {"op": "createReportingSession", "reporterID": 7}
  {"op": "setServiceType", "reporterID": 7, "serviceType": "longformaudio"}
  {"op": "startReportingSessionForID", "reporterID": 7}
  {"op": "sendMessage", "reporterIDs": [7], "category": "Playback", "type": "Start", "message": {"volume": 0.5}}
  {"op": "stopReportingSessionForID", "reporterID": 7}
  END)";

int run(const Context& context, const std::string& path) {
  const InputFile file(path);
  if (file.fd() < 0) {
    complain(linux_host::errorOf("can't open the script " + path, errno).text);
    return kBadInput;
  }
  Output output(STDOUT_FILENO);
  ScriptPlayer player(context.socket, file.isStandardInput() ? "stdin" : path, output);
  return player.play(file.fd());
}

}  // namespace

void addRunCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("run", "Play a script against the service and print each reply");
  const auto path = std::make_shared<std::string>("-");
  command->add_option("FILE", *path, "The script; standard input when left out or -");
  command->footer(kHelpBefore + operationLines() + kHelpAfter);
  command->callback([&context, path] { context.chosen = [&context, path] { return run(context, *path); }; });
}

}  // namespace tarn::ctl
