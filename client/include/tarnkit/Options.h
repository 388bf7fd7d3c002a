// Options: the bounds of a client, and what a send says of them.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>

namespace tarnkit {

struct Options {
  // How long connecting, sending without room, a flush, a call without a time of its own and the destruction may wait.
  std::chrono::milliseconds timeout{2000};
  std::size_t maxFrameBytes = 1048576;                   // longer requests aren't sent: the service would cut us off
  std::size_t maxReplyBytes = std::size_t{64} << 20U;    // a longer reply ends the connection
  std::size_t maxOutgoingBytes = std::size_t{4} << 20U;  // beyond: send waits, then says Full; trySend doesn't wait
  std::size_t maxOutstanding = 65536;                    // likewise; starts that are held have a count of their own
  std::size_t autoFlushBytes = 65536;                    // 0: every send is a write of its own
};

enum class SendStatus : std::uint8_t {
  Sent,          // the handler will be called
  Full,          // a bound is reached; try again after dispatch() or wait()
  TooLarge,      // longer than a frame may be
  NotConnected,  // the connection has ended
  Misuse,        // another thread is just using the client
};

}  // namespace tarnkit
