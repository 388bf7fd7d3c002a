// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>

#include "plist/formats/Json.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/ServiceConnection.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

constexpr std::size_t kNameWidth = 24;
constexpr const char* kQuotas = "quotas";

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
    if (name == kQuotas) continue;
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

// One line a bound, then one a user and what it has.
void printQuotas(Output& output, const plist::Dictionary& quotas) {
  output.line("limits (0: none)");
  for (const auto& limit : quotas.get("limits").dictionary()) {
    output.line("  " + printable(limit.key.text()) + " " + printable(limit.value.asText()));
  }
  output.line("users");
  for (const auto& user : quotas.get("users").dictionary()) {
    std::string row = "  uid " + printable(user.key.text()) + ":";
    for (const auto& use : user.value.dictionary()) {
      row += " " + printable(use.key.text()) + " " + printable(use.value.asText());
    }
    output.line(row);
  }
}

int status(const Context& context, bool asJson, bool quotas) {
  const Answer answer = askService(context.socket, client::status());
  if (answer.status != 0) return answer.status;
  Output output(STDOUT_FILENO);
  const plist::Dictionary whole = answer.reply.dictionary();
  const plist::Dictionary dictionary = quotas ? whole.get(kQuotas).dictionary() : whole;
  if (quotas && !asJson) {
    printQuotas(output, dictionary);
  } else if (asJson) {
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
  const auto quotas = std::make_shared<bool>(false);
  command->add_flag("--json", *asJson, "Print the service's own dictionary as one JSON object");
  command->add_flag("--quotas", *quotas, "Print what each user may have, and what it has, instead");
  command->footer(
      "\nThe asking connection counts among the clients. Exit status 69 when the service is not up.\n\n"
      "Example:\n  tarnreportingctl status --json | jq .recorder_waiting");
  command->callback([&context, asJson, quotas] {
    context.chosen = [&context, asJson, quotas] { return status(context, *asJson, *quotas); };
  });
}

}  // namespace tarn::ctl
