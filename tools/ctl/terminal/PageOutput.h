// SPDX-License-Identifier: Apache-2.0
// PageOutput: where the page of a report goes. Stateless. Threads: one.
#pragma once

#include <string>

namespace tarn::ctl {

// Writes it to the file, which is replaced whole, or to stdout where none is named or it is "-". The exit status; what
// went wrong was said on stderr. A terminal is refused: a page is for a browser.
int putPage(const std::string& file, const std::string& page);

}  // namespace tarn::ctl
