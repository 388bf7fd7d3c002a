// SPDX-License-Identifier: Apache-2.0
// The command line of tarnreporting-fleet: which question, and of what. Parsing looks at no file and changes nothing.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "plist/Result.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace CLI {
class App;
}

namespace tarn::fleet {

enum class Question : std::uint8_t { Top, Sessions, Report };

struct TopArguments {
  ctl::TimeRange range;
  std::string by;  // route, release or application; empty: all three
  std::size_t limit = 10;
  bool asJson = false;
};

// Patterns are those of globMatches; an empty one lets everything through.
struct SessionsArguments {
  ctl::TimeRange range;
  std::string deviceGlob;
  std::string applicationGlob;
  std::string releaseGlob;
  std::size_t limit = 100;
  bool open = false;
  bool all = false;
  bool asJson = false;
};

struct ReportArguments {
  ctl::TimeRange range;
  std::string file;  // empty: stdout
  bool exact = false;
};

struct AskOptions {
  std::string database = "dbname=tarnreporting";
  std::string color = "auto";
  bool quiet = false;
  Question question = Question::Top;
  TopArguments top;
  SessionsArguments sessions;
  ReportArguments report;
};

// The program's options and what it says of itself, for the parser and for the manual page.
void describeAskCommand(CLI::App& app, AskOptions& options);

// What a command line asks for: exactly one of its members says so.
struct AskCommand {
  std::optional<AskOptions> options;
  std::string output;  // for stdout: the help or the version
  Status usage;        // wrong: one line that names the option
};
AskCommand parseAskCommand(int argumentCount, const char* const* arguments);

}  // namespace tarn::fleet
