// SPDX-License-Identifier: Apache-2.0
// SessionTable: a session's messages as CSV (RFC 4180), a row each. Stateless. Threads: any.
#pragma once

#include <string>
#include <vector>

#include "tools/ctl/sessions/SessionMessage.h"

namespace tarn::ctl {

// The heading, then the messages in their order: event, time, stamp, category, type, derived, then a column for each
// key that any of them has, in the order in which keys come. A text is as it is, a container as JSON, what isn't there
// empty. Line ends inside a text are left to who prints the lines.
std::vector<std::string> tableOf(const std::vector<SessionMessage>& messages);

}  // namespace tarn::ctl
