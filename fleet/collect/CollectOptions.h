// SPDX-License-Identifier: Apache-2.0
// The command line and the configuration of tarnreporting-collect. Parsing looks at no file and changes nothing.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "fleet/program/ProgramLog.h"
#include "fleet/publish/ServerSettings.h"
#include "plist/Result.h"

namespace CLI {
class App;
}

namespace tarn::fleet {

struct CollectOptions {
  std::string configurationFile;  // empty: the usual one, which need not be there
  bool migrate = false;           // bring the database's layout up to date and end
  bool keepLayout = false;        // don't do so at the start
  std::string folder;             // messages as files, instead of a stream's
  bool once = false;              // ends when nothing is there any more
  LogLevel logLevel = LogLevel::Default;
};

// What parsing writes to.
struct CollectOptionTexts {
  CollectOptions options;
  std::string logLevel = "default";
};

// The program's options and what it says of itself, for the parser and for the manual page.
void describeCollectCommand(CLI::App& app, CollectOptionTexts& texts);

// What a command line asks for: exactly one of its members says so.
struct CollectCommand {
  std::optional<CollectOptions> options;
  std::string output;  // for stdout: the help or the version
  Status usage;        // wrong: one line that names the option
};
CollectCommand parseCollectCommand(int argumentCount, const char* const* arguments);

struct CollectConfiguration {
  ServerSettings server;
  std::string stream = "TARNREPORTING";
  std::string consumer = "collect";  // all collectors of a database have the same
  std::int64_t mostUnacknowledged = 4096;
  std::int64_t answerSeconds = 30;  // a message that isn't acknowledged within it goes to another collector
  std::int64_t againSeconds = 30;   // between two looks for what the database lacks; 0: it isn't looked for
  std::string database = "dbname=tarnreporting";
  std::int64_t groupMessages = 64;
  std::int64_t retentionDays = 0;  // 0: nothing is dropped
};

Result<CollectConfiguration> parseCollectConfiguration(std::string_view text, std::string_view name);
// The file of the options. One that isn't named need not be there: then all is as it is by default.
Result<CollectConfiguration> readCollectConfiguration(const CollectOptions& options);

}  // namespace tarn::fleet
