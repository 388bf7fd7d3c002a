// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "dictionary/MessageDictionary.h"
#include "host/system/SystemError.h"
#include "tools/ctl/Command.h"
#include "tools/ctl/InputFile.h"
#include "tools/ctl/MessageLint.h"
#include "tools/ctl/terminal/Output.h"
#include "tools/script/ScriptLines.h"
#include "tools/script/ScriptParser.h"

namespace tarn::ctl {

namespace {

using script::ScriptLines;

constexpr const char* kHelp = R"(
Looks at each line of a script as "tarnreportingctl run" takes it, and prints what is wrong with it, a line each:
FILE:LINE, what it is and what was expected. No service is needed.
  an unknown name   of an operation, a member, a category, a type or a service type, or a number that has none
  a wrong kind      a text where a number is read
  a wrong unit      55 where a volume is 0 to 1, milliseconds where seconds are read, session_duration_ms
  an unread key     nothing is derived from it; it is carried to the back-ends as it is, in no other way

Keys of your own are unread keys. With --own-keys they are fine, but for those that look like a key that somebody reads.
"tarnreportingctl explain" and docs/messages.md tell which keys there are.

Exit status: 0 nothing is wrong; 65 something is, or the script can't be read.

Example:
  tarnreportingctl lint --own-keys player.jsonl)";

struct Arguments {
  std::string path = "-";
  bool ownKeys = false;
};

// For a name that stands in the dictionary and that a script can't write.
std::string numberHint(const std::string& fault) {
  for (const auto& rows : {dictionary::categories(), dictionary::types(), dictionary::serviceTypes()}) {
    for (const dictionary::NamedNumber& row : rows) {
      if (!row.byName && fault.find(" is \"" + std::string(row.name) + "\"") != std::string::npos) {
        return "; " + std::string(row.name) + " has to be given by its number, " + std::to_string(row.number);
      }
    }
  }
  return {};
}

// Prints what is wrong, and counts it.
class Findings {
 public:
  explicit Findings(std::string script) : output_(STDOUT_FILENO), script_(std::move(script)) {}

  void add(std::size_t line, std::string_view text) {
    any_ = true;
    output_.line(printable(script_) + ":" + std::to_string(line) + ": " + printable(text));
  }
  bool good() const { return output_.good(); }
  int status() {
    if (const int status = output_.status(); status != kSuccess) return status;
    return any_ ? kBadInput : kSuccess;
  }

 private:
  Output output_;
  std::string script_;
  bool any_ = false;
};

void lintLine(const MessageLint& checker, std::string_view text, std::size_t line, Findings& findings) {
  if (script::isBlank(text)) return;
  const auto parsed = script::parseLine(text, line);
  if (parsed.failed()) {
    findings.add(line, parsed.error->text + numberHint(parsed.error->text));
    return;
  }
  for (const std::string& finding : checker.findings(parsed.value)) {
    findings.add(line, finding);
  }
}

int lint(const Arguments& arguments) {
  const InputFile file(arguments.path);
  if (file.fd() < 0) {
    complain(linux_host::errorOf("can't open the script " + printable(arguments.path), errno).text);
    return kBadInput;
  }
  const MessageLint checker(arguments.ownKeys);
  Findings findings(file.isStandardInput() ? "stdin" : arguments.path);
  ScriptLines lines(file.fd());
  std::string_view text;
  for (auto next = lines.next(text); next != ScriptLines::Next::End && findings.good(); next = lines.next(text)) {
    if (next == ScriptLines::Next::Line) {
      lintLine(checker, text, lines.lineNumber(), findings);
    } else if (next == ScriptLines::Next::TooLong) {
      findings.add(lines.lineNumber(),
                   "the line is too long, expected at most " + std::to_string(ScriptLines::kMaxLineBytes) + " bytes");
      break;
    } else if (const Status filled = lines.fill(); filled.failed()) {
      findings.add(lines.lineNumber() + 1, "can't read the script: " + filled->text);
      break;
    }
  }
  return findings.status();
}

}  // namespace

void addLintCommand(CLI::App& app, Context& context) {
  CLI::App* command = app.add_subcommand("lint", "Say what in a script is unknown, of a wrong kind or unit, or unread");
  const auto arguments = std::make_shared<Arguments>();
  command->add_option("FILE", arguments->path, "The script; standard input when left out or -");
  command->add_flag("--own-keys", arguments->ownKeys, "Keys that nobody reads are fine");
  command->footer(kHelp);
  command->callback([&context, arguments] { context.chosen = [arguments] { return lint(*arguments); }; });
}

}  // namespace tarn::ctl
