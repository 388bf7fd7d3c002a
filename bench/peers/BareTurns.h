// SPDX-License-Identifier: Apache-2.0
// BareTurns: how a receiver that looks at nothing but lengths may spend a turn: take what came, answer it, wait.
#pragma once

#include <cstdint>

namespace tarn::bench {

enum class BareTurn : std::uint8_t {
  Receive,  // waits in recv(), answers with send(): two system calls
  Epoll,    // waits in epoll_wait() first, as who has many sockets must: three
  Ring,     // hands the answer and the next receive to io_uring and waits for both: one
};

// Whether this program and this system have it.
bool isThere(BareTurn turn);
// Serves until the other end is closed. Ends the process when a call fails.
void serve(BareTurn turn, int socket);

}  // namespace tarn::bench
