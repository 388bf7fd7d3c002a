// SPDX-License-Identifier: Apache-2.0
// Command: what the sub-commands of tarnreportingctl share.
//
// Each command adds itself to the command line with its options and its help, and puts what it does into the slot that
// its options fill. main() parses and then runs the one that was chosen.
//
// Threads: one.
#pragma once

#include <functional>
#include <string>

#include "tools/ctl/ServiceConnection.h"
#include "tools/ctl/terminal/Terminal.h"

namespace CLI {
class App;
}

namespace tarn::ctl {

// Filled by main() from the environment and the options that all commands take: where the service may be and how long
// an answer may take, and the directory that holds recorder, settings and notifications, empty when nothing names one.
// `chosen` is what to do, and returns the exit status. Of the commands some talk to the service, some read its
// directory, and `lint` and `explain` need neither.
struct Context {
  ServiceAddress socket;       // of the service
  std::string ordinarySocket;  // when there is only one place where the service may be, whichever socket is talked to
  std::string stateDirectory;  // of the service
  Terminal terminal = {};      // how results may look
  std::function<int()> chosen;
};

// Here and below, `context` outlives the parsing and the running. Plays a script against the service (ScriptPlayer).
void addRunCommand(CLI::App& app, Context& context);
// Prints what the back-ends received, from the recorder's file; the service need not run.
void addEventsCommand(CLI::App& app, Context& context);
// Reads and changes the settings; a running service sees a change when it reads the key next.
void addDefaultsCommand(CLI::App& app, Context& context);
// Posts a named notification, with or without a new state word.
void addNotifyCommand(CLI::App& app, Context& context);
// Prints the reporter IDs of all sessions of all clients.
void addReportersCommand(CLI::App& app, Context& context);
// Ends the service by the remote operation for that.
void addKillCommand(CLI::App& app, Context& context);
// Tells whether the service is up and what it has, or what each user has and may have.
void addStatusCommand(CLI::App& app, Context& context);
// Looks through a script without playing it (MessageLint).
void addLintCommand(CLI::App& app, Context& context);
// Tells what a name or a key of messages means, from the dictionary.
void addExplainCommand(CLI::App& app, Context& context);
// Compares the recorded events with their checksums; changes nothing.
void addCheckCommand(CLI::App& app, Context& context);
// Makes one page of sessions with pictures (tools/report).
void addReportCommand(CLI::App& app, Context& context);
// Shows the open sessions, what waits and the ledger, again and again (views/TopLoop).
void addTopCommand(CLI::App& app, Context& context);

// Hands a question over many devices to the program that answers it.
void addFleetCommand(CLI::App& app, Context& context);

// Lists the sessions that the recorder holds.
void addSessionsCommand(CLI::App& app, Context& context);
// Tells what one of them did, on one screen.
void addShowCommand(CLI::App& app, Context& context);
// Prints one of them for other programs, or as a script.
void addExportCommand(CLI::App& app, Context& context);

}  // namespace tarn::ctl
