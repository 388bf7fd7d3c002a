// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <memory>
#include <string_view>
#include <vector>

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

}  // namespace

void addCheckCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("check", "Check what the service keeps");
  const auto store = std::make_shared<bool>(false);
  command->add_flag("--store", *store, "Compare each event and session that was recorded with its checksum")
      ->required();
  command->footer(
      "\nPrints how many events are whole, then one line for each range of ids that isn't: lost, noted-lost (the\n"
      "recorder knows) or unproven (the event is there, its checksum is damaged); and for ids of rows of sessions,\n"
      "periods, runs and redundant_messages that aren't as they were written. Exit status 0 only when all are whole.\n"
      "Reads the recorder in the state directory and changes nothing; the service may run.\n\n"
      "Example:\n"
      "  tarnreportingctl check --store");
  command->callback([&context, store] { context.chosen = [&context] { return checkStore(context); }; });
}

}  // namespace tarn::ctl
