// SPDX-License-Identifier: Apache-2.0
// The adapter's configuration file: TOML, looked at whole before anything is done. What isn't known is refused.
//
// Threads: any. docs/pipewire.md and docs/alsa.md list the keys.
#pragma once

#include <string>
#include <string_view>

#include "adapters/pipewire/AdapterOptions.h"
#include "adapters/pipewire/core/Rules.h"
#include "plist/Result.h"

namespace tarn::streams {

// The rules that the text says, with the defaults for what it leaves out. The error is one line that begins with the
// name and the line's number; of several it is that which stands first.
Result<Rules> parseConfiguration(Adapter adapter, std::string_view text, std::string_view name);
// The same of a file of at most a mebibyte. The error's code is 0 unless the file can't be read.
Result<Rules> readConfiguration(Adapter adapter, const std::string& path);

}  // namespace tarn::streams
