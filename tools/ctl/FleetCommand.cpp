// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <filesystem>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "tools/ctl/Command.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

constexpr const char* kProgram = "tarnreporting-fleet";

// Beside this program, as they are built and installed together; else wherever the shell would find it.
std::string besideThis() {
  std::error_code error;
  const auto self = std::filesystem::read_symlink("/proc/self/exe", error);
  return error ? std::string() : (self.parent_path() / kProgram).string();
}

// Comes back only when it can't be run.
int handOver(std::vector<std::string> words) {
  std::vector<char*> arguments;
  for (std::string& word : words) {
    arguments.push_back(word.data());
  }
  arguments.push_back(nullptr);
  ::execv(besideThis().c_str(), arguments.data());
  ::execvp(kProgram, arguments.data());
  if (errno == ENOENT) {
    complain(std::string("fleet needs ") + kProgram + ", which the package tarnreporting-collect has");
  } else {
    complain(std::string("can't run ") + kProgram + ": " + std::system_category().message(errno));
  }
  return kUnreachable;
}

}  // namespace

void addFleetCommand(CLI::App& app, Context& context) {
  CLI::App* command =
      app.add_subcommand("fleet", "Ask the database of many devices: fleet sessions, fleet top or fleet report");
  // All words after it are the other program's, and its help tells of them.
  command->prefix_command();
  command->fallthrough(false);
  command->set_help_flag();
  command->footer(
      "\nRuns tarnreporting-fleet of the package tarnreporting-collect with the words that follow. \"tarnreportingctl "
      "fleet\n--help\" is its help.\n\n"
      "Examples:\n"
      "  tarnreportingctl fleet top --by release\n"
      "  tarnreportingctl fleet sessions --since -1h --app 'org.example.*' --db postgresql://store/tarnreporting\n"
      "  tarnreportingctl fleet report --since -7d -o week.html");
  command->callback([&context, command] {
    context.chosen = [&context, command] {
      std::vector<std::string> words{kProgram, "--color", context.terminal.color ? "always" : "never"};
      if (context.terminal.quiet) {
        words.emplace_back("-q");
      }
      for (const std::string& word : command->remaining()) {
        words.push_back(word);
      }
      return handOver(std::move(words));
    };
  });
}

}  // namespace tarn::ctl
