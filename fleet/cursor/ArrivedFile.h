// SPDX-License-Identifier: Apache-2.0
// ArrivedFile: tells the recorder up to which id all has arrived, so that of two events the one that is somewhere else
// too goes first.
//
//   the id in decimal and a line's end; anybody may read it
//
// Replaced as a whole and not synchronised: after a power cut it may be an older one, or none, and the recorder keeps
// more for a while than it must. Threads: one.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "plist/Result.h"

namespace tarn::fleet {

class ArrivedFile {
 public:
  explicit ArrivedFile(std::string path) : path_(std::move(path)) {}

  // Nothing is done for what was written last. On an error what was there still is.
  [[nodiscard]] Status write(std::int64_t id);

 private:
  const std::string path_;
  std::optional<std::int64_t> written_;
};

}  // namespace tarn::fleet
