// Command: what the sub-commands of tarnreportingctl share.
//
// Each command adds itself to the command line with its options and its help, and puts what it does into the slot that
// its options fill. main() parses and then runs the one that was chosen.
#pragma once

#include <functional>
#include <string>

#include "tools/ctl/ServiceConnection.h"

namespace CLI {
class App;
}

namespace tarn::ctl {

struct Context {
  ServiceAddress socket;       // of the service
  std::string stateDirectory;  // of the service
  std::function<int()> chosen;
};

// `context` outlives the parsing and the running.
void addRunCommand(CLI::App& app, Context& context);
void addEventsCommand(CLI::App& app, Context& context);
void addDefaultsCommand(CLI::App& app, Context& context);
void addNotifyCommand(CLI::App& app, Context& context);
void addReportersCommand(CLI::App& app, Context& context);
void addKillCommand(CLI::App& app, Context& context);
void addStatusCommand(CLI::App& app, Context& context);
void addLintCommand(CLI::App& app, Context& context);
void addExplainCommand(CLI::App& app, Context& context);
void addCheckCommand(CLI::App& app, Context& context);

}  // namespace tarn::ctl
