#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>

#include "plist/formats/Json.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/Output.h"
#include "tools/ctl/ServiceConnection.h"

namespace tarn::ctl {

namespace {

constexpr std::size_t kNameWidth = 24;

void printRow(Output& output, const std::string& name, const std::string& value) {
  std::string row = "  " + name;
  row.resize(std::max(row.size() + 1, kNameWidth + 2), ' ');
  output.line(row + value);
}

// What comes first is what people ask for; all the rest is the ledger, in the service's own order.
void printStatus(Output& output, const std::string& socket, const plist::Dictionary& status) {
  output.line("the service is up at " + printable(socket));
  printRow(output, "clients", status.get("connections_open").asText());
  printRow(output, "sessions", status.get("sessions").asText());
  output.line("ledger");
  for (const auto& entry : status) {
    const std::string name = printable(entry.key.text());
    if (entry.value.kind() != plist::Kind::Dictionary) {
      printRow(output, name, printable(entry.value.asText()));
      continue;
    }
    const plist::Dictionary reasons = entry.value.dictionary();
    printRow(output, name, reasons.empty() ? "none" : "");
    for (const auto& reason : reasons) {
      printRow(output, "  " + printable(reason.key.text()), printable(reason.value.asText()));
    }
  }
}

int status(const Context& context, bool asJson) {
  const Answer answer = askService(context.socket, client::status());
  if (answer.status != 0) return answer.status;
  Output output(STDOUT_FILENO);
  const plist::Dictionary dictionary = answer.reply.dictionary();
  if (asJson) {
    std::string text;
    plist::appendJson(text, dictionary);
    output.line(text);
  } else {
    printStatus(output, answer.socket, dictionary);
  }
  return output.status();
}

}  // namespace

void addStatusCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("status", "Is the service up; its clients, sessions and ledger");
  const auto asJson = std::make_shared<bool>(false);
  command->add_flag("--json", *asJson, "Print the service's own dictionary as one JSON object");
  command->footer(
      "\nThe asking connection counts among the clients. Exit status 69 when the service is not up.\n\n"
      "Example:\n  tarnreportingctl status --json | jq .recorder_waiting");
  command->callback([&context, asJson] { context.chosen = [&context, asJson] { return status(context, *asJson); }; });
}

}  // namespace tarn::ctl
