// SPDX-License-Identifier: Apache-2.0
// isPlainName: which names stand for files: those of suites and notifications, which come from other programs and must
// lead nowhere else. Threads: any.
#pragma once

#include <cstddef>
#include <string_view>

namespace tarn::linux_host {

// Whether the name is a plain one that can stand for a file of its own: not empty, no slash or NUL, no leading dot
// (such files are the host's own), at most 200 bytes.
inline bool isPlainName(std::string_view name) noexcept {
  constexpr std::size_t kMaximumNameBytes = 200;  // leaves room for what the host's own files add to it
  return !name.empty() && name.size() <= kMaximumNameBytes && name.front() != '.' &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

}  // namespace tarn::linux_host
