// SPDX-License-Identifier: Apache-2.0
// Feeds a book with what pw-dump printed of a machine.
#pragma once

#include <string>

#include "adapters/pipewire/core/StreamBook.h"

namespace tarn::streams {

// All objects of the dump, as if they had come at this moment, links and defaults last.
void feedDump(StreamBook& book, const std::string& path, Moment at);

}  // namespace tarn::streams
