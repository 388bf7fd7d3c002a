// SPDX-License-Identifier: Apache-2.0
// PageFrame: what stands around the contents of every page: HTML that is well-formed XML too, with its style inside,
// without scripts and without anything from elsewhere. Stateless. Threads: any.
#pragma once

#include <string>

#include "tools/report/Markup.h"

namespace tarn::report {

// Up to the title, as the first heading of what follows.
void openPage(Markup& markup, const std::string& title);
void closePage(Markup& markup);

}  // namespace tarn::report
