// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <string_view>
#include <vector>

#include "host/check/Check.h"
#include "plist/formats/Json.h"
#include "recorder/store/StoreReport.h"
#include "recorder/store/reading/StoreAccess.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

using recorder::IdRange;

// One range a line, so that a script can go through them.
void printRanges(Output& output, std::string_view what, const std::vector<IdRange>& ranges) {
  for (const IdRange& range : ranges) {
    std::string line(what);
    line.append(" ").append(std::to_string(range.first));
    if (range.last != range.first) {
      line.append("-").append(std::to_string(range.last));
    }
    output.line(line);
  }
}

int checkStore(const Context& context) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  const std::string path = context.stateDirectory + "/recorder.sqlite3";
  if (recorder::presenceOf(path) == recorder::Presence::Refused) {
    complain(recorder::refusalOf(path).text);
    return kFailure;
  }
  const auto inspected = withProgress(context.terminal.progress, "checking the store",
                                      [&](const ProgressHandler&) { return recorder::inspectStore(path); });
  if (inspected.failed()) {
    complain("can't check " + printable(path) + ": " + printable(inspected.error->text));
    return kFailure;
  }
  const recorder::StoreReport& report = inspected.value;
  Output output(STDOUT_FILENO);
  output.line("whole " + std::to_string(report.whole));
  printRanges(output, "lost", report.lost);
  printRanges(output, "noted-lost", report.notedLost);
  printRanges(output, "unproven", report.unproven);
  for (std::size_t place = 0; place < report.damagedRows.size(); ++place) {
    printRanges(output, "damaged-" + std::string(recorder::SessionSums::kTables.at(place).name),
                report.damagedRows.at(place));
  }
  if (!report.damage.empty()) {
    complain(printable(path) + " is " + printable(report.damage));
  }
  return report.isWhole() ? output.status() : kFailure;
}

// A service that would be started with the same socket and state directory.
int checkInstallation(const Context& context, bool asJson) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  const auto environment = linux_host::HostEnvironment::current();
  linux_host::ServiceOptions options;
  options.stateDirectory = context.stateDirectory;
  options.socketPath = linux_host::defaultSocketPath(environment);
  // One that an option or a variable names stands alone.
  if (!context.ordinarySocket.empty()) {
    options.socketPath = context.ordinarySocket;
  }
  options.socketIsDefault = options.socketPath == linux_host::defaultSocketPath(environment);
  options.defaultConfigurationFile = linux_host::defaultConfigurationFile(environment);
  options.defaultDevicePropertiesFile = linux_host::defaultDevicePropertiesFile(environment);
  const auto checks = linux_host::checkAll(linux_host::subjectOf(std::move(options)));
  Output output(STDOUT_FILENO);
  for (const linux_host::Check& check : checks) {
    std::string line;
    if (asJson) {
      plist::appendJson(line, plist::Dictionary{{"check", check.name}, {"good", check.isGood}, {"text", check.text}});
    } else {
      line = linux_host::lineOf(check);
    }
    output.line(line);
  }
  return linux_host::areGood(checks) ? output.status() : kFailure;
}

}  // namespace

void addCheckCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("check", "Check whether the service would do, and what it keeps");
  const auto store = std::make_shared<bool>(false);
  const auto asJson = std::make_shared<bool>(false);
  CLI::Option* const storeFlag =
      command->add_flag("--store", *store, "Compare each event and session that was recorded with its checksum");
  command->add_flag("--json", *asJson, "Print one JSON object a line")->excludes(storeFlag);
  command->footer(
      "\nPrints one line, good or bad with what to do, for each of configuration, device properties, state directory,\n"
      "store, space, socket directory, socket, admin socket (where there is to be one) and unit. Exit status 0 only\n"
      "when all are good.\n\n"
      "With --store prints how many events are whole, then one line for each range of ids that isn't: lost, "
      "noted-lost\n"
      "(the recorder knows) or unproven (the event is there, its checksum is damaged); and for ids of rows of "
      "sessions,\n"
      "periods, runs and redundant_messages that aren't as they were written. Exit status 0 only when all are "
      "whole.\n\n"
      "Changes nothing; the service may run.\n\n"
      "Examples:\n"
      "  tarnreportingctl check\n"
      "  tarnreportingctl check --store");
  command->callback([&context, store, asJson] {
    context.chosen = [&context, store, asJson] {
      return *store ? checkStore(context) : checkInstallation(context, *asJson);
    };
  });
}

}  // namespace tarn::ctl
