// SPDX-License-Identifier: Apache-2.0
#include <CLI/CLI.hpp>
#include <charconv>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "host/settings/NotificationFolder.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

struct Arguments {
  std::string name;
  std::string state;
};

std::optional<std::uint64_t> stateWord(const std::string& text) {
  std::uint64_t word = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), word);
  const bool isWhole = error == std::errc() && end == text.data() + text.size();
  return isWhole ? std::optional(word) : std::nullopt;
}

// For the command line: what is wrong, or nothing.
std::string checkStateWord(const std::string& text) {
  return stateWord(text) ? "" : text + " is no number from 0 to 2^64-1";
}

int notify(const Context& context, const Arguments& arguments) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  const linux_host::NotificationFolder notifications(context.stateDirectory + "/notifications");
  const Status posted = notifications.post(arguments.name, stateWord(arguments.state));
  if (posted.ok()) return kSuccess;
  complain(posted->text);
  return kFailure;
}

}  // namespace

void addNotifyCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("notify", "Post a named notification");
  const auto arguments = std::make_shared<Arguments>();
  command->add_option("NAME", arguments->name, "The notification")->required();
  command->add_option("--state", arguments->state, "Its state word from now on, 0 to 2^64-1")
      ->check(CLI::Validator(checkStateWord, "N"))
      ->type_name("");
  command->footer(
      "\nWithout --state the word stays what it is (0 when there was none).\n\n"
      "Example:\n  tarnreportingctl notify sys.oxbow.homeshell.ringerstate --state 1");
  command->callback(
      [&context, arguments] { context.chosen = [&context, arguments] { return notify(context, *arguments); }; });
}

}  // namespace tarn::ctl
