// SPDX-License-Identifier: Apache-2.0
// The process's limit of open descriptors. Every connection costs one, a shared ring another, and a process that runs
// into the limit can accept nobody and open no file either; so the limit is raised first and the connections are held
// below it.
//
// Threads: the main one, at the start. Neither call blocks, allocates or fails.
#pragma once

#include <cstddef>

namespace tarn::linux_host {

// Raises the soft limit to the hard one, as an unprivileged process may, and returns the limit that holds then. Where
// raising is refused the limit stays and is returned as it was; where the system tells none at all the answer is 1024,
// the usual one.
std::size_t raiseDescriptorLimit() noexcept;

// How many connections the limit leaves room for. 64 descriptors are kept for the rest of the process (database, log,
// settings, the loop's own); of a limit that is at most twice that, half is given to connections, and never less than
// one.
std::size_t connectionsWithin(std::size_t descriptorLimit) noexcept;

}  // namespace tarn::linux_host
