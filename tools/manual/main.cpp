// SPDX-License-Identifier: Apache-2.0
// tarnreportingcommands: prints the commands and options of our programs as JSON, from the very tables that they parse
// with. docs/manual/commands.json keeps it; manual pages and completions are made of that.
#include <CLI/CLI.hpp>
#include <iostream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>

#include "adapters/pipewire/AdapterOptions.h"
#include "fleet/ask/AskOptions.h"
#include "fleet/collect/CollectOptions.h"
#include "fleet/export/ExportOptions.h"
#include "host/settings/ServiceOptions.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/CommandLine.h"

namespace tarn {
namespace {

using Json = nlohmann::ordered_json;

// "WHEN:{auto,always,never}", a type's name with what its checks take, as {"value": "WHEN", "choices": [...]}.
void addValue(const CLI::Option& option, Json& told) {
  const std::string type = option.get_type_name();
  told["value"] = type.substr(0, type.find(':'));
  const std::size_t begin = type.find(":{");
  const std::size_t end = type.find('}', begin);
  if (begin == std::string::npos || end == std::string::npos) return;
  std::istringstream choices(type.substr(begin + 2, end - begin - 2));
  Json list = Json::array();
  for (std::string choice; std::getline(choices, choice, ',');) {
    list.push_back(choice);
  }
  told["choices"] = std::move(list);
}

Json optionJson(const CLI::Option& option) {
  Json told;
  told["names"] = Json::array();
  for (const std::string& name : option.get_snames()) {
    told["names"].push_back("-" + name);
  }
  for (const std::string& name : option.get_lnames()) {
    told["names"].push_back("--" + name);
  }
  if (!option.nonpositional()) {
    told["positional"] = option.get_name(true);
  }
  told["text"] = option.get_description();
  if (option.get_items_expected_max() > 0) {
    addValue(option, told);
  }
  told["required"] = option.get_required();
  told["repeated"] = option.get_items_expected_max() > 1;
  return told;
}

Json commandJson(const CLI::App& app) {
  Json told;
  told["name"] = app.get_name();
  told["text"] = app.get_description();
  told["more"] = app.get_footer();
  told["options"] = Json::array();
  for (const CLI::Option* option : app.get_options()) {
    told["options"].push_back(optionJson(*option));
  }
  told["commands"] = Json::array();
  for (const CLI::App* command : app.get_subcommands([](const CLI::App*) { return true; })) {
    told["commands"].push_back(commandJson(*command));
  }
  return told;
}

Json serviceJson() {
  CLI::App app;
  linux_host::ServiceOptionTexts texts;
  linux_host::describeServiceCommand(app, texts, {});
  return commandJson(app);
}

Json adapterJson(streams::Adapter adapter) {
  CLI::App app;
  streams::AdapterOptionTexts texts;
  streams::describeAdapterCommand(adapter, app, texts);
  return commandJson(app);
}

Json exportJson() {
  CLI::App app;
  fleet::ExportOptionTexts texts;
  fleet::describeExportCommand(app, texts);
  return commandJson(app);
}

Json collectJson() {
  CLI::App app;
  fleet::CollectOptionTexts texts;
  fleet::describeCollectCommand(app, texts);
  return commandJson(app);
}

Json askJson() {
  CLI::App app;
  fleet::AskOptions options;
  fleet::describeAskCommand(app, options);
  return commandJson(app);
}

Json toolJson() {
  CLI::App app;
  ctl::Context context;
  ctl::Options options;
  ctl::describeCommandLine(app, context, options, {});
  return commandJson(app);
}

}  // namespace
}  // namespace tarn

int main() {
  using tarn::streams::Adapter;
  const auto programs = tarn::Json::array({tarn::serviceJson(), tarn::toolJson(), tarn::adapterJson(Adapter::Alsa),
                                           tarn::adapterJson(Adapter::PipeWire), tarn::exportJson(),
                                           tarn::collectJson(), tarn::askJson()});
  std::cout << programs.dump(1) << '\n';
  return std::cout.good() ? 0 : 1;
}
