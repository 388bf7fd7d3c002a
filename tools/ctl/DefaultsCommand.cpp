// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>

#include "host/settings/JsonDefaultsStore.h"
#include "host/system/JsonValues.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/SilentLog.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

using linux_host::JsonDefaultsStore;
using linux_host::JsonLayout;

struct Arguments {
  std::string suite;
  std::string key;
  std::string json;
  bool wholeSuite = false;
};

// The store together with the log that it wants.
class Defaults {
 public:
  explicit Defaults(const Context& context) : store_(context.stateDirectory + "/defaults", log_) {}
  JsonDefaultsStore& operator*() { return store_; }
  JsonDefaultsStore* operator->() { return &store_; }

 private:
  SilentLog log_;
  JsonDefaultsStore store_;
};

int print(const plist::ValueView& value, JsonLayout layout) {
  auto text = linux_host::jsonText(value, layout);
  if (!text) {
    complain("the value can't be written as JSON");
    return kFailure;
  }
  while (text->ends_with('\n')) {
    text->pop_back();
  }
  Output output(STDOUT_FILENO);
  for (std::string_view rest = *text; !rest.empty();) {
    const std::size_t end = std::min(rest.find('\n'), rest.size());
    output.line(rest.substr(0, end));
    rest.remove_prefix(std::min(end + 1, rest.size()));
  }
  return output.status();
}

int read(const Context& context, const Arguments& arguments) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  Defaults defaults(context);
  const JsonDefaultsStore::Suite suite = defaults->suite(arguments.suite);
  if (suite.failed()) {
    complain(suite.error->text);
    return kBadInput;
  }
  if (arguments.wholeSuite) return print(suite.value, JsonLayout::Indented);
  const plist::ValueView value = suite.value.get(arguments.key);
  if (!value.present()) {
    complain("there is no key \"" + arguments.key + "\" in " + arguments.suite);
    return kFailure;
  }
  return print(value, JsonLayout::OneLine);
}

// An absent value removes the key.
int store(const Context& context, const Arguments& arguments, const plist::ValueView& value) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  Defaults defaults(context);
  const bool isBroken = defaults->suite(arguments.suite).failed();
  const Status stored = defaults->store(arguments.suite, arguments.key, value);
  if (stored.ok()) return kSuccess;
  complain(stored->text);
  return isBroken ? kBadInput : kFailure;
}

int write(const Context& context, const Arguments& arguments) {
  const linux_host::JsonReading reading = linux_host::readJson(arguments.json);
  if (reading.fault) {
    complain("JSON:" + reading.fault->description() + ", expected one JSON value (a text needs its quotes)");
    return kBadInput;
  }
  return store(context, arguments, reading.value);
}

void addSuiteAndKey(CLI::App& command, Arguments& arguments, bool keyIsRequired) {
  command.add_option("SUITE", arguments.suite, "The suite or application domain")->required();
  command.add_option("KEY", arguments.key, "The key")->required(keyIsRequired);
}

}  // namespace

void addDefaultsCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("defaults", "Read and change the service's settings");
  command->require_subcommand(1);
  command->footer(
      "\nA running service sees a change the next time it reads the key; the service need not run. Values are JSON;\n"
      "{\"$date\": seconds} is a date, {\"$data\": \"base64\"} is data.\n\n"
      "Examples:\n"
      "  tarnreportingctl defaults write sys.oxbow.tarnkit device_name '\"kitchen\"'\n"
      "  tarnreportingctl notify sys.oxbow.tarnkit.reporting\n"
      "  tarnreportingctl defaults read sys.oxbow.tarnkit");
  const auto arguments = std::make_shared<Arguments>();

  CLI::App* readCommand = command->add_subcommand("read", "Print a suite, or the value of one of its keys, as JSON");
  addSuiteAndKey(*readCommand, *arguments, false);
  readCommand->footer(
      "\nExit status 1 when the key is not there.\n\n"
      "Example:\n  tarnreportingctl defaults read sys.oxbow.tarnkit device_name");
  readCommand->callback([&context, readCommand, arguments] {
    arguments->wholeSuite = readCommand->count("KEY") == 0;
    context.chosen = [&context, arguments] { return read(context, *arguments); };
  });

  CLI::App* writeCommand = command->add_subcommand("write", "Store a value under a key");
  addSuiteAndKey(*writeCommand, *arguments, true);
  writeCommand->add_option("JSON", arguments->json, "The value")->required();
  writeCommand->footer("\nExample:\n  tarnreportingctl defaults write sys.oxbow.tarnkit disable_reporting true");
  writeCommand->callback(
      [&context, arguments] { context.chosen = [&context, arguments] { return write(context, *arguments); }; });

  CLI::App* deleteCommand = command->add_subcommand("delete", "Remove a key; one that is not there is no failure");
  addSuiteAndKey(*deleteCommand, *arguments, true);
  deleteCommand->footer("\nExample:\n  tarnreportingctl defaults delete sys.oxbow.tarnkit disable_reporting");
  deleteCommand->callback([&context, arguments] {
    context.chosen = [&context, arguments] { return store(context, *arguments, plist::ValueView()); };
  });
}

}  // namespace tarn::ctl
