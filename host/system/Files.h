// SPDX-License-Identifier: Apache-2.0
// What the system's calls on files leave to do by hand. Nothing here keeps a state; descriptors stay the caller's.
//
// Threads: any. Each may block on the disk. Nothing is thrown but for want of memory.
#pragma once

#include <sys/types.h>

#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::linux_host {

// Writes all of it, however many pieces the system takes it in, and goes on after a signal. After an error some of it
// may be written and nobody knows how much: the caller gives the file up or writes it anew. For blocking descriptors; a
// non-blocking one that is full makes it fail with EAGAIN.
[[nodiscard]] Status writeAll(int descriptor, std::string_view bytes);

// Makes the directory and what is missing above it, each with this mode less the process's mask. One that is there
// already, a link to one too, is left as it is, and that is a success. ENOTDIR when something else has the name; after
// an error the folders made so far stay.
[[nodiscard]] Status createDirectories(const std::string& path, mode_t mode);

// When root works on the state of a service that runs as another user, a file that root made new goes to the owner and
// group of the folder that it lies in, or the service couldn't read it. For others nothing happens, nor on a disk that
// knows no owners.
void giveToFolderOwner(int descriptor, const std::string& folder) noexcept;

}  // namespace tarn::linux_host
