// SPDX-License-Identifier: Apache-2.0
// Options: the bounds of a client, and what a send says of them.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>

namespace tarnkit {

// What a client may use. They are copied when it connects and never change. Each bound is on one client; together they
// bound what it allocates, whatever the service does. What happens at a bound is never a loss without a word: a send
// says so, or the connection ends with a reason.
struct Options {
  // How long connecting, sending without room, a flush, a call without a time of its own and the destruction may wait,
  // each by itself. 0: what can be done at once.
  std::chrono::milliseconds timeout{2000};
  // Of one request, in bytes of its CBOR without the length before it. As the service's `max_frame_bytes`, 1 MiB unless
  // it was configured otherwise.
  std::size_t maxFrameBytes = 1048576;  // longer requests aren't sent: the service would cut us off
  // Of one reply: a list of all sessions is the longest that there is. Memory for it grows only as bytes really arrive.
  std::size_t maxReplyBytes = std::size_t{64} << 20U;  // a longer reply ends the connection
  // Encoded requests that the service hasn't taken yet. One request may be larger when it is alone.
  std::size_t maxOutgoingBytes = std::size_t{4} << 20U;  // beyond: send waits, then says Full; trySend doesn't wait
  // Requests without a reply yet, each of which keeps a small record and its handler in memory.
  std::size_t maxOutstanding = 65536;  // likewise; starts that are held have a count of their own
  // How many bytes gather before send() and trySend() write by themselves: many small messages a write are the fast
  // way.
  std::size_t autoFlushBytes = 65536;  // 0: every send is a write of its own
};

// What send() and trySend() say. Unless it is Sent nothing was put in line, and the handler will never be called.
enum class SendStatus : std::uint8_t {
  Sent,          // the handler will be called
  Full,          // a bound is reached; try again after dispatch() or wait()
  TooLarge,      // longer than a frame may be
  NotConnected,  // the connection has ended
  Misuse,        // another thread is just using the client
};

}  // namespace tarnkit
