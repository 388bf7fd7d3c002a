// SPDX-License-Identifier: Apache-2.0
// SessionCommand: what the commands about one session share: the session that is named, and looking it up. Threads:
// one.
#pragma once

#include <cstdint>
#include <optional>

#include "recorder/store/reading/SessionReader.h"
#include "tools/ctl/Command.h"

namespace tarn::ctl {

// Adds the argument SESSION to a command; `session` outlives it.
void addSessionArgument(CLI::App& command, std::int64_t& session);

// Opens the recorder of the state directory and has `tell` answer the exit status by it. The exit status: what went
// wrong was said on stderr.
int withSession(const Context& context, std::int64_t session,
                const std::function<int(recorder::SessionReader&, const recorder::SessionRow&)>& tell);
// Complains that the session can't be read; the exit status for that.
int sessionFailure(std::int64_t session, const Status& status);

}  // namespace tarn::ctl
