// SPDX-License-Identifier: Apache-2.0
// SessionSection: what the page says of one session: facts, a timeline, its derived segments and driver counters, each
// picture with a table of the same numbers. Stateless. Threads: any.
//
// A section of ordinary texts has at most about 100 KB, however much the session did: lanes are thinned, texts
// shortened, and each place says what was left out.
#pragma once

#include <cstdint>
#include <string>

#include "tools/report/Markup.h"
#include "tools/report/SessionPicture.h"

namespace tarn::report {

// "session-12": the section's place in the page.
std::string sectionId(std::int64_t session);
// Appends the section; its heading is of the third level.
void writeSession(Markup& markup, const SessionPicture& picture);

}  // namespace tarn::report
