// SPDX-License-Identifier: Apache-2.0
// readSmallFile: the content of a file that is expected to be small: settings, driver reports, the kernel's own texts.
//
// Threads: any. May block on a disk, but not on what the file is. Nothing is thrown but for want of memory, which the
// limit bounds.
#pragma once

#include <cstddef>
#include <string>

#include "plist/Result.h"

namespace tarn::linux_host {

// Reads the whole content in blocks of 16 KiB. When there is more than `limit` bytes the error is EFBIG, beside the
// beginning of it, which may reach past the limit by a block. Only a regular file is read (EISDIR for a folder, ENODEV
// for another, which might never end); the kernel's files under /proc and /sys are such. Every other error comes
// without content. The size that the file claims isn't asked: the kernel's claim none.
Result<std::string> readSmallFile(const std::string& path, std::size_t limit);
// The same of a file that is open already, from its beginning; where its offset stands doesn't matter and isn't
// changed. It isn't closed.
Result<std::string> readSmallFile(int descriptor, std::size_t limit);

}  // namespace tarn::linux_host
