// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionCommand.h"

#include <CLI/CLI.hpp>
#include <limits>
#include <string>

#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

void addSessionArgument(CLI::App& command, std::int64_t& session) {
  command.add_option("SESSION", session, "The session, as \"sessions\" numbers them")
      ->required()
      ->check(CLI::Range(std::int64_t{1}, std::numeric_limits<std::int64_t>::max()));
}

int withSession(const Context& context, std::int64_t session,
                const std::function<int(recorder::SessionReader&, const recorder::SessionRow&)>& tell) {
  if (!isNamed(context.stateDirectory, "--state-dir")) return kWrongUsage;
  recorder::SessionReader reader(context.stateDirectory + "/recorder.sqlite3");
  if (const Status opened = reader.open(); opened.failed()) return sessionFailure(session, opened);
  const auto row = reader.session(session);
  if (row.failed()) return sessionFailure(session, row.error);
  if (!row.value) {
    complain("there is no session " + std::to_string(session) + " (\"sessions\" lists them)");
    return kFailure;
  }
  return tell(reader, *row.value);
}

int sessionFailure(std::int64_t session, const Status& status) {
  complain("can't read session " + std::to_string(session) + ": " + status->text);
  return kFailure;
}

}  // namespace tarn::ctl
