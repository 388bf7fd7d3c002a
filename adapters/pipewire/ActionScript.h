// SPDX-License-Identifier: Apache-2.0
// Actions and streams as text, for who wants to see what is reported.
#pragma once

#include <string>
#include <vector>

#include "adapters/pipewire/core/StreamActions.h"
#include "adapters/pipewire/core/StreamBook.h"

namespace tarn::streams {

// The lines of a script of `tarnreportingctl run` that do this; the stream's number is its reporter ID.
std::string scriptOf(const Action& action);
// A table with a row for each stream; a line that says so when there is none.
std::string tableOf(const std::vector<StreamView>& views);

}  // namespace tarn::streams
